// The KR40 family's pattern: its parts, Reset, and the translation of a
// failure class choice into PinConfig entries.
#include "patterns/QFCKR40FailurePattern.h"

#include "config/QFCAbstractHardwareInfo.h"
#include "config/QFCKR40Pin.h"
#include "host/QFCFaultboxApp.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/QFCKR40FailurePatternPin.h"
#include "patterns/QFCKR40FailurePatternSafetyInterlock.h"
#include "systems/QFCSystem.h"

namespace faultbox {

HRESULT QFCKR40FailurePattern::Initialize() {
  ReleaseParts();
  if (HRESULT result = QFCAbstractFailurePattern::Initialize(); result != FAULTBOX_OK) return result;
  interlock_ = std::make_unique<QFCKR40FailurePatternSafetyInterlock>(this);
  return FAULTBOX_OK;
}

bool QFCKR40FailurePattern::Reset() {
  // A read-only document refuses; an activated pin only keeps its settings,
  // and the interlock still runs.
  if (ResetBase() == ResetOutcome::kReadOnly) return false;
  return OnPinChanged(nullptr);
}

HRESULT QFCKR40FailurePattern::SetFailureClass(QFCAbstractFailurePatternPin* pin, std::int32_t failureClassId,
                                               std::int32_t relayVectorIndex) {
  std::uint64_t mask = 0;
  if (HRESULT result = CheckFailureClassChoice(pin, failureClassId, relayVectorIndex, mask);
      result != FAULTBOX_OK)
    return result;
  pin->SetPinConfigs({0, 0, 0, 0, 0});
  // One entry at a time, as the user would switch them: each switch runs the
  // interlock, which judges the entries switched so far.
  for (int position = 0; position < QFCAbstractFailurePatternPin::kPinConfigEntries; ++position)
    if ((mask >> position) & 1u) pin->SetPinConfig(position, QFCAbstractFailurePatternPin::kEntryOn, false);
  return FAULTBOX_OK;
}

std::unique_ptr<QFCAbstractPin> QFCKR40FailurePattern::CreatePlaceholderPin() {
  QFCSystem* system = GetOwnerSystem();
  return std::make_unique<QFCKR40Pin>(system ? system->GetPlatformType() : fptKR40Platform, system);
}

std::unique_ptr<QFCAbstractFailurePatternPin> QFCKR40FailurePattern::CreatePatternPin() {
  return std::make_unique<QFCKR40FailurePatternPin>(this);
}

void QFCKR40FailurePattern::Serialize(Archive& ar) {
  QFCAbstractFailurePattern::Serialize(ar);
  // Nothing of the platform is stored; the classes are derived, never stored.
  SetInterlockEnabled(true);
  if (interlock_) interlock_->CheckAll();
}

}  // namespace faultbox
