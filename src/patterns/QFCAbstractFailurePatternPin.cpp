// The shared pattern pin: names and module of the referenced pin, PinConfig
// changes, and the failure class the interlock gives it.
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "platform/MessageTable.h"

#include <cstdio>

#include "config/QFCAbstractFailureClass.h"
#include "config/QFCAbstractPin.h"
#include "config/QFCECU.h"
#include "config/QFCFSHelper.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kMsgReadOnly = 118;
constexpr int kMsgClassNotFound = 126;

constexpr int kResNoFailureClass = 6764;
constexpr int kResSharedEntry = 6766;
constexpr int kResNoClass = 6777;
constexpr int kResNoneDefined = 6778;
constexpr int kResNoneInFile = 6779;
constexpr int kResEntriesForbidden = 6780;
constexpr int kResBoard = 6781;
constexpr int kResUsedUp = 6782;
constexpr int kResNothingFits = 6783;
constexpr int kResEcuDisabled = 6784;
constexpr int kResNotInPinFile = 6785;
constexpr int kResModuleSilent = 6786;
constexpr int kResNotConfigured = 6787;
constexpr int kResClassTextFormat = 6788;

constexpr int kPlacePinNameNoPin = 6101;
constexpr int kPlaceEcuNameNoPin = 6102;
constexpr int kPlaceSetClassInvalid = 6103;
constexpr int kPlaceAdjustedNoPattern = 6104;
constexpr int kPlaceAdjustedNotFound = 6105;
constexpr int kPlaceDefinedIdNoPin = 6106;
constexpr int kPlaceDefinedClassesInvalid = 6107;
constexpr int kPlaceSetPinConfigNoPattern = 6108;
constexpr int kPlacePinConfigNotAllowed = 6109;

// A failure class entry's ID: the entry up to its parameter list, if any.
bool EntryToId(const std::string& entry, std::int32_t& id) {
  const std::size_t open = entry.find('(');
  std::uint32_t value = 0;
  if (!QFCFSHelper::StringToNumber(std::string_view(entry).substr(0, open), value, 10)) return false;
  id = static_cast<std::int32_t>(value);
  return true;
}

}  // namespace

QFCAbstractFailurePatternPin::QFCAbstractFailurePatternPin(QFCAbstractFailurePattern* pattern)
    : QFCAbstractObjectData(std::string(), kKindPin, pattern),
      pattern_(pattern),
      failureClassText_(ResourceText(kResNotConfigured)) {}

QFCAbstractFailurePatternPin::~QFCAbstractFailurePatternPin() = default;

QFCAbstractFailureClasses* QFCAbstractFailurePatternPin::FailureClasses() const {
  return pattern_ ? pattern_->GetFailureClasses() : nullptr;
}

// ---- the referenced pin ----

std::string QFCAbstractFailurePatternPin::GetPinName() const {
  if (pin_ == nullptr) {
    TheReporter().ReportInternalFault(kPlacePinNameNoPin);
    return {};
  }
  return pin_->PinName();
}

std::string QFCAbstractFailurePatternPin::GetEcuName() const {
  if (pin_ == nullptr) {
    TheReporter().ReportInternalFault(kPlaceEcuNameNoPin);
    return {};
  }
  return pin_->EcuName();
}

bool QFCAbstractFailurePatternPin::IsFromPinFile() const {
  return pin_ != nullptr && pin_->GetCompareOnLoad();
}

int QFCAbstractFailurePatternPin::GetDefinedFailureClassCount() const {
  return pin_ ? static_cast<int>(pin_->GetFailureClassCount()) : 0;
}

HRESULT QFCAbstractFailurePatternPin::GetDefinedFailureClassId(int index,
                                                               std::int32_t& failureClassId) const {
  if (pin_ == nullptr) {
    TheReporter().ReportInternalFault(kPlaceDefinedIdNoPin);
    return E_FAULTBOX_NULL_POINTER;
  }
  pin_->EnsureFailureClasses();
  const auto& entries = pin_->GetFailureClasses();
  if (index < 0 || static_cast<std::size_t>(index) >= entries.size()) return E_FAULTBOX;
  return EntryToId(entries[static_cast<std::size_t>(index)], failureClassId) ? FAULTBOX_OK : E_FAULTBOX;
}

