// A pattern pin of the KR60 platform: it stands for a KR60 pin, whose load
// module address and load channels the message builder needs, and gives the
// builder the relay states its failure class asks for.
#pragma once

#include "patterns/QFCAbstractFailurePatternPin.h"

namespace faultbox {

class QFCKR60FailurePatternPin : public QFCAbstractFailurePatternPin {
 public:
  explicit QFCKR60FailurePatternPin(QFCAbstractFailurePattern* pattern)
      : QFCAbstractFailurePatternPin(pattern) {}

  // Only entries 0 to 4 with 0 or 1, and never on an activated pin.
  bool IsPinConfigAllowed(int index, std::uint32_t value) const override;
  // cabinet × 256 + rack × 16 + slot of the pin's load module.
  bool GetModuleAddress(std::uint32_t& number) const override;
  // The load channels, ascending; the list is emptied first.
  bool GetModuleChannels(std::vector<std::uint32_t>& channels) const override;

  // Position 0 to 4: PinConfig entry `position` as it is (0, 1 or 2).
  // Position 5 and up: 1 when the adjusted relay vector needs the position
  // on, else 0. Without an adjusted class `value` is left as it is and the
  // result is false; a negative position is an internal fault.
  bool GetRelayState(int position, std::uint32_t& value);
};

}  // namespace faultbox
