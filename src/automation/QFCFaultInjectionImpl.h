// The root object of the automation model: the component as scripts see it,
// with the systems of the documents they opened.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "automation/QFCOwnerProvider.h"

namespace faultbox {

class QFCOpenDocuments;
class QFCSystem;
class QFCSystemsImpl;

// How scripts reach the hardware. The front end that offers the object model
// installs it, with the same choice as the command line's --hardware; left
// empty, systems use the settings' channel and port tables as they stand.
struct QFTScriptHardware {
  // Applies a choice ("sim": the built-in simulator, "config": the
  // tables); answers its result code.
  std::function<HRESULT(const std::string& choice)> select;
  // Runs for every system a script opens, before the script gets it (for
  // example to give its pin file a simulated bench). A failure (with its
  // error information raised) closes the system again and fails the open.
  std::function<HRESULT(QFCSystem& system)> systemOpened;
};

class QFCFaultInjectionImpl : public QFCOwnerProvider<QFCOpenDocuments> {
 public:
  static constexpr const char* kComponentName = "Faultbox.Component";

  // Starts the component's reporting when nothing did yet and makes a root
  // with no document open.
  static std::shared_ptr<QFCFaultInjectionImpl> Create();
  // Discards every document the root opened.
  ~QFCFaultInjectionImpl() override;

  [[nodiscard]] HRESULT get_Name(std::string& name);
  [[nodiscard]] HRESULT get_Systems(std::shared_ptr<QFCSystemsImpl>& systems);
  // The names of the connected systems.
  [[nodiscard]] HRESULT get_ConnectedSystem(std::vector<std::string>& names);

  // Extension of the model: the hardware scripts use from now on, as the
  // installed QFTScriptHardware applies it; E_NOTIMPL without one.
  [[nodiscard]] HRESULT SelectHardware(const std::string& choice);

  static void SetScriptHardware(QFTScriptHardware hardware);
  static const QFTScriptHardware& GetScriptHardware();

 private:
  explicit QFCFaultInjectionImpl(std::unique_ptr<QFCOpenDocuments> documents);

  std::unique_ptr<QFCOpenDocuments> documents_;
};

}  // namespace faultbox
