// The KR40 family's interlock: every pin checked on its own, and the KR80
// board limited to failure classes 1, 2 and 3.
#include "patterns/kr40/QFCKR40FailurePatternSafetyInterlock.h"

#include <algorithm>

#include "platform/QFCReporter.h"
#include "patterns/kr40/QFCKR40FailurePattern.h"
#include "patterns/kr40/QFCKR40FailurePatternPin.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kPlaceCheckAllNoPattern = 6501;
constexpr int kPlaceCheckAllNoClasses = 6502;

}  // namespace

QFCAbstractFailurePattern* QFCKR40FailurePatternSafetyInterlock::GetPattern() const {
  return pattern_;
}

bool QFCKR40FailurePatternSafetyInterlock::IsPlatformPin(const QFCAbstractFailurePatternPin* pin) const {
  return dynamic_cast<const QFCKR40FailurePatternPin*>(pin) != nullptr;
}

bool QFCKR40FailurePatternSafetyInterlock::IsKR80Board() const {
  const QFCSystem* system = pattern_ ? pattern_->GetOwnerSystem() : nullptr;
  if (system == nullptr) return false;
  const std::string& board = system->GetBoardType();
  return board == "KR80" || board == "KR080";
}

void QFCKR40FailurePatternSafetyInterlock::FilterCandidates(
    std::vector<QFTFoundFailureClass>& candidates) const {
  if (!IsKR80Board()) return;
  candidates.erase(std::remove_if(candidates.begin(), candidates.end(),
                                  [](const QFTFoundFailureClass& c) {
                                    return c.failureClassId < 1 || c.failureClassId > 3;
                                  }),
                   candidates.end());
}

bool QFCKR40FailurePatternSafetyInterlock::CheckPin(QFCAbstractFailurePatternPin* pin) {
  return CheckPinWith(pin, nullptr, nullptr);
}

bool QFCKR40FailurePatternSafetyInterlock::CheckAll() {
  bool result = false;
  const QFCAbstractFailureClasses* classes =
      BeginFullCheck(kPlaceCheckAllNoPattern, kPlaceCheckAllNoClasses, result);
  return classes ? CheckEveryPin(classes, nullptr, false) : result;
}

}  // namespace faultbox
