// The system wrapper: properties, connection, interface settings, closing and saving.
#include "automation/QFCSystemImpl.h"

#include <algorithm>

#include "automation/QFCFailureClassesImpl.h"
#include "automation/QFCFailurePatternsImpl.h"
#include "automation/QFCInterfaceProvider.h"
#include "automation/QFCOpenDocuments.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCAbstractHardwareInfo.h"
#include "systems/QFCSystem.h"

namespace faultbox {

std::shared_ptr<QFCSystemImpl> QFCSystemImpl::Of(QFCSystem& system) {
  return QFCInterfaceProvider<QFCSystemImpl, QFCSystem>::Of(
      system, [](QFCSystem& s) { return std::make_shared<QFCSystemImpl>(&s); });
}

void QFCSystemImpl::Detach() {
  QFCOwnerProvider::Detach();
  documents_ = nullptr;
  if (patterns_) patterns_->Detach();
  if (classes_) classes_->Detach();
  for (const auto& wrapper : classWrappers_) wrapper->Detach();
  classWrappers_.clear();
}

std::shared_ptr<QFCFailureClassImpl> QFCSystemImpl::ClassWrapper(QFCSystem& system,
                                                                 QFCAbstractFailureClass* failureClass) {
  if (failureClass == nullptr) return nullptr;
  // Wrappers of classes that left the collection are detached before their
  // address can be taken by a new class.
  std::erase_if(classWrappers_, [](const auto& wrapper) {
    if (wrapper->IsAttached()) return false;
    wrapper->Detach();
    return true;
  });
  for (const auto& wrapper : classWrappers_)
    if (wrapper->GetOwner() == failureClass) return wrapper;
  classWrappers_.push_back(std::make_shared<QFCFailureClassImpl>(failureClass, &system));
  return classWrappers_.back();
}

HRESULT QFCSystemImpl::get_Author(std::string& author) {
  return Call([&](QFCSystem& system) {
    author = system.GetAuthor();
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemImpl::get_Description(std::string& comment) {
  return Call([&](QFCSystem& system) {
    comment = system.GetDescription();
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemImpl::get_PlatformType(std::int32_t& platformType) {
  return Call([&](QFCSystem& system) {
    platformType = system.GetPlatformType();
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemImpl::get_Name(std::string& name) {
  return Call([&](QFCSystem& system) {
    name = system.GetName();
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemImpl::get_PinFile(std::string& pinFile) {
  return Call([&](QFCSystem& system) {
    pinFile = system.GetPinFilePath();
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemImpl::get_ECUVersion(std::int32_t& ecuVersion) {
  return Call([&](QFCSystem& system) {
    ecuVersion = system.GetECUVersion();
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemImpl::Close() {
  return Call([&](QFCSystem& system) {
    // The document's close deletes the system and detaches this wrapper:
    // nothing of either is touched afterwards.
    return documents_ ? documents_->Close(&system) : E_FAULTBOX;
  });
}

HRESULT QFCSystemImpl::Connect() {
  return Call([&](QFCSystem& system) { return system.SetConnection(true, true); });
}

HRESULT QFCSystemImpl::Disconnect() {
  return Call([&](QFCSystem& system) { return system.SetConnection(false, true); });
}

HRESULT QFCSystemImpl::IsConnected(VARIANT_BOOL& isConnected) {
  return Call([&](QFCSystem& system) {
    isConnected = ToVariantBool(system.IsConnected());
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemImpl::get_FailurePatterns(std::shared_ptr<QFCFailurePatternsImpl>& failurePatterns) {
  return Call([&](QFCSystem& system) {
    if (!patterns_) patterns_ = std::make_shared<QFCFailurePatternsImpl>(&system);
    failurePatterns = patterns_;
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemImpl::get_FailureClasses(std::shared_ptr<QFCFailureClassesImpl>& failureClasses) {
  return Call([&](QFCSystem& system) {
    failureClasses.reset();
    if (system.GetFailureClasses() == nullptr) return E_FAULTBOX_NULL_POINTER;
    if (!classes_) classes_ = std::make_shared<QFCFailureClassesImpl>(&system);
    failureClasses = classes_;
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemImpl::ResetHardware() {
  return Call([&](QFCSystem& system) {
    if (!system.IsConnected()) return E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE;
    return system.ResetHardware();
  });
}

HRESULT QFCSystemImpl::SetInterfaceParameter(std::int32_t deviceType, const Variant& value1,
                                             const Variant& value2) {
  return Call([&](QFCSystem& system) {
    std::int32_t type = -1;
    std::int32_t values[2] = {-1, -1};
    if (const HRESULT read = system.GetInterfaceParameter(type, values[0], values[1]); read != FAULTBOX_OK)
      return read;
    const Variant* given[2] = {&value1, &value2};
    for (int i = 0; i < 2; ++i)
      if (!IsMissing(*given[i]) && !VariantToInt32(*given[i], values[i])) return E_FAULTBOX_INVALID_PARAMETER;
    // The settings keep a port number and single bytes for board and channel.
    const bool serial = system.GetPlatformType() == fptKR40Platform;
    const std::int32_t lowest = serial ? 1 : 0;
    for (int i = 0; i < (serial ? 1 : 2); ++i)
      if (values[i] < lowest || values[i] > 255) return E_FAULTBOX_INVALID_PARAMETER;
    return system.SetInterfaceParameter(deviceType, values[0], serial ? 0 : values[1]);
  });
}

HRESULT QFCSystemImpl::InterfaceParameter(std::int32_t& deviceType, std::int32_t& value1,
                                          std::int32_t& value2) {
  return Call([&](QFCSystem& system) {
    deviceType = value1 = value2 = -1;
    std::int32_t read[3] = {-1, -1, -1};
    const HRESULT hr = system.GetInterfaceParameter(read[0], read[1], read[2]);
    if (Succeeded(hr)) {
      deviceType = read[0];
      value1 = read[1];
      value2 = read[2];
    }
    return hr;
  });
}

HRESULT QFCSystemImpl::Save() {
  return Call([&](QFCSystem& system) { return documents_ ? documents_->Save(&system) : E_FAULTBOX; });
}

}  // namespace faultbox
