// Interface settings, the transfer time-out and the property part of the
// document.
#include "systems/QFCSystemProperty.h"

#include <limits>

#include "comm/QFCAbstractTransferInterface.h"
#include "config/QFCFSHelper.h"
#include "platform/QFCReporter.h"
#include "platform/Archive.h"
#include "platform/FileHelper.h"
#include "platform/MessageTable.h"
#include "platform/Settings.h"

namespace faultbox {

namespace {

constexpr int kMsgInvalidValue = 37;
constexpr int kMsgBadPlatform = 49;
constexpr int kMsgWrongDeviceType = 57;
constexpr int kMsgFailureClassFileDiffers = 92;
constexpr int kMsgReadOnly = 118;
constexpr int kMsgInterfaceConnected = 169;

// Places named by internal faults of this file.
constexpr int kPlaceSerialSettingsRefused = 5101;
constexpr int kPlaceCANSettingsRefused = 5102;
constexpr int kPlaceStoredPlatform = 5103;

constexpr int kFirstLabelString = 8917;
constexpr int kShown = 1;

const std::string kEmpty;

}  // namespace

QFCSystemProperty::QFCSystemProperty(std::string name)
    : QFCAbstractObjectData(std::move(name), kKindSystem, this) {
  for (std::size_t i = 0; i < labels_.size(); ++i) {
    const char* text = ResourceString(kFirstLabelString + static_cast<int>(i));
    labels_[i] = text ? text : "";
  }
}

QFCSystemProperty::~QFCSystemProperty() = default;

void QFCSystemProperty::SetPinFile(const std::string& path) {
  pinFilePath_ = path;
  pinFileTitle_ = QFCFileHelper::FileName(path);
}

const std::string& QFCSystemProperty::GetSpareText(int index) const {
  return index >= 0 && index < static_cast<int>(spareTexts_.size())
             ? spareTexts_[static_cast<std::size_t>(index)]
             : kEmpty;
}

const std::string& QFCSystemProperty::GetLabelText(int index) const {
  return index >= 0 && index < static_cast<int>(labels_.size()) ? labels_[static_cast<std::size_t>(index)]
                                                                : kEmpty;
}

// ---- interface settings ----

bool QFCSystemProperty::MaySetSettings(const void* settings) const {
  if (IsReadOnly()) {
    TheReporter().ReportError(kMsgReadOnly, GetName());
    return false;
  }
  if (!IsInterfaceFree()) {
    TheReporter().ReportError(kMsgInterfaceConnected, {}, {}, kShown);
    return false;
  }
  return settings != nullptr;
}

bool QFCSystemProperty::SetSerialSettings(const QFTSerialInterfaceSettings* settings) {
  if (!MaySetSettings(settings)) return false;
  serial_.portName = settings->portName;
  serial_.deviceType = settings->deviceType;
  serial_.portNumber = settings->portNumber;
  SetModified();
  return true;
}

bool QFCSystemProperty::SetCANSettings(const QFTCANInterfaceSettings* settings) {
  if (!MaySetSettings(settings)) return false;
  // The channel head and the rest belong to the access layer and stay as they are.
  can_.deviceType = settings->deviceType;
  can_.firstParameter = settings->firstParameter;
  can_.secondParameter = settings->secondParameter;
  for (std::size_t i = 0; i < 3; ++i) can_.furtherValues[i] = settings->furtherValues[i];
  SetModified();
  return true;
}

void QFCSystemProperty::GetBusTiming(std::uint32_t& first, std::uint32_t& second) const {
  first = busTiming0_;
  second = busTiming1_;
}

void QFCSystemProperty::SetBusTiming(std::uint32_t first, std::uint32_t second) {
  busTiming0_ = first;
  busTiming1_ = second;
}

HRESULT QFCSystemProperty::GetInterfaceParameter(std::int32_t& deviceType, std::int32_t& value1,
                                                 std::int32_t& value2) const {
  if (platformType_ == 1) {
    deviceType = static_cast<std::int32_t>(serial_.deviceType);
    value1 = static_cast<std::int32_t>(serial_.portNumber);
    value2 = 0;
  } else if (platformType_ == 2) {
    deviceType = static_cast<std::int32_t>(can_.deviceType);
    value1 = can_.firstParameter;
    value2 = can_.secondParameter;
  }
  return FAULTBOX_OK;
}

HRESULT QFCSystemProperty::SetInterfaceParameter(std::int32_t deviceType, std::int32_t value1,
                                                 std::int32_t value2) {
  if (platformType_ == 1) {
    if (deviceType != fdtRS232_IF_PORT) {
      TheReporter().ReportError(kMsgWrongDeviceType, {}, {}, kShown);
      return E_FAULTBOX;
    }
    QFTSerialInterfaceSettings settings;
    settings.portName = "COM" + std::to_string(value1);
    settings.deviceType = fdtRS232_IF_PORT;
    settings.portNumber = static_cast<std::uint32_t>(value1);
    if (!SetSerialSettings(&settings)) {
      TheReporter().ReportInternalFault(kPlaceSerialSettingsRefused);
      return E_FAULTBOX;
    }
    return FAULTBOX_OK;
  }
  if (platformType_ == 2) {
    if (deviceType != fdtCAN_IF_VI_CAN_CARD_X && deviceType != fdtCAN_IF_LINKBOX_USB) {
      TheReporter().ReportError(kMsgWrongDeviceType, {}, {}, kShown);
      return E_FAULTBOX;
    }
    QFTCANInterfaceSettings settings = can_;
    settings.deviceType = static_cast<std::uint32_t>(deviceType);
    // The access layer takes board and channel as single bytes.
    settings.firstParameter = static_cast<std::uint8_t>(value1 & 0xFF);
    settings.secondParameter = static_cast<std::uint8_t>(value2 & 0xFF);
    if (!SetCANSettings(&settings)) {
      TheReporter().ReportInternalFault(kPlaceCANSettingsRefused);
      return E_FAULTBOX;
    }
    return FAULTBOX_OK;
  }
  return E_FAULTBOX;
}

bool QFCSystemProperty::IsInterfaceFree() const {
  for (const auto& transferInterface : transferInterfaces_)
    if (transferInterface->IsConnected()) return false;
  return true;
}

std::int32_t QFCSystemProperty::GetTransferTimeout() { return QFCAbstractTransferInterface::ReadTransferTimeout(); }

// ---- transfer interfaces ----

void QFCSystemProperty::AddTransferInterface(
    std::unique_ptr<QFCAbstractTransferInterface> transferInterface) {
  if (!transferInterface) return;
  currentTransferInterface_ = transferInterface.get();
  transferInterfaces_.push_back(std::move(transferInterface));
}

// ---- document ----

void QFCSystemProperty::Serialize(Archive& ar) {
  if (ar.IsStoring())
    StoreProperties(ar);
  else
    LoadProperties(ar);
}

void QFCSystemProperty::StoreProperties(Archive& ar) const {
  ar.WriteString(failureClassFile_);
  ar.WriteString(spareTexts_[0]);
  ar.WriteString(spareTexts_[2]);
  ar.WriteString(spareTexts_[1]);
  ar.WriteU32(static_cast<std::uint32_t>(visiblePinProperties_.size()));
  for (const auto& [column, flag] : visiblePinProperties_) {
    ar.WriteString(column);
    ar.WriteI32(flag);
  }
  ar.WriteI32(platformType_);
  if (platformType_ == 1) {
    ar.WriteString(serial_.portName);
    ar.WriteU32(serial_.portNumber);
    ar.WriteU32(serial_.deviceType);
  } else if (platformType_ == 2) {
    ar.WriteU32(can_.deviceType);
    ar.WriteU8(can_.firstParameter);
    ar.WriteU8(can_.secondParameter);
    ar.WriteU32(busTiming0_);
    ar.WriteU32(busTiming1_);
  }
}

void QFCSystemProperty::LoadProperties(Archive& ar) {
  // The pin file's entry stays in force; a document that names another file
  // only warns. Case and the kind of separator do not count (the file may
  // have been named on Windows, and older documents hold the default file
  // with '\\'), but the current name keeps its case, since Linux opens it
  // with that case.
  const std::string storedFile = QFCFileHelper::ToNative(ar.ReadString());
  const std::string currentFile = QFCFileHelper::ToNative(failureClassFile_);
  if (!QFCFSHelper::EqualNoCase(storedFile, currentFile))
    TheReporter().ReportWarning(kMsgFailureClassFileDiffers, storedFile, currentFile);

  // Stored in the order first, third, second.
  for (int index : {0, 2, 1}) {
    const std::string stored = ar.ReadString();
    const std::string& current = spareTexts_[static_cast<std::size_t>(index)];
    if (stored != current) TheReporter().ReportWarning(kSpareTextMessages[index], stored, current);
  }

  // Each entry is at least a one-byte text length and a 4-byte flag.
  const std::uint32_t count = ar.ReadU32CountOf(1 + 4);
  for (std::uint32_t i = 0; i < count; ++i) {
    const std::string column = ar.ReadString();
    const std::int32_t flag = ar.ReadI32();
    // Columns the pin file no longer has are dropped.
    if (auto it = visiblePinProperties_.find(column); it != visiblePinProperties_.end()) it->second = flag;
  }

  const std::int32_t platform = ar.ReadI32();
  if (platform == 1) {
    serial_.portName = ar.ReadString();
    serial_.portNumber = ar.ReadU32();
    serial_.deviceType = ar.ReadU32();
  } else if (platform == 2) {
    can_.deviceType = ar.ReadU32();
    can_.firstParameter = ar.ReadU8();
    can_.secondParameter = ar.ReadU8();
    busTiming0_ = ar.ReadU32();
    busTiming1_ = ar.ReadU32();
  } else {
    TheReporter().ReportError(kMsgBadPlatform, std::to_string(platform));
    TheReporter().ReportInternalFault(kPlaceStoredPlatform);
    // What follows was written for an unknown layout: reading on would take
    // its bytes for ECU names and patterns.
    throw ArchiveException(ArchiveCause::kGeneric, "platform type " + std::to_string(platform));
  }
}

}  // namespace faultbox
