// The KR60 pattern pin: module and channels of its KR60 pin, and the relay
// states its failure class asks for.
#include "patterns/kr60/QFCKR60FailurePatternPin.h"

#include "config/QFCAbstractFailureClass.h"
#include "config/QFCFSHelper.h"
#include "config/kr60/QFCKR60Pin.h"
#include "platform/QFCReporter.h"

namespace faultbox {

namespace {

constexpr int kPlacePinConfigArguments = 6751;
constexpr int kPlaceRelayPosition = 6752;

}  // namespace

bool QFCKR60FailurePatternPin::IsPinConfigAllowed(int index, std::uint32_t value) const {
  // The relays of an activated pin are switched: its settings stay.
  if (IsActivated()) return false;
  const bool validIndex = index >= 0 && index < kPinConfigEntries;
  const std::uint32_t entry = value & 0xFF;
  if (validIndex && (entry == kEntryOff || entry == kEntryOn)) return true;
  TheReporter().ReportInternalFault(kPlacePinConfigArguments);
  return false;
}

bool QFCKR60FailurePatternPin::GetModuleAddress(std::uint32_t& number) const {
  const auto* pin = dynamic_cast<const QFCKR60Pin*>(GetPin());
  std::uint32_t cabinet = 0, rack = 0, slot = 0;
  if (pin == nullptr || pin->GetLoadModuleId(cabinet, rack, slot) != QFCAbstractPin::kPresent) return false;
  number = QFCFSHelper::ModuleAddress(cabinet, rack, slot);
  return true;
}

bool QFCKR60FailurePatternPin::GetModuleChannels(std::vector<std::uint32_t>& channels) const {
  channels.clear();
  const auto* pin = dynamic_cast<const QFCKR60Pin*>(GetPin());
  if (pin == nullptr) return false;
  channels = pin->GetModuleChannels();
  return true;
}

bool QFCKR60FailurePatternPin::GetRelayState(int position, std::uint32_t& value) {
  if (position < 0) {
    TheReporter().ReportInternalFault(kPlaceRelayPosition);
    return false;
  }
  if (position < kPinConfigEntries) {
    value = GetPinConfig()[static_cast<std::size_t>(position)];
    return true;
  }
  std::int32_t id = -1;
  std::int32_t index = -1;
  const QFCAbstractFailureClass* failureClass = GetAdjustedFailureClass(id, index);
  const QFTPossibility* vector = failureClass ? failureClass->GetPossibility(index) : nullptr;
  if (vector == nullptr) return false;
  value = vector->RelayState(static_cast<std::size_t>(position)) == kRelayOn ? 1 : 0;
  return true;
}

}  // namespace faultbox
