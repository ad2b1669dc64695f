// One failure simulation system as scripts see it. Its pattern and failure
// class collections have no life of their own apart from the system: their
// wrappers, and those of the failure classes, are detached with its wrapper.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "automation/QFCOwnerProvider.h"

namespace faultbox {

class QFCAbstractFailureClass;
class QFCFailureClassImpl;
class QFCFailureClassesImpl;
class QFCFailurePatternsImpl;
class QFCOpenDocuments;
class QFCSystem;

class QFCSystemImpl : public QFCOwnerProvider<QFCSystem> {
 public:
  explicit QFCSystemImpl(QFCSystem* owner) : QFCOwnerProvider(owner) {}
  // The system's one wrapper, made on first use.
  static std::shared_ptr<QFCSystemImpl> Of(QFCSystem& system);
  // The documents that hold the system; Close and Save go through them.
  void SetDocuments(QFCOpenDocuments* documents) { documents_ = documents; }

  [[nodiscard]] HRESULT get_Author(std::string& author);
  [[nodiscard]] HRESULT get_Description(std::string& comment);
  [[nodiscard]] HRESULT get_PlatformType(std::int32_t& platformType);
  [[nodiscard]] HRESULT get_Name(std::string& name);
  [[nodiscard]] HRESULT get_PinFile(std::string& pinFile);
  [[nodiscard]] HRESULT get_ECUVersion(std::int32_t& ecuVersion);
  // Closes the system's document; E_FAULTBOX when nothing was closed.
  [[nodiscard]] HRESULT Close();
  [[nodiscard]] HRESULT Connect();
  [[nodiscard]] HRESULT Disconnect();
  [[nodiscard]] HRESULT IsConnected(VARIANT_BOOL& isConnected);
  [[nodiscard]] HRESULT get_FailurePatterns(std::shared_ptr<QFCFailurePatternsImpl>& failurePatterns);
  [[nodiscard]] HRESULT get_FailureClasses(std::shared_ptr<QFCFailureClassesImpl>& failureClasses);
  // E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE when not connected, else the
  // reset's own result.
  [[nodiscard]] HRESULT ResetHardware();
  // An omitted value keeps the one set. KR40 family: the port number, 1 to
  // 255; KR60: board and channel, each 0 to 255 (E_FAULTBOX_INVALID_PARAMETER
  // outside, rather than cutting the number short).
  [[nodiscard]] HRESULT SetInterfaceParameter(std::int32_t deviceType, const Variant& value1 = {},
                                const Variant& value2 = {});
  // All three are -1 unless the settings could be read.
  [[nodiscard]] HRESULT InterfaceParameter(std::int32_t& deviceType, std::int32_t& value1, std::int32_t& value2);
  // Extension of the model: saves the system's document atomically in place.
  [[nodiscard]] HRESULT Save();

  void Detach() override;
  // The wrapper of one of the system's failure classes, or nullptr.
  std::shared_ptr<QFCFailureClassImpl> ClassWrapper(QFCSystem& system, QFCAbstractFailureClass* failureClass);

 private:
  QFCOpenDocuments* documents_ = nullptr;
  std::shared_ptr<QFCFailurePatternsImpl> patterns_;
  std::shared_ptr<QFCFailureClassesImpl> classes_;
  std::vector<std::shared_ptr<QFCFailureClassImpl>> classWrappers_;
};

}  // namespace faultbox
