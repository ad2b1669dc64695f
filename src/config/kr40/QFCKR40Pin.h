// A pin of the KR40 family: a relay module number (hexadecimal, 0-127) and a
// channel (1-10), failure class entries that are plain IDs.
#pragma once

#include "config/QFCAbstractPin.h"

namespace faultbox {

class QFCKR40Pin : public QFCAbstractPin {
 public:
  static constexpr std::uint32_t kMaxModuleId = 127;
  static constexpr std::uint32_t kMinChannel = 1;
  static constexpr std::uint32_t kMaxChannel = 10;

  QFCKR40Pin(std::int32_t platform, QFCAbstractObjectData* system) : QFCAbstractPin(platform, system) {}

  std::uint32_t GetModuleAddress() const override;
  [[nodiscard]] HRESULT Validate() override;
  [[nodiscard]] HRESULT CheckFailureClassEntry(const std::string& entry) const override;
  std::vector<std::uint32_t> GetModuleChannels() const override;
  std::vector<std::string> GetPlatformColumns() const override {
    return {"fiu_module_id", "fiu_module_channel"};
  }

  // kPresent with the number, kNotUsed, or kMissing when the column is
  // missing (message 39) or the text is not a number.
  int GetFiuModuleId(std::uint32_t& id) const;
  int GetFiuModuleChannel(std::uint32_t& channel) const;
};

}  // namespace faultbox
