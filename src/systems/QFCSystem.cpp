// Opening a system from its pin files, its load addresses, properties and
// document part.
#include "systems/QFCSystem.h"

#include <algorithm>
#include <set>

#include "comm/QFCCANTransferInterface.h"
#include "comm/QFCSerielleTransferInterface.h"
#include "config/FailureClassLoader.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCECU.h"
#include "config/QFCFSHelper.h"
#include "config/kr40/QFCKR40HardwareInfo.h"
#include "config/kr60/QFCKR60HardwareInfo.h"
#include "platform/QFCReporter.h"
#include "platform/UserMode.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCFailurePatternNode.h"
#include "patterns/QFCFailurePatterns.h"
#include "platform/Archive.h"
#include "platform/FileHelper.h"
#include "platform/MessageTable.h"

namespace faultbox {

namespace {

constexpr int kMsgInvalidValue = 37;
constexpr int kMsgPotentialMissing = 41;
constexpr int kMsgAdditionalFilePlatform = 86;
constexpr int kMsgReadOnly = 118;
constexpr int kMsgPatternActivated = 127;
constexpr int kMsgPotentialTwice = 128;

// Places named by internal faults of this file.
constexpr int kPlaceNoHardwareInfo = 5001;
constexpr int kPlaceNoAdditionalHardwareInfo = 5002;
constexpr int kPlaceUnknownPlatform = 5003;
constexpr int kPlaceEcuIndex = 5004;

constexpr int kLabelAuthor = 6770;
constexpr int kLabelEcuVersion = 6771;
constexpr int kTextConnected = 6772;
constexpr int kTextNotConnected = 6773;
constexpr int kLabelConnection = 6774;
constexpr int kLabelDescription = 6775;
constexpr int kLabelPinFile = 6776;
constexpr int kLabelUserMode = 6731;
constexpr int kTextServiceMode = 6745;
constexpr int kTextStandardMode = 6747;

const char* kFiuLoadAddress = "FIULoadAddress";
const char* kRsimLoadAddress = "RSIMLoadAddress";
const char* kOffsetLoadAddress = "OffsetLoadAddress";

std::string Resource(int id) {
  const char* text = ResourceString(id);
  return text ? text : std::to_string(id);
}

std::int32_t PlatformOfBoardType(const std::string& boardType) {
  if (boardType == "KR40" || boardType == "KR040" || boardType == "KR80" || boardType == "KR080")
    return fptKR40Platform;
  if (boardType == "KR60" || boardType == "KR060") return fptKR60Platform;
  return 0;
}

}  // namespace

// "none" counts in any case, as the format check accepts it.
bool QFCSystem::IsModuleNotFitted(const std::string& text) {
  return text.empty() || text == "-" || text == "#" || QFCFSHelper::EqualNoCase(text, "none");
}

QFCSystem::QFCSystem(std::string name, const std::string& pinFilePath, std::int32_t ecuVersion,
                     std::string author, std::string description)
    : QFCSystemProperty(std::move(name)) {
  SetPinFile(pinFilePath);
  ecuVersion_ = ecuVersion;
  author_ = std::move(author);
  description_ = std::move(description);
  patterns_ = std::make_unique<QFCFailurePatterns>(this);
  rootFolder_ = std::make_unique<QFCFailurePatternNode>(this, patterns_.get());
  patterns_->SetRootFolder(rootFolder_.get());
  // A transfer that failed half-way leaves relays switched: the reset puts
  // every relay off and marks the patterns deactivated.
  patterns_->SetHardwareReset([this] { return ResetHardware(); });
}

QFCSystem::~QFCSystem() {
  // No refusal can keep a system that is going away: neither an activated
  // pattern nor another system on the same HIL simulator stops this disconnect.
  DisconnectSilently();
  // Pattern pins refer to the pins of the hardware descriptions: they go first.
  rootFolder_.reset();
  patterns_.reset();
  // The ECUs belong to the hardware descriptions: forget them first.
  ecus_.clear();
  hardwareInfos_.clear();
  failureClasses_.reset();
}

void QFCSystem::DisconnectSilently() {
  // The transfer interfaces outlive this part of the object; they must not be
  // left connected to a system that is going away.
  for (const auto& transferInterface : GetTransferInterfaces())
    if (transferInterface->IsConnected()) transferInterface->Connect(false, 0, 0);
  EnterDisconnectedState();
}

// ---- opening ----

std::unique_ptr<QFCAbstractHardwareInfo> QFCSystem::CreateHardwareInfo(const std::string& path,
                                                                       std::int32_t& platform,
                                                                       HRESULT& result) {
  platform = 0;
  {
    QFCKR40HardwareInfo probe(path, ecuVersion_, this);
    result = probe.DetectBoardType(platform);
  }
  // The detection has reported why the file is unusable; its result tells a
  // script more than a missing object would.
  if (Failed(result)) return nullptr;
  if (platform == fptKR60Platform) return std::make_unique<QFCKR60HardwareInfo>(path, ecuVersion_, this);
  if (platform == fptKR40Platform) return std::make_unique<QFCKR40HardwareInfo>(path, ecuVersion_, this);
  result = E_FAULTBOX_NULL_POINTER;
  return nullptr;
}

HRESULT QFCSystem::OpenFromPinFile() {
  HRESULT result = FAULTBOX_OK;
  std::unique_ptr<QFCAbstractHardwareInfo> main = CreateHardwareInfo(pinFilePath_, platformType_, result);
  if (!main) {
    if (result == E_FAULTBOX_NULL_POINTER) TheReporter().ReportInternalFault(kPlaceNoHardwareInfo);
    return result;
  }
  if ((result = main->LoadPinFile(false)) != FAULTBOX_OK) return result;
  if ((result = main->EvaluateFormat(false)) != FAULTBOX_OK) return result;
  additionalPinFiles_ = main->GetAdditionalFiles();
  if ((result = ReadPlatformConfiguration(*main)) != FAULTBOX_OK) return result;
  RegisterColumns(*main);
  hardwareInfos_.push_back(std::move(main));
  SetModified();

  for (const std::string& name : additionalPinFiles_) {
    // Names relative to the pin file's folder; the main description knows where that is.
    const std::string path = hardwareInfos_.front()->ResolveAdditionalFile(name);
    // The additional file's own platform, kept apart so that it can be compared with the system's.
    std::int32_t platform = 0;
    std::unique_ptr<QFCAbstractHardwareInfo> info = CreateHardwareInfo(path, platform, result);
    if (!info) {
      if (result == E_FAULTBOX_NULL_POINTER) TheReporter().ReportInternalFault(kPlaceNoAdditionalHardwareInfo);
      return result;
    }
    if ((result = info->LoadPinFile(true)) != FAULTBOX_OK) return result;
    if (platform != platformType_) {
      TheReporter().ReportInternal(kMsgAdditionalFilePlatform, name);
      return E_FAULTBOX_CONSISTENCY_CHECK;
    }
    RegisterColumns(*info);
    hardwareInfos_.push_back(std::move(info));
  }

  if (platformType_ <= 0) return E_FAULTBOX_CONSISTENCY_CHECK;

  ecus_.clear();
  for (const auto& info : hardwareInfos_)
    for (int i = 0; i < info->GetEcuCount(); ++i) ecus_.push_back(info->GetEcu(i));

  if (platformType_ == fptKR40Platform)
    AddTransferInterface(std::make_unique<QFCSerielleTransferInterface>(this));
  else
    AddTransferInterface(std::make_unique<QFCCANTransferInterface>(this));
  return FAULTBOX_OK;
}

HRESULT QFCSystem::ReadPlatformConfiguration(const QFCAbstractHardwareInfo& info) {
  std::string boardType;
  if (HRESULT result = info.GetFormatValue("BoardType", boardType); result != FAULTBOX_OK) return result;
  if (std::int32_t platform = PlatformOfBoardType(boardType); platform != 0) {
    platformType_ = platform;
  } else if (platformType_ != fptKR40Platform && platformType_ != fptKR60Platform) {
    TheReporter().ReportInternalFault(kPlaceUnknownPlatform);
    return E_FAULTBOX;
  }
  return platformType_ == fptKR40Platform ? ReadKR40Configuration(info) : ReadKR60Configuration(info);
}

HRESULT QFCSystem::ReadKR40Configuration(const QFCAbstractHardwareInfo& info) {
  if (HRESULT result = info.GetFormatValue("BoardType", boardType_); result != FAULTBOX_OK) return result;
  if (HRESULT result = info.GetFormatValue("FaultClassFile", failureClassFile_); result != FAULTBOX_OK)
    return result;
  return LoadSystemFailureClasses();
}

HRESULT QFCSystem::ReadKR60Configuration(const QFCAbstractHardwareInfo& info) {
  potentialNames_.clear();
  for (int i = 0; i < 5; ++i) {
    const std::string key = "Potential" + std::to_string(i);
    std::string value;
    if (HRESULT result = info.GetFormatValue(key, value); result != FAULTBOX_OK) {
      TheReporter().ReportError(kMsgPotentialMissing, key, pinFileTitle_);
      return result;
    }
    // Any number of potentials may be absent ("none"); a named one must be unique.
    if (value != "none") {
      for (const std::string& earlier : potentialNames_) {
        if (earlier == value) {
          TheReporter().ReportError(kMsgPotentialTwice, value);
          return E_FAULTBOX_CONSISTENCY_CHECK;
        }
      }
    }
    potentialNames_.push_back(value);
  }
  // Read later by GetLoadAddress; they must be there now.
  for (const char* key : {kFiuLoadAddress, kRsimLoadAddress, kOffsetLoadAddress}) {
    std::string value;
    if (HRESULT result = info.GetFormatValue(key, value); result != FAULTBOX_OK) return result;
  }
  if (HRESULT result = info.GetFormatValue("FaultClassFile", failureClassFile_); result != FAULTBOX_OK)
    return result;
  return LoadSystemFailureClasses();
}

HRESULT QFCSystem::LoadSystemFailureClasses() {
  std::string path = failureClassFile_;
  // A file name the pin file gives is found beside the pin file, whatever the working folder.
  if (path != kDefaultFailureClassFileName) path = QFCFileHelper::GetAbsolutePath(path, pinFilePath_);
  std::unique_ptr<QFCAbstractFailureClasses> classes;
  std::string used = path;
  const HRESULT result = LoadFailureClasses(path, platformType_, boardType_, &classes, &used);
  failureClassPathUsed_ = used;
  // The default file chosen is what the system names from now on.
  if (failureClassFile_ == kDefaultFailureClassFileName) failureClassFile_ = used;
  if (result != FAULTBOX_OK) return result;
  failureClasses_ = std::move(classes);
  return FAULTBOX_OK;
}

void QFCSystem::RegisterColumns(const QFCAbstractHardwareInfo& info) {
  for (const std::string& column : info.GetColumnNames()) visiblePinProperties_.emplace(column, 1);
}

// ---- answers ----

HRESULT QFCSystem::GetLoadAddress(const std::string& key, std::uint32_t& address) const {
  std::string detail;
  bool found = false;
  const QFCAbstractHardwareInfo* info = hardwareInfos_.empty() ? nullptr : hardwareInfos_.front().get();
  if (info != nullptr && (key == kFiuLoadAddress || key == kRsimLoadAddress)) {
    const std::string text = key == kFiuLoadAddress ? info->GetFIULoadModule() : info->GetRSIMLoadModule();
    if (!IsModuleNotFitted(text)) {
      std::uint32_t cabinet = 0, rack = 0, slot = 0;
      if (QFCFSHelper::ParseModuleAddress(text, cabinet, rack, slot)) {
        // One hexadecimal digit per part, computed rather than written out and
        // read back: the restricted hexadecimal reading refuses lower-case digits.
        address = QFCFSHelper::ModuleAddress(cabinet, rack, slot);
        found = true;
      } else {
        detail = "Value: " + text + ", File: " + pinFileTitle_;
      }
    }
  } else if (info != nullptr && key == kOffsetLoadAddress) {
    std::string text;
    if (info->GetFormatValue(key, text) == FAULTBOX_OK && !IsModuleNotFitted(text)) {
      // The conversion takes the value with or without its "0x".
      std::uint32_t value = 0;
      if (QFCFSHelper::StringToNumber(text, value, 16)) {
        address = value;
        found = true;
      }
    }
  }
  if (!found) {
    TheReporter().ReportInternal(kMsgInvalidValue, key, detail);
    return E_FAULTBOX_INVALID_PARAMETER;
  }
  return FAULTBOX_OK;
}

QFCECU* QFCSystem::GetECU(int index) const {
  if (index < 0 || index >= GetECUCount()) {
    TheReporter().ReportInternalFault(kPlaceEcuIndex);
    return nullptr;
  }
  return ecus_[static_cast<std::size_t>(index)];
}

void QFCSystem::GetProperties(PropertyTable& table) const {
  QFCSystemProperty::GetProperties(table);
  table[Resource(kLabelAuthor)] = author_;
  table[Resource(kLabelEcuVersion)] = std::to_string(ecuVersion_);
  table[Resource(kLabelConnection)] = Resource(connected_ ? kTextConnected : kTextNotConnected);
  table[Resource(kLabelDescription)] = description_;
  table[Resource(kLabelPinFile)] = pinFilePath_;
  table[Resource(kLabelUserMode)] =
      Resource(GetUserMode() == 2 ? kTextServiceMode : kTextStandardMode);
}

// ---- owner chain ----

bool QFCSystem::IsReadOnly() const {
  return !documentPath_.empty() && QFCFileHelper::IsWriteProtected(documentPath_);
}

void QFCSystem::SetModified() {
  if (!IsReadOnly()) modified_ = true;
}

// ---- properties ----

bool QFCSystem::CheckWritable() const {
  if (!IsReadOnly()) return true;
  TheReporter().ReportError(kMsgReadOnly, GetName());
  return false;
}

void QFCSystem::SetName(std::string name) {
  QFCAbstractObjectData::SetName(std::move(name));
  UpdateViews(kUpdateName);
}

bool QFCSystem::SetAuthor(std::string author) {
  if (!CheckWritable()) return false;
  author_ = std::move(author);
  SetModified();
  return true;
}

bool QFCSystem::SetDescription(std::string description) {
  if (!CheckWritable()) return false;
  description_ = std::move(description);
  SetModified();
  return true;
}

bool QFCSystem::SetECUVersion(std::int32_t ecuVersion) {
  if (!CheckWritable()) return false;
  ecuVersion_ = ecuVersion;
  SetModified();
  return true;
}

void QFCSystem::UpdateViews(int hint) {
  NotifyObservers(hint, nullptr);
}

// ---- document ----

void QFCSystem::Serialize(Archive& ar) {
  QFCSystemProperty::Serialize(ar);
  if (ar.IsStoring()) {
    // Each name once: loading disables every ECU of a stored name, so a name
    // written once per ECU would change the file on every load and save when
    // only some ECUs of that name were disabled.
    std::vector<const std::string*> disabled;
    for (const QFCECU* ecu : ecus_)
      if (!ecu->IsEnabled() && std::none_of(disabled.begin(), disabled.end(),
                                            [&](const std::string* name) { return *name == ecu->GetName(); }))
        disabled.push_back(&ecu->GetName());
    ar.WriteU32(static_cast<std::uint32_t>(disabled.size()));
    for (const std::string* name : disabled) ar.WriteString(*name);
    patterns_->Serialize(ar);
    rootFolder_->Serialize(ar);
    return;
  }
  // Every name takes at least its one-byte length.
  const std::uint32_t count = ar.ReadU32CountOf(1);
  std::set<std::string> disabled;
  for (std::uint32_t i = 0; i < count; ++i) disabled.insert(ar.ReadString());
  // Restoring what was saved is no change by the user: no read-only check.
  // ECUs that the pin file no longer has are forgotten.
  for (QFCECU* ecu : ecus_)
    if (disabled.count(ecu->GetName()) != 0) ecu->SetEnabled(false, true);
  // The patterns load after the ECU states, so that their interlock runs see them.
  patterns_->Serialize(ar);
  rootFolder_->Serialize(ar);
  if (patterns_->HasLoadChanges()) SetChanged(true);
}

// ---- patterns ----

HRESULT QFCSystem::CreatePattern(const std::string& name, QFCAbstractFailurePattern*& pattern) {
  pattern = nullptr;
  if (!CheckWritable()) return E_FAULTBOX;
  return patterns_->CreatePattern(pattern, name);
}

bool QFCSystem::RemovePattern(std::string_view name) {
  if (!CheckWritable()) return false;
  if (QFCAbstractFailurePattern* pattern = FindPattern(name);
      pattern != nullptr && pattern->IsAnyPinActivated()) {
    TheReporter().ReportError(kMsgPatternActivated);
    return false;
  }
  return patterns_->RemovePattern(name);
}

bool QFCSystem::RenamePattern(QFCAbstractFailurePattern* pattern, const std::string& name) {
  if (!CheckWritable()) return false;
  return patterns_->RenamePattern(pattern, name);
}

QFCAbstractFailurePattern* QFCSystem::FindPattern(std::string_view name) const {
  return patterns_->FindPattern(name);
}

QFCECU* QFCSystem::FindECU(std::string_view name) const {
  for (QFCECU* ecu : ecus_)
    if (ecu->GetName() == name) return ecu;
  return nullptr;
}

QFCAbstractPin* QFCSystem::FindPin(std::string_view ecuName, std::string_view pinName) const {
  // Additional pin files may list an ECU of the same name again.
  for (QFCECU* ecu : ecus_)
    if (ecu->GetName() == ecuName)
      if (QFCAbstractPin* pin = ecu->FindPin(pinName)) return pin;
  return nullptr;
}

std::string QFCSystem::GetPinFileBoardType() const {
  // Only the KR40 family keeps the board type; KR60 leaves it in the pin file.
  if (!boardType_.empty() || hardwareInfos_.empty()) return boardType_;
  std::string value;
  if (hardwareInfos_.front()->GetFormatValue("BoardType", value) != FAULTBOX_OK) value.clear();
  return value;
}

bool QFCSystem::HasActivatedPattern(QFCAbstractFailurePattern*& pattern) const {
  pattern = nullptr;
  return patterns_ && patterns_->GetActivatedPattern(pattern);
}

bool QFCSystem::IsPatternActivated() const {
  QFCAbstractFailurePattern* pattern = nullptr;
  return HasActivatedPattern(pattern);
}

}  // namespace faultbox
