// The shared pattern operations: pins, PinConfig, the activation sequence,
// the shared part of Reset and of a failure class choice, and the pattern record.
#include "patterns/QFCAbstractFailurePattern.h"

#include <algorithm>
#include <vector>

#include "comm/QFCAbstractTransferInterface.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCAbstractPin.h"
#include "platform/QFCReporter.h"
#include "platform/UserMode.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCAbstractFailurePatternSafetyInterlock.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/QFCFailurePatterns.h"
#include "platform/Archive.h"
#include "platform/MessageTable.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kMsgPinIndex = 43;
constexpr int kMsgBuildFailed = 51;
constexpr int kMsgActivatedNotReset = 82;
constexpr int kMsgNoPinSelected = 89;
constexpr int kMsgNoPinCanBeActivated = 90;
constexpr int kMsgOtherPatternActive = 97;
constexpr int kMsgReadOnly = 118;
constexpr int kMsgNotConnected = 120;
constexpr int kMsgClassNotFound = 126;
constexpr int kMsgPatternActivated = 127;
constexpr int kMsgClassRefused = 129;
constexpr int kMsgClassNotDefined = 130;
constexpr int kMsgPinDeleted = 149;
constexpr int kMsgRelayVectorIndex = 150;
constexpr int kMsgActivating = 164;
constexpr int kMsgDeactivating = 166;
constexpr int kMsgResetFailed = 944;
constexpr int kMsgNoPinReady = 945;

constexpr int kPlaceNoTransferInterface = 6002;
constexpr int kPlaceChoiceInvalidPin = 6003;
constexpr int kPlaceChoiceNoClasses = 6004;
constexpr int kPlaceChoiceNoMask = 6005;

}  // namespace

QFCAbstractFailurePattern::QFCAbstractFailurePattern(std::string name, QFCSystem* system)
    : QFCAbstractObjectData(std::move(name), kKindPattern, system), system_(system) {}

QFCAbstractFailurePattern::~QFCAbstractFailurePattern() {
  // The interlock refers to the pins: it goes first.
  interlock_.reset();
  pins_.reset();
}

bool QFCAbstractFailurePattern::IsServiceMode() {
  return GetUserMode() == 2;
}

QFCAbstractFailureClasses* QFCAbstractFailurePattern::GetFailureClasses() const {
  return system_ ? system_->GetFailureClasses() : nullptr;
}

bool QFCAbstractFailurePattern::CheckWritable() const {
  if (!IsReadOnly()) return true;
  TheReporter().ReportError(kMsgReadOnly, system_ ? system_->GetName() : std::string());
  return false;
}

void QFCAbstractFailurePattern::SetName(std::string name) {
  QFCAbstractObjectData::SetName(std::move(name));
  SetModified();
}

void QFCAbstractFailurePattern::UpdateViews(int hint, void* extra) {
  if (system_) system_->NotifyObservers(hint, extra ? extra : this);
  if (collection_) {
    for (int i = 0; i < collection_->GetCount(); ++i) collection_->GetAt(i)->NotifyObservers(hint, extra);
  } else {
    NotifyObservers(hint, extra);
  }
}

void QFCAbstractFailurePattern::OpenSavedView() {
  if (viewFlag_ != 1) return;
  if (collection_ && collection_->GetViewOpener()) collection_->GetViewOpener()(*this);
  viewFlag_ = -1;
}

// ---- platform operations: the base behaviour ----

HRESULT QFCAbstractFailurePattern::Initialize() {
  pins_ = std::make_unique<QFCFailurePatternPins>(this);
  return FAULTBOX_OK;
}

void QFCAbstractFailurePattern::ReleaseParts() {
  interlock_.reset();
  if (pins_) {
    // The uses the pins hold would otherwise stay taken for good.
    pins_->ReleaseFailureClasses();
    pins_.reset();
  }
}

std::unique_ptr<QFCAbstractPin> QFCAbstractFailurePattern::CreatePlaceholderPin() {
  return nullptr;
}

std::unique_ptr<QFCAbstractFailurePatternPin> QFCAbstractFailurePattern::CreatePatternPin() {
  return nullptr;
}

HRESULT QFCAbstractFailurePattern::SetFailureClass(QFCAbstractFailurePatternPin*, std::int32_t,
                                                   std::int32_t) {
  return E_FAULTBOX;
}

