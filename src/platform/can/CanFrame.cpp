// Texts of the results and the bit rate of two bus timing registers.
#include "platform/can/CanFrame.h"

namespace faultbox {

const char* CanResultText(CanResult result) {
  switch (result) {
    case CanResult::kOk:
      return "success";
    case CanResult::kInvalidHandle:
      return "unknown handle";
    case CanResult::kInvalidParameter:
      return "invalid parameter";
    case CanResult::kNoChannel:
      return "no channel";
    case CanResult::kNotActive:
      return "channel not active";
    case CanResult::kNoInitAccess:
      return "no init access";
    case CanResult::kNotSupported:
      return "not supported";
    case CanResult::kBusError:
      return "bus error";
  }
  return "unknown result";
}

std::uint32_t CanBitRateFromBusTiming(std::uint8_t busTiming0, std::uint8_t busTiming1) {
  constexpr std::uint32_t kClock = 16000000;
  const std::uint32_t prescaler = (busTiming0 & 0x3Fu) + 1;
  const std::uint32_t segment1 = (busTiming1 & 0x0Fu) + 1;
  const std::uint32_t segment2 = ((busTiming1 >> 4) & 0x07u) + 1;
  return kClock / (2 * prescaler * (1 + segment1 + segment2));
}

}  // namespace faultbox
