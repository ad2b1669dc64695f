// The records the CAN access layer takes and gives: results, frames and the
// bit rate answer, laid out as the channel operations exchange them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <type_traits>

namespace faultbox {

enum class CanResult : std::int32_t {
  kOk = 0,
  kInvalidHandle = 1,     // unknown library instance or channel handle
  kInvalidParameter = 2,  // null pointer or a value out of range
  kNoChannel = 3,         // no such channel, driver or interface (also: kernel without CAN)
  kNotActive = 4,         // transmit on a channel that is not on the bus
  kNoInitAccess = 5,      // bus timing set by a handle without init access
  kNotSupported = 6,      // the driver cannot do this (remote frames over TCP, ...)
  kBusError = 7,          // the frame could not be handed to the bus, or the bus is lost
};

// A short fixed text per result ("no channel").
const char* CanResultText(CanResult result);

// ---------------------------------------------------------------- records

// The frame record of TransmitMessage and ReadReceiveQueue (32 bytes).
enum CanFrameType : std::uint32_t {
  kCanFrameUnclassified = 0,
  kCanFrameData = 1,
  kCanFrameRemote = 2,
  kCanFrameError = 3,
  kCanFrameBusStatus = 4,
};
constexpr std::uint16_t kCanFlagExtended = 2;  // `flags` of a frame with a 29-bit identifier
constexpr std::uint32_t kCanMaxExtendedId = 0x1FFFFFFF;
constexpr std::uint32_t kCanMaxStandardId = 0x7FF;

struct CanFrameRecord {
  // Microseconds since the epoch when the layer took the frame off the bus or
  // handed it to the bus; what the caller puts here is not used.
  std::uint64_t timeStamp = 0;
  std::uint32_t frameType = kCanFrameUnclassified;
  std::uint16_t flags = 0;  // kCanFlagExtended, or 0 for an 11-bit identifier
  std::uint16_t reserved0 = 0;
  std::uint32_t identifier = 0;
  std::uint8_t length = 0;  // data length 0..8
  std::uint8_t data[8] = {};
  std::uint8_t options = 0;  // transmit options of the caller; not interpreted
  std::uint8_t reserved1[2] = {};

  bool IsExtended() const { return (flags & kCanFlagExtended) != 0; }
};
static_assert(std::is_trivially_copyable_v<CanFrameRecord> && sizeof(CanFrameRecord) == 32);
static_assert(offsetof(CanFrameRecord, frameType) == 8 && offsetof(CanFrameRecord, flags) == 12 &&
              offsetof(CanFrameRecord, identifier) == 16 && offsetof(CanFrameRecord, length) == 20 &&
              offsetof(CanFrameRecord, data) == 21 && offsetof(CanFrameRecord, options) == 29);

// The 12-byte answer of GetCurrentBaudrate.
struct CanBaudrateInfo {
  std::uint32_t bitRate = 0;  // bit/s; 0 when the interface has none configured
  std::uint8_t busTiming0 = 0;
  std::uint8_t busTiming1 = 0;
  std::uint8_t reserved[6] = {};
};
static_assert(sizeof(CanBaudrateInfo) == 12 && offsetof(CanBaudrateInfo, busTiming0) == 4 &&
              offsetof(CanBaudrateInfo, busTiming1) == 5);

// The bit rate two SJA1000-style bus timing registers give with the 16 MHz
// controller clock the KR60 benches were built for: 0x47, 0x14 give 125000.
std::uint32_t CanBitRateFromBusTiming(std::uint8_t busTiming0, std::uint8_t busTiming1);

}  // namespace faultbox
