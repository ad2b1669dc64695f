// The interlock's shared rules and the skeleton of one pin's check.
#include "patterns/QFCAbstractFailurePatternSafetyInterlock.h"

#include "config/QFCAbstractFailureClass.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternPins.h"

namespace faultbox {

namespace {

constexpr int kPlacePossibleInvalid = 6401;
constexpr int kPlaceAdjustInvalid = 6402;
constexpr int kPlaceAdjustMissing = 6403;
constexpr int kPlaceCheckNotPlatformPin = 6404;
constexpr int kPlaceCheckAdjustFailed = 6405;
constexpr int kPlaceCheckExternal = 6406;
constexpr int kPlaceCheckRequirement = 6407;
constexpr int kPlaceCheckNoClasses = 6408;

constexpr std::size_t kEntries = QFCAbstractFailurePatternPin::kPinConfigEntries;

}  // namespace

void QFCAbstractFailurePatternSafetyInterlock::GetPossibleFailureClasses(
    const QFCAbstractFailurePatternPin* pin, std::vector<QFTFoundFailureClass>& candidates) {
  candidates.clear();
  QFCAbstractFailurePattern* pattern = GetPattern();
  const QFCAbstractFailureClasses* classes = pattern ? pattern->GetFailureClasses() : nullptr;
  if (pin == nullptr || classes == nullptr) {
    TheReporter().ReportInternalFault(kPlacePossibleInvalid);
    return;
  }
  const auto& config = pin->GetPinConfig();
  const int defined = pin->GetDefinedFailureClassCount();
  for (int i = 0; i < defined; ++i) {
    std::int32_t id = 0;
    if (pin->GetDefinedFailureClassId(i, id) != FAULTBOX_OK) continue;
    const QFCAbstractFailureClass* failureClass = classes->FindById(id);
    if (failureClass == nullptr) continue;
    for (int j = 0; j < failureClass->GetPossibilityCount(); ++j) {
      const QFTPossibility* vector = failureClass->GetPossibility(j);
      bool forbidsSwitchedOn = false;
      for (std::size_t k = 0; k < kEntries && !forbidsSwitchedOn; ++k)
        forbidsSwitchedOn =
            config[k] == QFCAbstractFailurePatternPin::kEntryOn && vector->RelayState(k) == kRelayOff;
      if (!forbidsSwitchedOn) candidates.push_back({id, j});
    }
  }
}

bool QFCAbstractFailurePatternSafetyInterlock::AdjustPinConfig(
    QFCAbstractFailurePatternPin* pin, const std::vector<QFTFoundFailureClass>& candidates) {
  QFCAbstractFailurePattern* pattern = GetPattern();
  const QFCAbstractFailureClasses* classes = pattern ? pattern->GetFailureClasses() : nullptr;
  if (pin == nullptr || classes == nullptr) {
    TheReporter().ReportInternalFault(kPlaceAdjustInvalid);
    return false;
  }
  QFCAbstractFailurePatternPin::PinConfig config = pin->GetPinConfig();
  for (std::uint32_t& entry : config)
    if (entry != QFCAbstractFailurePatternPin::kEntryOn)
      entry = QFCAbstractFailurePatternPin::kEntryUnavailable;
  for (const QFTFoundFailureClass& candidate : candidates) {
    const QFCAbstractFailureClass* failureClass = classes->FindById(candidate.failureClassId);
    const QFTPossibility* vector =
        failureClass ? failureClass->GetPossibility(candidate.relayVectorIndex) : nullptr;
    if (vector == nullptr) {
      TheReporter().ReportInternalFault(kPlaceAdjustMissing);
      return false;
    }
    for (std::size_t k = 0; k < kEntries; ++k)
      if (vector->RelayState(k) != kRelayOff && config[k] != QFCAbstractFailurePatternPin::kEntryOn)
        config[k] = QFCAbstractFailurePatternPin::kEntryOff;
  }
  pin->SetPinConfigs(config);
  return true;
}

bool QFCAbstractFailurePatternSafetyInterlock::CheckPinWith(QFCAbstractFailurePatternPin* pin,
                                                            const QFCAbstractFailureClasses* classes,
                                                            std::vector<std::uint32_t>* requirement) {
  return CheckPinSkeleton(pin, classes, requirement);
}

const QFCAbstractFailureClasses* QFCAbstractFailurePatternSafetyInterlock::BeginFullCheck(int placeNoPattern,
                                                                                          int placeNoClasses,
                                                                                          bool& result) {
  result = false;
  QFCAbstractFailurePattern* pattern = GetPattern();
  if (pattern == nullptr) {
    TheReporter().ReportInternalFault(placeNoPattern);
    return nullptr;
  }
  result = true;
  if (!pattern->IsInterlockEnabled()) return nullptr;
  const QFCAbstractFailureClasses* classes = pattern->GetFailureClasses();
  if (classes == nullptr) {
    TheReporter().ReportInternalFault(placeNoClasses);
    result = false;
  }
  return classes;
}

bool QFCAbstractFailurePatternSafetyInterlock::CheckEveryPin(const QFCAbstractFailureClasses* classes,
                                                             std::vector<std::uint32_t>* requirement,
                                                             bool explicitFirst) {
  QFCFailurePatternPins* pins = GetPattern()->GetPins();
  if (pins == nullptr) return true;
  FullCheckScope scope(*this);
  if (explicitFirst)
    for (const auto& pin : pins->GetList())
      if (pin->IsExplicitChoice() && !CheckPinWith(pin.get(), classes, requirement)) return false;
  for (const auto& pin : pins->GetList())
    if (!CheckPinWith(pin.get(), classes, requirement)) return false;
  return true;
}

void QFCAbstractFailurePatternSafetyInterlock::MarkModified() {
  if (inFullCheck_ && markedInFullCheck_) return;
  if (QFCAbstractFailurePattern* pattern = GetPattern()) pattern->SetModified();
  markedInFullCheck_ = true;
}

bool QFCAbstractFailurePatternSafetyInterlock::CheckPinSkeleton(QFCAbstractFailurePatternPin* pin,
                                                                const QFCAbstractFailureClasses* classes,
                                                                std::vector<std::uint32_t>* requirement) {
  if (pin == nullptr || !IsPlatformPin(pin)) {
    TheReporter().ReportInternalFault(kPlaceCheckNotPlatformPin);
    return false;
  }
  // A placeholder has no hardware behind it, and an activated pin's class is
  // on the hardware: neither may change.
  if (!pin->IsFromPinFile()) return true;
  if (pin->IsActivated()) return true;

  MarkModified();
  pin->SetCanBeActivated(false);
  pin->SetRefusal(QFCAbstractFailurePatternPin::Refusal::kNone);

  GetPossibleFailureClasses(pin, candidates_);
  const std::size_t possible = candidates_.size();
  FilterCandidates(candidates_);
  if (!AdjustPinConfig(pin, candidates_)) {
    TheReporter().ReportInternalFault(kPlaceCheckAdjustFailed);
    return false;
  }

  // The class held so far is given back before the choice, so that the pin
  // can take it again even when its use limit is reached.
  std::int32_t heldId = -1;
  std::int32_t heldIndex = -1;
  if (QFCAbstractFailureClass* held = pin->GetAdjustedFailureClass(heldId, heldIndex)) {
    held->ReleaseUse();
    pin->ResetFailureClass();
  }

  if (requirement == nullptr) {
    ownRequirement_.assign(kRequirementPositions, 0);
    requirement = &ownRequirement_;
    if (!FillExternalRequirement(*requirement)) {
      TheReporter().ReportInternalFault(kPlaceCheckExternal);
      return false;
    }
  }
  QFCAbstractFailurePattern* pattern = GetPattern();
  if (pattern == nullptr || !pattern->FillRequirementVector(pin, *requirement)) {
    TheReporter().ReportInternalFault(kPlaceCheckRequirement);
    return false;
  }
  if (classes == nullptr) classes = pattern->GetFailureClasses();
  if (classes == nullptr) {
    TheReporter().ReportInternalFault(kPlaceCheckNoClasses);
    return false;
  }
  if (IsRefusedByPlatformRule(pin, *requirement)) return true;

  classes->FindByStates(*requirement, candidates_, found_);
  // A pin counts as ready only when it really holds the class.
  if (!found_.empty() && pin->SetFailureClass(found_))
    pin->SetCanBeActivated(true);
  else
    NoteWhyNoClass(*pin, *classes, possible, *requirement);
  return true;
}

// Asked only for a pin that got no class, and without building any text, so
// that a full check of a large pattern pays next to nothing for it.
void QFCAbstractFailurePatternSafetyInterlock::NoteWhyNoClass(
    QFCAbstractFailurePatternPin& pin, const QFCAbstractFailureClasses& classes, std::size_t possible,
    const std::vector<std::uint32_t>& requirement) const {
  using Refusal = QFCAbstractFailurePatternPin::Refusal;
  const int defined = pin.GetDefinedFailureClassCount();
  bool known = false;
  for (int i = 0; i < defined && !known; ++i) {
    std::int32_t id = 0;
    known = pin.GetDefinedFailureClassId(i, id) == FAULTBOX_OK && classes.FindById(id) != nullptr;
  }
  if (defined == 0) return pin.SetRefusal(Refusal::kNoneDefined);
  if (!known) return pin.SetRefusal(Refusal::kNoneInFile);
  if (possible == 0) return pin.SetRefusal(Refusal::kEntriesForbidden);
  if (candidates_.empty()) return pin.SetRefusal(Refusal::kBoard);
  // A class that would fit but is used up is the reason the user can act on.
  for (const QFTFoundFailureClass& candidate : candidates_) {
    const QFCAbstractFailureClass* failureClass = classes.FindById(candidate.failureClassId);
    if (failureClass != nullptr && !failureClass->CanUse() &&
        failureClass->MatchesStates(candidate.relayVectorIndex, requirement))
      return pin.SetRefusal(Refusal::kUsedUp, candidate.failureClassId);
  }
  pin.SetRefusal(Refusal::kNothingFits);
}

}  // namespace faultbox
