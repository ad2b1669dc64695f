// The interface settings of a system as the CAN access layer and the serial
// port layer take them: device types, the serial port record and the CAN
// channel description record.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <type_traits>

namespace faultbox {

// The bus timing registers of 125000 bit/s, the rate of every KR60 bench.
constexpr std::uint32_t kDefaultCanBusTiming0 = 0x47;
constexpr std::uint32_t kDefaultCanBusTiming1 = 0x14;

// Device types of the interface settings (the automation enumeration FSDeviceType).
enum FSDeviceType : std::int32_t {
  fdtCAN_IF_VI_CAN_CARD_X = 1,
  fdtCAN_IF_LINKBOX_USB = 4,
  fdtRS232_IF_PORT = 200,
};

// The serial port of a KR40-family system.
struct QFTSerialInterfaceSettings {
  std::string portName = "COM1";
  std::uint32_t deviceType = fdtRS232_IF_PORT;
  std::uint32_t portNumber = 1;
};

// The CAN channel of a KR60 system, laid out as one channel description of the
// CAN access layer, so that the record is handed to it and taken from it
// unchanged. Only the device type, the two interface parameters and the three
// further values are ours; the rest belongs to the access layer.
struct QFTCANInterfaceSettings {
  std::uint8_t head[256] = {};  // the channel's name as the access layer fills it
  std::uint32_t deviceType = fdtCAN_IF_VI_CAN_CARD_X;
  std::uint8_t firstParameter = 1;   // board of the device
  std::uint8_t secondParameter = 1;  // channel of the board
  std::uint8_t reserved[2] = {};
  std::uint32_t furtherValues[3] = {};  // copied from the matching available channel
  std::uint8_t rest[256] = {};
};
static_assert(std::is_standard_layout_v<QFTCANInterfaceSettings> &&
              std::is_trivially_copyable_v<QFTCANInterfaceSettings>);
static_assert(sizeof(QFTCANInterfaceSettings) == 532);
static_assert(offsetof(QFTCANInterfaceSettings, deviceType) == 256);
static_assert(offsetof(QFTCANInterfaceSettings, firstParameter) == 260);
static_assert(offsetof(QFTCANInterfaceSettings, secondParameter) == 261);
static_assert(offsetof(QFTCANInterfaceSettings, furtherValues) == 264);
static_assert(offsetof(QFTCANInterfaceSettings, rest) == 276);

}  // namespace faultbox
