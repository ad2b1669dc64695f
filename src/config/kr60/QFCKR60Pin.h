// A pin of the KR60 platform: a load module addressed cabinet_rack_slot, the
// load channels it uses and how many it needs, failure class entries that may
// carry a parameter list.
#pragma once

#include "config/QFCAbstractPin.h"

namespace faultbox {

class QFCKR60Pin : public QFCAbstractPin {
 public:
  static constexpr std::uint32_t kMaxChannel = 9;
  static constexpr std::uint32_t kMaxChannelsRequired = 9;

  QFCKR60Pin(std::int32_t platform, QFCAbstractObjectData* system) : QFCAbstractPin(platform, system) {}

  // cabinet × 256 + rack × 16 + slot of "load_module_id", 0 when unreadable.
  std::uint32_t GetModuleAddress() const override;
  [[nodiscard]] HRESULT Validate() override;
  [[nodiscard]] HRESULT CheckFailureClassEntry(const std::string& entry) const override;
  std::vector<std::uint32_t> GetModuleChannels() const override;
  std::vector<std::string> GetPlatformColumns() const override {
    return {"load_module_id", "load_module_channel"};
  }

  // kPresent, kNotUsed, or kMissing (column missing with message 39, or not
  // readable: a bad module id reports through the address check, a bad
  // channel with message 37 and leaves the channels read before it in `list`).
  int GetLoadChannelsRequired(std::uint32_t& count) const;
  int GetLoadModuleId(std::uint32_t& cabinet, std::uint32_t& rack, std::uint32_t& slot) const;
  // The distinct channels in ascending order.
  int GetLoadModuleChannels(std::vector<std::uint32_t>& list) const;

  // Splits an entry "ID" or "ID(p1,p2,...)" into its numbers; false when it
  // has another form. An empty entry is ID 0.
  static bool ParseFailureClassEntry(std::string_view entry, std::uint32_t& id,
                                     std::vector<std::uint32_t>& parameters);
};

}  // namespace faultbox
