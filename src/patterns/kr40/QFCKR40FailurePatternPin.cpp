// The KR40 pattern pin: its module and channel come from its KR40 pin.
#include "patterns/kr40/QFCKR40FailurePatternPin.h"

#include "config/kr40/QFCKR40Pin.h"
#include "platform/QFCReporter.h"

namespace faultbox {

namespace {

constexpr int kPlacePinConfigIndex = 6601;

}  // namespace

bool QFCKR40FailurePatternPin::IsPinConfigAllowed(int index, std::uint32_t value) const {
  if (IsActivated()) return false;
  const std::uint32_t entry = value & 0xFF;
  if (index < 0 || index >= kPinConfigEntries || (entry != kEntryOff && entry != kEntryOn)) {
    TheReporter().ReportInternalFault(kPlacePinConfigIndex);
    return false;
  }
  return true;
}

bool QFCKR40FailurePatternPin::GetModuleAddress(std::uint32_t& number) const {
  const auto* pin = dynamic_cast<const QFCKR40Pin*>(GetPin());
  if (pin == nullptr) return false;
  std::uint32_t id = 0;
  if (pin->GetFiuModuleId(id) != QFCAbstractPin::kPresent) return false;
  number = id;
  return true;
}

bool QFCKR40FailurePatternPin::GetModuleChannels(std::vector<std::uint32_t>& channels) const {
  channels.clear();
  const auto* pin = dynamic_cast<const QFCKR40Pin*>(GetPin());
  std::uint32_t channel = 0;
  if (pin == nullptr || pin->GetFiuModuleChannel(channel) != QFCAbstractPin::kPresent) return false;
  channels.push_back(channel);
  return true;
}

}  // namespace faultbox
