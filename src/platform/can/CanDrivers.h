// The drivers the CAN access layer always has, and the small helpers they
// share. Operating system headers stay in each driver's own source.
#pragma once

#include <cerrno>
#include <cstdint>
#include <cstring>
#include <memory>
#include <string>

#include "platform/CanAccess.h"

namespace faultbox {

// Linux kernel CAN ("can0", "vcan0").
std::shared_ptr<CanDriver> MakeSocketCanDriver();
// An in-process bus per name ("bench1").
std::shared_ptr<CanDriver> MakeVirtualBusDriver();
// A bus shared through a hub over TCP ("127.0.0.1:29536/bench1").
std::shared_ptr<CanDriver> MakeTcpBusDriver();

// The port the hub listens on unless told otherwise.
constexpr std::uint16_t kCanHubDefaultPort = 29536;

// Microseconds since the epoch, the time stamps of frame records.
std::uint64_t CanTimeStampNow();

// "call: what errno says", for the error texts of the drivers.
inline std::string CanSystemError(const char* call) {
  return std::string(call) + ": " + std::strerror(errno);
}

}  // namespace faultbox