bool QFCAbstractFailurePatternPin::HasDefinedFailureClass(std::int32_t failureClassId) {
  if (pin_ == nullptr) return false;
  pin_->EnsureFailureClasses();
  for (const std::string& entry : pin_->GetFailureClasses()) {
    std::int32_t id = 0;
    if (!EntryToId(entry, id)) return false;
    if (id == failureClassId) return true;
  }
  return false;
}

bool QFCAbstractFailurePatternPin::GetDefinedFailureClasses(
    std::vector<QFCAbstractFailureClass*>& classes) const {
  classes.clear();
  QFCAbstractFailureClasses* all = FailureClasses();
  if (pattern_ == nullptr || pin_ == nullptr || all == nullptr) {
    TheReporter().ReportInternalFault(kPlaceDefinedClassesInvalid);
    return false;
  }
  pin_->EnsureFailureClasses();
  for (const std::string& entry : pin_->GetFailureClasses()) {
    std::int32_t id = 0;
    if (!EntryToId(entry, id)) return false;
    if (QFCAbstractFailureClass* fc = all->FindById(id)) classes.push_back(fc);
  }
  return true;
}

std::string QFCAbstractFailurePatternPin::GetRefusalReason() const {
  auto text = [](int id, std::initializer_list<std::string_view> args = {}) {
    return ResourceText(id, args);
  };
  switch (refusal_) {
    case Refusal::kNone:
      return {};
    case Refusal::kNoneDefined:
      return text(kResNoneDefined);
    case Refusal::kNoneInFile: {
      std::string ids;
      for (int i = 0; i < GetDefinedFailureClassCount(); ++i) {
        std::int32_t id = 0;
        if (GetDefinedFailureClassId(i, id) == FAULTBOX_OK)
          ids += (ids.empty() ? "" : ", ") + std::to_string(id);
      }
      return text(kResNoneInFile, {ids});
    }
    case Refusal::kEntriesForbidden:
      return text(kResEntriesForbidden);
    case Refusal::kBoard:
      return text(kResBoard);
    case Refusal::kUsedUp:
      return text(kResUsedUp, {std::to_string(refusalClassId_)});
    case Refusal::kNothingFits:
      return text(kResNothingFits);
    case Refusal::kSharedEntry:
      return text(kResSharedEntry);
  }
  return {};
}

std::string QFCAbstractFailurePatternPin::GetNotReadyReason() const {
  if (IsReadyForActivation()) return {};
  if (pin_ == nullptr || !IsFromPinFile()) return ResourceText(kResNotInPinFile);
  if (!canBeActivated_) {
    std::string reason = GetRefusalReason();
    return reason.empty() ? ResourceText(kResNoClass) : reason;
  }
  const QFCECU* ecu = pin_->GetEcu();
  if (ecu == nullptr || !ecu->IsEnabled())
    return ResourceText(kResEcuDisabled, {GetEcuName()});
  std::uint32_t address = 0;
  char text[16] = "?";
  if (GetModuleAddress(address)) std::snprintf(text, sizeof text, "0x%03X", address);
  return ResourceText(kResModuleSilent, {text});
}

bool QFCAbstractFailurePatternPin::IsReadyForActivation() const {
  if (!canBeActivated_ || pin_ == nullptr || !IsFromPinFile()) return false;
  const QFCECU* ecu = pin_->GetEcu();
  if (ecu == nullptr || !ecu->IsEnabled()) return false;
  const QFCSystem* system = pattern_ ? pattern_->GetOwnerSystem() : nullptr;
  std::uint32_t address = 0;
  if (system == nullptr || !GetModuleAddress(address) || address > 0xFFFF) return false;
  return system->GetRespondingModules().count(static_cast<std::uint16_t>(address)) != 0;
}

// ---- platform operations: the base behaviour ----

bool QFCAbstractFailurePatternPin::GetModuleAddress(std::uint32_t&) const {
  return false;
}

bool QFCAbstractFailurePatternPin::GetModuleChannels(std::vector<std::uint32_t>&) const {
  return false;
}

bool QFCAbstractFailurePatternPin::IsPinConfigAllowed(int, std::uint32_t) const {
  return false;
}

// ---- failure class ----

