// The channel table: which driver and interface serve a (device type,
// board, channel) of a system's interface settings.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace faultbox {

// A driver and its interface, written "driver:interface": "socketcan:can0",
// "virtual:bench1", "tcp:127.0.0.1:29536/bench1".
struct CanChannelTarget {
  std::string driver;
  std::string interfaceName;
  std::string Text() const { return driver + ":" + interfaceName; }
  bool operator==(const CanChannelTarget&) const = default;
};
// Splits at the first ':'; false when either side is empty or holds blanks.
bool ParseCanChannelTarget(std::string_view text, CanChannelTarget* target);

// The channel a system's interface settings name. -1 in a table key means any.
struct CanChannelKey {
  std::int32_t deviceType = -1;
  std::int32_t board = -1;
  std::int32_t channel = -1;
  bool operator==(const CanChannelKey&) const = default;
};

struct CanChannelEntry {
  CanChannelKey key;
  CanChannelTarget target;
};

// The table that maps channels to drivers: the settings section kSection,
// one line per channel, "type,board,channel=driver:interface", for example
//   1,1,1=socketcan:can0
//   fdtCAN_IF_LINKBOX_USB,1,2=tcp:127.0.0.1:29536/bench1
//   *,*,*=virtual:bench1
// The type is a number or a device type name; '*' matches anything. The most
// specific entry wins (fewest '*'), then the earlier one. A channel no entry
// names falls back to the kernel: board 1, channel n is socketcan can<n-1>.
// Entries of the process override are looked at first and win when one matches.
class CanChannelTable {
 public:
  static constexpr const char* kSection = "Components\\Faultbox.Component\\Hardware\\CAN";

  static bool ParseKey(std::string_view text, CanChannelKey* key);
  // The entries of the settings, in file order; each line that is not an
  // entry adds a text naming it to `problems`.
  static std::vector<CanChannelEntry> Read(std::vector<std::string>* problems = nullptr);
  // Entries consulted before the settings, for this process only (used to put
  // every channel on simulated hardware). An empty list removes them.
  static void SetOverride(std::vector<CanChannelEntry> entries);
  // The override's entries, then those of the settings.
  static std::vector<CanChannelEntry> Entries();
  // The target of a channel: override, settings, then the kernel rule.
  static std::optional<CanChannelTarget> Lookup(std::uint32_t deviceType, std::uint8_t board,
                                                std::uint8_t channel);
};

}  // namespace faultbox
