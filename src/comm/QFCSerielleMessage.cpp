// The relay settings of one module of the KR40 family.
#include "comm/QFCSerielleMessage.h"

#include <algorithm>
#include <cstdio>

namespace faultbox {

std::string ModuleAddressText(std::uint32_t address) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%X", address);
  return text;
}

bool QFCSerielleMessageData::SetRelayState(std::uint16_t relay, std::uint16_t state) {
  if (relay < kFirstRelay || relay > kLastRelay) return false;
  auto it =
      std::find_if(relays_.begin(), relays_.end(), [&](const RelayState& r) { return r.first == relay; });
  if (it != relays_.end())
    it->second = state;
  else
    relays_.emplace_back(relay, state);
  return true;
}

std::vector<QFCSerielleMessageData::RelayState> QFCSerielleMessageData::GetRelayStates() const {
  return {relays_.rbegin(), relays_.rend()};
}

}  // namespace faultbox