bool QFCAbstractFailurePattern::IsFailureClassAllowed(const QFCAbstractFailurePatternPin*,
                                                      std::int32_t) const {
  return true;
}

bool QFCAbstractFailurePattern::FillRequirementVector(const QFCAbstractFailurePatternPin* pin,
                                                      std::vector<std::uint32_t>& vector) {
  if (pin == nullptr || vector.size() < QFCAbstractFailurePatternPin::kPinConfigEntries) return false;
  const auto& config = pin->GetPinConfig();
  for (std::size_t k = 0; k < config.size(); ++k)
    vector[k] = config[k] == QFCAbstractFailurePatternPin::kEntryOn ? 1 : 0;
  return true;
}

void QFCAbstractFailurePattern::FreeMessages(QFCMessageList& messages) {
  messages.clear();
}

HRESULT QFCAbstractFailurePattern::TransferMessages(QFCMessageList&, bool) {
  return E_FAULTBOX;
}

bool QFCAbstractFailurePattern::BuildMessages(QFCMessageList&, bool) {
  return false;
}

bool QFCAbstractFailurePattern::OnPinChanged(QFCAbstractFailurePatternPin* pin) {
  bool result = false;
  if (interlock_) {
    if (system_ == nullptr || !IsServiceMode() || pin == nullptr)
      result = interlock_->CheckAll();
    else
      result = interlock_->CheckPin(pin);
  }
  if (viewOpen_ || !GetObservers().empty()) UpdateViews(pin ? kHintPinChanged : kHintChanged, pin);
  SetModified();
  return result;
}

// ---- pins ----

int QFCAbstractFailurePattern::GetPinCount() const {
  return pins_ ? pins_->GetCount() : 0;
}

QFCAbstractFailurePatternPin* QFCAbstractFailurePattern::GetPinAt(int index) const {
  if (!pins_ || index < 0 || index >= pins_->GetCount()) {
    TheReporter().ReportInternal(kMsgPinIndex, std::to_string(index));
    return nullptr;
  }
  return pins_->GetAt(index);
}

bool QFCAbstractFailurePattern::AddPins(const std::vector<QFCAbstractPin*>& pins) {
  if (!CheckWritable() || !pins_) return false;
  for (QFCAbstractPin* pin : pins) {
    if (pin == nullptr) continue;
    // An entry that yields no pattern pin has been reported and is skipped.
    QFCAbstractFailurePatternPin* out = nullptr;
    pins_->AddPin(pin, out, false);
  }
  OnPinChanged(nullptr);
  SetModified();
  return true;
}

bool QFCAbstractFailurePattern::RemovePins(const std::vector<QFCAbstractFailurePatternPin*>& pins) {
  if (!CheckWritable() || !pins_) return false;
  const bool result = pins_->RemovePins(pins);
  SetModified();
  OnPinChanged(nullptr);
  return result;
}

void QFCAbstractFailurePattern::SelectAllPins(bool select) {
  if (!pins_) return;
  for (const auto& pin : pins_->GetList()) pin->SetSelected(select);
  UpdateViews(kHintChanged);
}

void QFCAbstractFailurePattern::ResetPinConfigs(const std::vector<QFCAbstractFailurePatternPin*>& pins) {
  if (!CheckWritable()) return;
  for (QFCAbstractFailurePatternPin* pin : pins) {
    if (pin == nullptr || pin->GetPattern() != this) continue;
    if (pin->IsActivated()) {
      TheReporter().ReportWarning(kMsgActivatedNotReset, pin->GetPinName());
      continue;
    }
    pin->SetPinConfigs({0, 0, 0, 0, 0});
  }
  if (interlock_) interlock_->CheckAll();
  UpdateViews(kHintChanged);
  SetModified();
}

bool QFCAbstractFailurePattern::ClearAllPinConfigs() {
  if (!CheckWritable() || !pins_) return false;
  for (const auto& pin : pins_->GetList())
    if (!pin->IsActivated()) pin->SetPinConfigs({0, 0, 0, 0, 0});
  const bool result = OnPinChanged(nullptr);
  SetModified();
  return result;
}

// ---- Reset ----

QFCAbstractFailurePattern::ResetOutcome QFCAbstractFailurePattern::ResetBase() {
  if (IsAnyPinActivated()) return ResetOutcome::kPinActivated;
  if (!CheckWritable()) return ResetOutcome::kReadOnly;
  if (pins_)
    for (const auto& pin : pins_->GetList()) pin->SetPinConfigs({0, 0, 0, 0, 0});
  UpdateViews(kHintChanged);
  SetModified();
  return ResetOutcome::kDone;
}

