// The KR60 interlock: one requirement from the pattern's external hardware
// for all pins, pins chosen explicitly first, and the exclusive-entry rule.
#include "patterns/kr60/QFCKR60FailurePatternSafetyInterlock.h"
#include "platform/MessageTable.h"

#include <algorithm>
#include <array>

#include "platform/QFCReporter.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"
#include "patterns/kr60/QFCKR60FailurePatternPin.h"

namespace faultbox {

namespace {

constexpr int kResRefused = 6766;

constexpr int kPlaceCheckAllNoPattern = 6801;
constexpr int kPlaceCheckAllNoClasses = 6802;
constexpr int kPlaceCheckAllExternal = 6803;

// The PinConfig entries that lead onto the lines the external hardware is
// switched to, with the name the pattern asks about each under.
struct SharedEntry {
  std::size_t index;
  int kind;
};
constexpr std::array<SharedEntry, 3> kSharedEntries = {{{0, QFCKR60FailurePattern::kEntryZero},
                                                        {1, QFCKR60FailurePattern::kEntryOne},
                                                        {3, QFCKR60FailurePattern::kEntryThree}}};

constexpr std::size_t kFirstExternalPosition = 5;

}  // namespace

QFCKR60FailurePatternSafetyInterlock::QFCKR60FailurePatternSafetyInterlock(QFCKR60FailurePattern* pattern)
    : pattern_(pattern), messageText_(ResourceText(kResRefused)) {}

QFCAbstractFailurePattern* QFCKR60FailurePatternSafetyInterlock::GetPattern() const {
  return pattern_;
}

bool QFCKR60FailurePatternSafetyInterlock::IsPlatformPin(const QFCAbstractFailurePatternPin* pin) const {
  return dynamic_cast<const QFCKR60FailurePatternPin*>(pin) != nullptr;
}

bool QFCKR60FailurePatternSafetyInterlock::FillExternalRequirement(std::vector<std::uint32_t>& requirement) {
  return pattern_ != nullptr && pattern_->BuildExternalRequirement(requirement);
}

bool QFCKR60FailurePatternSafetyInterlock::IsRefusedByPlatformRule(
    QFCAbstractFailurePatternPin* pin, const std::vector<std::uint32_t>& requirement) {
  if (pin->IsExplicitChoice() || QFCAbstractFailurePattern::IsServiceMode() || pattern_ == nullptr)
    return false;
  const auto& config = pin->GetPinConfig();
  const bool sharedEntryOn = std::any_of(
      kSharedEntries.begin(), kSharedEntries.end(),
      [&](const SharedEntry& e) { return config[e.index] == QFCAbstractFailurePatternPin::kEntryOn; });
  if (!sharedEntryOn) return false;
  // Without external hardware in use the entries lead nowhere shared.
  if (requirement.size() <= kFirstExternalPosition ||
      std::none_of(requirement.begin() + kFirstExternalPosition, requirement.end(),
                   [](std::uint32_t value) { return value == 1; }))
    return false;
  for (const SharedEntry& e : kSharedEntries) {
    if (config[e.index] != QFCAbstractFailurePatternPin::kEntryOn) continue;
    if (pattern_->IsEntryUsedByOtherPin(pin, e.kind)) {
      pin->SetFailureClassText(messageText_);
      pin->SetRefusal(QFCAbstractFailurePatternPin::Refusal::kSharedEntry);
      return true;
    }
  }
  return false;
}

bool QFCKR60FailurePatternSafetyInterlock::CheckPin(QFCAbstractFailurePatternPin* pin) {
  if (QFCAbstractFailurePattern::IsServiceMode()) return CheckPinWith(pin, nullptr, nullptr);
  return CheckAll();
}

bool QFCKR60FailurePatternSafetyInterlock::CheckAll() {
  bool result = false;
  const QFCAbstractFailureClasses* classes =
      BeginFullCheck(kPlaceCheckAllNoPattern, kPlaceCheckAllNoClasses, result);
  if (classes == nullptr) return result;
  requirement_.assign(kRequirementPositions, 0);
  if (!pattern_->BuildExternalRequirement(requirement_)) {
    TheReporter().ReportInternalFault(kPlaceCheckAllExternal);
    return false;
  }
  // A pin whose class is being chosen explicitly takes it before any other
  // pin is judged against it.
  return CheckEveryPin(classes, &requirement_, true);
}

}  // namespace faultbox
