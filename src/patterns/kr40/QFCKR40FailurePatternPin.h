// A pattern pin of the KR40 family: it stands for a KR40 pin, whose relay
// module is its FIU module and whose one channel is its module channel.
#pragma once

#include "patterns/QFCAbstractFailurePatternPin.h"

namespace faultbox {

class QFCKR40FailurePatternPin : public QFCAbstractFailurePatternPin {
 public:
  explicit QFCKR40FailurePatternPin(QFCAbstractFailurePattern* pattern)
      : QFCAbstractFailurePatternPin(pattern) {}

  // Only entries 0 to 4 with 0 or 1, and never on an activated pin.
  bool IsPinConfigAllowed(int index, std::uint32_t value) const override;
  bool GetModuleAddress(std::uint32_t& number) const override;
  bool GetModuleChannels(std::vector<std::uint32_t>& channels) const override;
};

}  // namespace faultbox