bool QFCAbstractFailurePattern::Reset() {
  return ResetBase() == ResetOutcome::kDone;
}

// ---- activation ----

bool QFCAbstractFailurePattern::IsAnyPinActivated() const {
  if (!pins_) return false;
  for (const auto& pin : pins_->GetList())
    if (pin->IsActivated()) return true;
  return false;
}

int QFCAbstractFailurePattern::CountSelectedPins() const {
  int count = 0;
  if (pins_)
    for (const auto& pin : pins_->GetList())
      if (pin->IsSelected()) ++count;
  return count;
}

bool QFCAbstractFailurePattern::CanAnyPinBeActivated() const {
  if (!pins_) return false;
  for (const auto& pin : pins_->GetList())
    if (pin->CanBeActivated()) return true;
  return false;
}

void QFCAbstractFailurePattern::ClearActivatedFlags() {
  if (pins_)
    for (const auto& pin : pins_->GetList()) pin->SetActivated(false);
  UpdateViews(kHintActivation);
}

void QFCAbstractFailurePattern::ResetHardwareAfterFailure() {
  if (collection_) {
    if (collection_->ResetHardware() != FAULTBOX_OK)
      TheReporter().ReportError(kMsgResetFailed, system_ ? system_->GetName() : std::string());
  } else {
    ClearActivatedFlags();
  }
}

HRESULT QFCAbstractFailurePattern::InternalFault(int place) {
  TheReporter().ReportInternalFault(place);
  return E_FAULTBOX_NULL_POINTER;
}

QFCAbstractTransferInterface* QFCAbstractFailurePattern::ConnectedTransferInterface(int placeMissing,
                                                                                    HRESULT& result) const {
  QFCAbstractTransferInterface* transfer = system_ ? system_->GetTransferInterface() : nullptr;
  if (transfer == nullptr) {
    result = InternalFault(placeMissing);
    return nullptr;
  }
  if (!transfer->IsConnected()) {
    TheReporter().ReportError(kMsgNotConnected);
    result = E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE;
    return nullptr;
  }
  return transfer;
}

HRESULT QFCAbstractFailurePattern::ActivatePattern(bool activate) {
  TheReporter().ReportInfo(activate ? kMsgActivating : kMsgDeactivating, GetName());
  // Nothing is on the hardware: nothing to send, connected or not.
  if (!activate && !IsAnyPinActivated()) return FAULTBOX_OK;

  HRESULT result = FAULTBOX_OK;
  if (ConnectedTransferInterface(kPlaceNoTransferInterface, result) == nullptr) return result;
  // At most one pattern of a system holds activated pins.
  QFCAbstractFailurePattern* active = nullptr;
  if (collection_ && collection_->GetActivatedPattern(active) && active != this) {
    TheReporter().ReportError(kMsgOtherPatternActive, active->GetName());
    return E_FAULTBOX;
  }
  if (CountSelectedPins() == 0) {
    TheReporter().ReportError(kMsgNoPinSelected);
    return E_FAULTBOX;
  }
  if (!CanAnyPinBeActivated()) {
    TheReporter().ReportError(kMsgNoPinCanBeActivated);
    return E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED;
  }
  // The pins to switch on now; those activated before stay as they are.
  std::vector<QFCAbstractFailurePatternPin*> switchedOn;
  bool anySelected = false;
  for (const auto& pin : pins_->GetList()) {
    if (pin->IsSelected() && !pin->IsReadyForActivation()) pin->SetSelected(false);
    if (!pin->IsSelected()) continue;
    anySelected = true;
    if (!pin->IsActivated()) switchedOn.push_back(pin.get());
  }
  // Without a pin to switch, frames of the external hardware alone would
  // still go out, and the activation would pass for one that switched.
  if (activate && !anySelected) {
    TheReporter().ReportError(kMsgNoPinReady, GetName());
    return E_FAULTBOX_ACTIVATE_FAILURE_PATTERN;
  }

  QFCMessageList messages;
  const auto leftOut = [](const QFCAbstractFailurePatternPin* pin) { return !pin->IsSelected(); };
  if (!BuildMessages(messages, activate)) {
    TheReporter().ReportError(kMsgBuildFailed);
    result = E_FAULTBOX_MESSAGE_BUILD;
  } else if (activate && !switchedOn.empty() && std::all_of(switchedOn.begin(), switchedOn.end(), leftOut)) {
    // The builder left out every pin that was to go on (it said why).
    TheReporter().ReportError(kMsgNoPinReady, GetName());
    result = E_FAULTBOX_ACTIVATE_FAILURE_PATTERN;
  } else {
    result = TransferMessages(messages, activate);
    if (result == FAULTBOX_OK) {
      for (const auto& pin : pins_->GetList())
        if (pin->IsSelected()) pin->SetActivated(activate);
    } else {
      // What reached the hardware is unknown: switch every relay back.
      ResetHardwareAfterFailure();
    }
  }
  FreeMessages(messages);
  UpdateViews(kHintActivation);
  return result;
}

