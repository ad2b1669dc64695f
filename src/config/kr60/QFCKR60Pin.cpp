// Checks, load module addresses and load channels of KR60 pins.
#include "config/kr60/QFCKR60Pin.h"

#include <bit>

#include "config/QFCFSHelper.h"
#include "platform/QFCReporter.h"

namespace faultbox {
namespace {

constexpr const char* kChannelsRequired = "load_channels_required";
constexpr const char* kModuleId = "load_module_id";
constexpr const char* kModuleChannel = "load_module_channel";

// Reads the channel list into a bit set (channels 0 to 9); false at the first
// item that is not a channel, with `channels` holding what was read before it
// and `bad` that item.
bool ReadChannels(std::string_view text, std::uint32_t& channels, std::string& bad) {
  std::size_t pos = 0;
  for (;;) {
    const std::size_t end = text.find(',', pos);
    const std::string_view item = text.substr(pos, end == std::string_view::npos ? end : end - pos);
    std::uint32_t channel = 0;
    // An empty item would otherwise count as channel 0.
    if (QFCFSHelper::Trim(item).empty() || !QFCFSHelper::StringToNumber(item, channel, 10) ||
        channel > QFCKR60Pin::kMaxChannel) {
      bad.assign(item);
      return false;
    }
    channels |= 1u << channel;
    if (end == std::string_view::npos) return true;
    pos = end + 1;
  }
}

std::vector<std::uint32_t> ChannelList(std::uint32_t channels) {
  std::vector<std::uint32_t> out;
  for (std::uint32_t c = 0; c <= QFCKR60Pin::kMaxChannel; ++c) {
    if (channels & (1u << c)) out.push_back(c);
  }
  return out;
}

}  // namespace

bool QFCKR60Pin::ParseFailureClassEntry(std::string_view entry, std::uint32_t& id,
                                        std::vector<std::uint32_t>& parameters) {
  entry = QFCFSHelper::Trim(entry);
  parameters.clear();
  const std::size_t open = entry.find('(');
  const std::size_t close = entry.find(')');
  // An empty entry ("1,,2", or a trailing comma) reads as ID 0, as benches'
  // pin files have long relied on; no failure class has that ID.
  if (open == std::string_view::npos && close == std::string_view::npos)
    return QFCFSHelper::StringToNumber(entry, id, 10);
  // Both brackets, in order, the list closing the entry.
  if (open == std::string_view::npos || close != entry.size() - 1 || close < open) return false;
  const std::string_view idText = entry.substr(0, open);
  if (QFCFSHelper::Trim(idText).empty() || !QFCFSHelper::StringToNumber(idText, id, 10)) return false;
  for (std::string_view item : QFCFSHelper::Split(entry.substr(open + 1, close - open - 1), ',')) {
    std::uint32_t value = 0;
    if (QFCFSHelper::Trim(item).empty() || !QFCFSHelper::StringToNumber(item, value, 10)) return false;
    parameters.push_back(value);
  }
  return true;
}

HRESULT QFCKR60Pin::CheckFailureClassEntry(const std::string& entry) const {
  std::uint32_t id = 0;
  std::vector<std::uint32_t> parameters;
  return ParseFailureClassEntry(entry, id, parameters) ? FAULTBOX_OK : E_FAULTBOX_INVALID_PARAMETER;
}

std::uint32_t QFCKR60Pin::GetModuleAddress() const {
  const auto text = FindValue(kModuleId);
  std::uint32_t cabinet = 0, rack = 0, slot = 0;
  if (!text || !QFCFSHelper::ParseModuleAddress(*text, cabinet, rack, slot, false)) return 0;
  return QFCFSHelper::ModuleAddress(cabinet, rack, slot);
}

std::vector<std::uint32_t> QFCKR60Pin::GetModuleChannels() const {
  const auto text = FindValue(kModuleChannel);
  std::uint32_t channels = 0;
  std::string bad;
  if (text) ReadChannels(*text, channels, bad);
  return ChannelList(channels);
}

int QFCKR60Pin::GetLoadChannelsRequired(std::uint32_t& count) const {
  std::string text;
  const int state = GetValue(kChannelsRequired, text);
  if (state != kPresent) return state;
  return QFCFSHelper::StringToNumber(text, count, 10) ? kPresent : kMissing;
}

int QFCKR60Pin::GetLoadModuleId(std::uint32_t& cabinet, std::uint32_t& rack, std::uint32_t& slot) const {
  std::string text;
  const int state = GetValue(kModuleId, text);
  if (state != kPresent) return state;
  return QFCFSHelper::ParseModuleAddress(text, cabinet, rack, slot) ? kPresent : kMissing;
}

int QFCKR60Pin::GetLoadModuleChannels(std::vector<std::uint32_t>& list) const {
  list.clear();
  std::string text;
  const int state = GetValue(kModuleChannel, text);
  if (state != kPresent) return state;
  std::uint32_t channels = 0;
  std::string bad;
  const bool good = ReadChannels(text, channels, bad);
  list = ChannelList(channels);
  if (good) return kPresent;
  ReportInvalid(kModuleChannel, bad);
  return kMissing;
}

HRESULT QFCKR60Pin::Validate() {
  std::string text;
  const int requiredState = GetValue(kChannelsRequired, text);
  if (requiredState == kNotUsed) return W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION;
  std::uint32_t required = 0;
  if (requiredState == kPresent) {
    // A text that is no number is reported and leaves the count at 0, so the
    // line is dropped as not used and the rest of the file still loads;
    // existing pin files rely on that. A number out of range refuses the line.
    if (!QFCFSHelper::StringToNumber(text, required, 10)) {
      ReportInvalid(kChannelsRequired, text);
      return W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION;
    }
    if (required > kMaxChannelsRequired) {
      ReportInvalid(kChannelsRequired, text);
      return E_FAULTBOX_CONSISTENCY_CHECK;
    }
  }
  if (required == 0) return W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION;

  if (HRESULT hr = QFCAbstractPin::Validate(); hr != FAULTBOX_OK) return hr;

  // Entries that are refused are reported but do not refuse the line: the
  // pin then simply offers no failure class.
  EnsureFailureClasses();

  const int idState = GetValue(kModuleId, text);
  if (idState == kNotUsed) {
    TheReporter().ReportError(41, kModuleId, DetailText(text));
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  if (idState == kMissing) return E_FAULTBOX_CONSISTENCY_CHECK;
  std::uint32_t cabinet = 0, rack = 0, slot = 0;
  if (!QFCFSHelper::ParseModuleAddress(text, cabinet, rack, slot)) {
    ReportInvalid(kModuleId, text);
    TheReporter().ReportInternalFault(563);
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }

  std::string channelText;
  const int channelState = GetValue(kModuleChannel, channelText);
  if (channelState == kNotUsed) {
    TheReporter().ReportError(41, kModuleChannel, DetailText(channelText));
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  std::uint32_t channels = 0;
  bool channelsRead = false;
  if (channelState == kPresent) {
    std::string bad;
    channelsRead = ReadChannels(channelText, channels, bad);
    if (!channelsRead) ReportInvalid(kModuleChannel, bad);
  }
  if (!channelsRead) ReportInvalid(kModuleChannel, channelText);
  // The count is checked on the channels read before a bad item: a line whose
  // readable channels make up the count stays, reported, as existing pin
  // files rely on.
  if (static_cast<std::uint32_t>(std::popcount(channels)) != required) {
    TheReporter().ReportError(42, kModuleId, DetailText(channelText));
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  return FAULTBOX_OK;
}

}  // namespace faultbox