bool QFCAbstractFailurePatternPin::SetFailureClass(const std::vector<QFTFoundFailureClass>& found) {
  QFCAbstractFailureClasses* classes = FailureClasses();
  QFCAbstractFailureClass* failureClass =
      found.empty() || classes == nullptr ? nullptr : classes->FindById(found.front().failureClassId);
  if (failureClass == nullptr) {
    TheReporter().ReportInternalFault(kPlaceSetClassInvalid);
    return false;
  }
  failureClassId_ = found.front().failureClassId;
  relayVectorIndex_ = found.front().relayVectorIndex;
  failureClass->TryUse();
  failureClassText_ = ResourceText(
      kResClassTextFormat,
      {failureClass->GetName(), std::to_string(failureClassId_), std::to_string(relayVectorIndex_)});
  return true;
}

void QFCAbstractFailurePatternPin::ResetFailureClass() {
  failureClassId_ = -1;
  relayVectorIndex_ = -1;
  failureClassText_ = ResourceText(kResNoFailureClass);
}

QFCAbstractFailureClass* QFCAbstractFailurePatternPin::GetAdjustedFailureClass(
    std::int32_t& failureClassId, std::int32_t& relayVectorIndex) {
  if (pattern_ == nullptr) {
    TheReporter().ReportInternalFault(kPlaceAdjustedNoPattern);
    return nullptr;
  }
  if (failureClassId_ == -1 || relayVectorIndex_ == -1) return nullptr;
  QFCAbstractFailureClasses* classes = FailureClasses();
  QFCAbstractFailureClass* failureClass = classes ? classes->FindById(failureClassId_) : nullptr;
  if (failureClass != nullptr && failureClass->HasPossibility(relayVectorIndex_)) {
    failureClassId = failureClassId_;
    relayVectorIndex = relayVectorIndex_;
    failureClass->SetSelectedPossibility(relayVectorIndex_);
    return failureClass;
  }
  TheReporter().ReportError(kMsgClassNotFound,
                       std::to_string(failureClassId_) + "(" + std::to_string(relayVectorIndex_) + ")");
  TheReporter().ReportInternalFault(kPlaceAdjustedNotFound);
  return nullptr;
}

void QFCAbstractFailurePatternPin::ReleaseFailureClass() {
  if (failureClassId_ == -1) return;
  QFCAbstractFailureClasses* classes = FailureClasses();
  if (QFCAbstractFailureClass* failureClass = classes ? classes->FindById(failureClassId_) : nullptr)
    failureClass->ReleaseUse();
  ResetFailureClass();
  canBeActivated_ = false;
}

// ---- PinConfig ----

void QFCAbstractFailurePatternPin::GetPinConfig(std::uint32_t& e0, std::uint32_t& e1, std::uint32_t& e2,
                                                std::uint32_t& e3, std::uint32_t& e4) const {
  e0 = pinConfig_[0];
  e1 = pinConfig_[1];
  e2 = pinConfig_[2];
  e3 = pinConfig_[3];
  e4 = pinConfig_[4];
}

bool QFCAbstractFailurePatternPin::SetPinConfig(int index, std::uint32_t value, bool updateViews) {
  if (pattern_ == nullptr) {
    TheReporter().ReportInternalFault(kPlaceSetPinConfigNoPattern);
    return false;
  }
  if (pattern_->IsReadOnly()) {
    QFCSystem* system = pattern_->GetOwnerSystem();
    TheReporter().ReportError(kMsgReadOnly, system ? system->GetName() : std::string());
    pattern_->UpdateViews();
    return false;
  }
  if (!IsPinConfigAllowed(index, value)) return false;
  // IsPinConfigAllowed has vouched for the index; a platform that lets a
  // wider one through must not write past the entries.
  if (index < 0 || index >= kPinConfigEntries) {
    TheReporter().ReportInternalFault(kPlacePinConfigNotAllowed);
    return false;
  }
  pinConfig_[static_cast<std::size_t>(index)] = value & 0xFF;
  pattern_->OnPinChanged(this);
  if (updateViews) pattern_->UpdateViews(QFCAbstractFailurePattern::kHintPinChanged, this);
  return true;
}

bool QFCAbstractFailurePatternPin::ClearPinConfig() {
  if (pattern_ == nullptr) return false;
  if (pattern_->IsReadOnly()) {
    QFCSystem* system = pattern_->GetOwnerSystem();
    TheReporter().ReportError(kMsgReadOnly, system ? system->GetName() : std::string());
    return false;
  }
  // An activated pin's relays are on the hardware: its settings stay.
  if (activated_) return false;
  pinConfig_ = {0, 0, 0, 0, 0};
  pattern_->OnPinChanged(nullptr);
  pattern_->SetModified();
  return true;
}

}  // namespace faultbox
