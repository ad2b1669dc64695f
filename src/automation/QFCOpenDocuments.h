// The documents a script opened: one per failure simulation system, and the
// system administration that holds their systems. Closing goes through the
// document, so that a system with an activated pattern is never deleted with
// its relays switched.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/ResultCodes.h"
#include "systems/QFCSystemAdmin.h"

namespace faultbox {

class QFCFaultboxDoc;
class QFCSystem;
class QFCSystemsImpl;

class QFCOpenDocuments {
 public:
  QFCOpenDocuments();
  // Detaches the systems' wrapper, then discards every document silently.
  ~QFCOpenDocuments();
  QFCOpenDocuments(const QFCOpenDocuments&) = delete;
  QFCOpenDocuments& operator=(const QFCOpenDocuments&) = delete;

  QFCSystemAdmin& GetAdmin() { return admin_; }
  const QFCSystemAdmin& GetAdmin() const { return admin_; }
  // The wrapper of the system collection, made on first use.
  std::shared_ptr<QFCSystemsImpl> GetWrapper();

  // Opens the document `fileName`; a non-empty `pinFile` replaces the pin
  // file it names. Both must exist (message 46, E_FAULTBOX_CANN_NOT_OPEN_FILE).
  // A document open already gives its system. A load that fails is
  // E_FAULTBOX_FILE_IS_NOT_OPENED. Failures carry error information.
  [[nodiscard]] HRESULT Open(const std::string& fileName, const std::string& pinFile, QFCSystem*& system);
  // Closes through the document: refused (message 85, E_FAULTBOX) while a
  // pattern is activated; E_FAULTBOX for a system of no document here.
  [[nodiscard]] HRESULT Close(const QFCSystem* system);
  // Closes every document it can; E_FAULTBOX when one stayed.
  [[nodiscard]] HRESULT CloseAll();
  // Saves the system's document atomically where it was loaded from.
  [[nodiscard]] HRESULT Save(const QFCSystem* system);

  QFCFaultboxDoc* FindDocument(const QFCSystem* system) const;

 private:
  // Declared first: the documents refer to it until they are gone.
  QFCSystemAdmin admin_;
  std::vector<std::unique_ptr<QFCFaultboxDoc>> documents_;
  std::shared_ptr<QFCSystemsImpl> wrapper_;
};

}  // namespace faultbox