// ---- the shared part of a failure class choice ----

HRESULT QFCAbstractFailurePattern::CheckFailureClassChoice(QFCAbstractFailurePatternPin* pin,
                                                           std::int32_t failureClassId,
                                                           std::int32_t relayVectorIndex,
                                                           std::uint64_t& mask) {
  if (IsReadOnly()) {
    TheReporter().ReportError(kMsgReadOnly, system_ ? system_->GetName() : std::string());
    return E_FAULTBOX;
  }
  if (pin == nullptr || pin->GetPattern() != this || pin->GetPin() == nullptr) {
    TheReporter().ReportInternalFault(kPlaceChoiceInvalidPin);
    return E_FAULTBOX_NULL_POINTER;
  }
  if (!pin->IsFromPinFile()) {
    TheReporter().ReportError(kMsgPinDeleted, pin->GetPinName(), pin->GetEcuName());
    return E_FAULTBOX_PIN_WAS_DELETED_FROM_PIN_FILE;
  }
  if (IsAnyPinActivated()) {
    TheReporter().ReportError(kMsgPatternActivated);
    return E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED;
  }
  if (!pin->HasDefinedFailureClass(failureClassId)) {
    TheReporter().ReportError(kMsgClassNotDefined, pin->GetPinName());
    return E_FAULTBOX;
  }
  QFCAbstractFailureClasses* classes = GetFailureClasses();
  QFCAbstractFailureClass* failureClass = classes ? classes->FindById(failureClassId) : nullptr;
  if (failureClass == nullptr) {
    TheReporter().ReportError(kMsgClassNotFound,
                         std::to_string(failureClassId) + "(" + std::to_string(relayVectorIndex) + ")");
    return E_FAULTBOX;
  }
  // A negative index names no relay vector either.
  if (relayVectorIndex < 0 || relayVectorIndex >= failureClass->GetPossibilityCount()) {
    TheReporter().ReportError(kMsgRelayVectorIndex, std::to_string(failureClassId),
                         std::to_string(relayVectorIndex));
    return E_FAULTBOX_INVALID_PARAMETER;
  }
  if (!IsFailureClassAllowed(pin, failureClassId)) {
    TheReporter().ReportError(kMsgClassRefused);
    return E_FAULTBOX;
  }
  if (failureClass->GetPossibilityCount() == 0) {
    TheReporter().ReportInternalFault(kPlaceChoiceNoClasses);
    return E_FAULTBOX_INVALID_PARAMETER;
  }
  if (!failureClass->GetRelayMask(relayVectorIndex, mask)) {
    TheReporter().ReportInternalFault(kPlaceChoiceNoMask);
    return E_FAULTBOX_INVALID_PARAMETER;
  }
  return FAULTBOX_OK;
}

// ---- the pattern record ----

void QFCAbstractFailurePattern::Serialize(Archive& ar) {
  if (!pins_) pins_ = std::make_unique<QFCFailurePatternPins>(this);
  if (ar.IsStoring()) {
    ar.WriteI32(viewOpen_ ? 1 : 0);
    ar.WriteString(GetName());
    int lost = 0;
    pins_->Serialize(ar, lost);
    return;
  }
  viewFlag_ = ar.ReadI32();
  QFCAbstractObjectData::SetName(ar.ReadString());
  int lost = 0;
  pins_->Serialize(ar, lost);
  if (lost > 0 && collection_) collection_->AddLostPins(lost);
}

}  // namespace faultbox
