// The channel table: which driver and interface serve a (device type,
// board, channel) of a system's interface settings.
#include <mutex>

#include "platform/can/ChannelTable.h"

#include "platform/CanAccess.h"
#include "platform/InterfaceSettings.h"
#include "platform/Settings.h"
#include "platform/Text.h"

namespace faultbox {

namespace {

struct Override {
  std::mutex mutex;
  std::vector<CanChannelEntry> entries;
};

Override& TheOverride() {
  static Override* o = new Override;
  return *o;
}

// "*" gives -1; otherwise a decimal number up to `max`.
bool ParsePart(std::string_view text, std::int64_t max, std::int32_t* out) {
  if (text == "*") {
    *out = -1;
    return true;
  }
  if (text.empty() || text.size() > 10 || text.find_first_not_of("0123456789") != std::string_view::npos)
    return false;
  std::int64_t v = 0;
  for (char c : text) v = v * 10 + (c - '0');
  if (v > max) return false;
  *out = static_cast<std::int32_t>(v);
  return true;
}

bool Matches(const CanChannelKey& k, std::uint32_t deviceType, std::uint8_t board, std::uint8_t channel) {
  return (k.deviceType < 0 || static_cast<std::uint32_t>(k.deviceType) == deviceType) &&
         (k.board < 0 || k.board == board) && (k.channel < 0 || k.channel == channel);
}

int Wildcards(const CanChannelKey& k) {
  return (k.deviceType < 0) + (k.board < 0) + (k.channel < 0);
}

}  // namespace

bool ParseCanChannelTarget(std::string_view text, CanChannelTarget* target) {
  text = TrimView(text);
  const std::size_t colon = text.find(':');
  if (colon == std::string_view::npos) return false;
  const std::string_view driver = text.substr(0, colon);
  const std::string_view iface = text.substr(colon + 1);
  if (driver.empty() || iface.empty()) return false;
  for (char c : text)
    if (IsBlank(c)) return false;
  target->driver = ToLower(driver);
  target->interfaceName = std::string(iface);
  return true;
}

bool CanChannelTable::ParseKey(std::string_view text, CanChannelKey* key) {
  std::string_view parts[3];
  for (int i = 0; i < 3; ++i) {
    const std::size_t comma = text.find(',');
    if ((comma == std::string_view::npos) != (i == 2)) return false;
    parts[i] = TrimView(text.substr(0, comma));
    if (comma != std::string_view::npos) text.remove_prefix(comma + 1);
  }
  CanChannelKey k;
  if (EqualsNoCase(parts[0], "fdtCAN_IF_VI_CAN_CARD_X"))
    k.deviceType = fdtCAN_IF_VI_CAN_CARD_X;
  else if (EqualsNoCase(parts[0], "fdtCAN_IF_LINKBOX_USB"))
    k.deviceType = fdtCAN_IF_LINKBOX_USB;
  else if (!ParsePart(parts[0], INT32_MAX, &k.deviceType))
    return false;
  if (!ParsePart(parts[1], 255, &k.board) || !ParsePart(parts[2], 255, &k.channel)) return false;
  *key = k;
  return true;
}

std::vector<CanChannelEntry> CanChannelTable::Read(std::vector<std::string>* problems) {
  std::vector<CanChannelEntry> entries;
  for (const auto& [name, value] : Settings::GetSection(kSection)) {
    CanChannelEntry e;
    if (!ParseKey(name, &e.key)) {
      if (problems) problems->push_back("\"" + name + "\" is not device type,board,channel");
      continue;
    }
    if (!ParseCanChannelTarget(value, &e.target)) {
      if (problems) problems->push_back("\"" + name + "=" + value + "\" does not name driver:interface");
      continue;
    }
    entries.push_back(std::move(e));
  }
  return entries;
}

void CanChannelTable::SetOverride(std::vector<CanChannelEntry> entries) {
  Override& o = TheOverride();
  std::lock_guard lock(o.mutex);
  o.entries = std::move(entries);
}

std::vector<CanChannelEntry> CanChannelTable::Entries() {
  std::vector<CanChannelEntry> all;
  {
    Override& o = TheOverride();
    std::lock_guard lock(o.mutex);
    all = o.entries;
  }
  for (CanChannelEntry& e : Read()) all.push_back(std::move(e));
  return all;
}

std::optional<CanChannelTarget> CanChannelTable::Lookup(std::uint32_t deviceType, std::uint8_t board,
                                                        std::uint8_t channel) {
  auto best = [&](const std::vector<CanChannelEntry>& entries) -> const CanChannelEntry* {
    const CanChannelEntry* found = nullptr;
    for (const CanChannelEntry& e : entries)
      if (Matches(e.key, deviceType, board, channel) && (!found || Wildcards(e.key) < Wildcards(found->key)))
        found = &e;
    return found;
  };
  std::vector<CanChannelEntry> override;
  {
    Override& o = TheOverride();
    std::lock_guard lock(o.mutex);
    override = o.entries;
  }
  // The override wins as a whole, so that it can put every channel elsewhere.
  if (const CanChannelEntry* e = best(override)) return e->target;
  const std::vector<CanChannelEntry> settings = Read();
  if (const CanChannelEntry* e = best(settings)) return e->target;
  // Without an entry the kernel's interfaces serve board 1 in their order, so
  // a bench with one adapter works with the default settings (1, 1, 1).
  if (board == 1 && channel >= 1) return CanChannelTarget{"socketcan", "can" + std::to_string(channel - 1)};
  return std::nullopt;
}

}  // namespace faultbox
