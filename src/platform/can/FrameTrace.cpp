// The frame trace in candump's log form, so that can-utils (canplayer,
// log2asc) and bench engineers' scripts read it as they read a candump log.
#include <atomic>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>
#include <mutex>
#include <string>
#include <vector>

#include "platform/can/FrameTrace.h"

#include "platform/CanAccess.h"
#include "platform/Settings.h"
#include "platform/Text.h"

namespace faultbox {

namespace {

constexpr std::uint32_t kCandumpErrorFlag = 0x20000000;

struct Trace {
  std::mutex mutex;
  std::string destination;  // "" off, "-" standard error, else a file path
  std::FILE* file = nullptr;
  std::atomic<bool> on{false};
  int sending = 0;                // transmissions under way
  std::vector<std::string> held;  // lines taken in meanwhile
};

Trace& TheTrace() {
  static Trace* t = new Trace;
  return *t;
}

std::string WantedDestination() {
  std::string value;
  if (const char* env = std::getenv(CanFrameTrace::kEnvironment))
    value = env;
  else if (auto setting = Settings::GetString(Settings::kHardwareSection, CanFrameTrace::kSetting))
    value = *setting;
  value = Trim(value);
  return value == "0" ? std::string() : value;
}

}  // namespace

std::string CanFrameTrace::FormatLine(const CanFrameRecord& frame, std::string_view interfaceName) {
  char buf[64];
  std::snprintf(buf, sizeof buf, "(%" PRIu64 ".%06" PRIu64 ") ", frame.timeStamp / 1000000u,
                frame.timeStamp % 1000000u);
  std::string line = buf;
  for (char c : interfaceName) line += IsBlank(c) ? '_' : c;
  line += ' ';
  const bool error = frame.frameType == kCanFrameError || frame.frameType == kCanFrameBusStatus;
  if (error)
    std::snprintf(buf, sizeof buf, "%08" PRIX32 "#",
                  (frame.identifier & kCanMaxExtendedId) | kCandumpErrorFlag);
  else
    std::snprintf(buf, sizeof buf, frame.IsExtended() ? "%08" PRIX32 "#" : "%03" PRIX32 "#",
                  frame.identifier);
  line += buf;
  if (frame.frameType == kCanFrameRemote) return line + "R";
  const std::uint8_t n = frame.length > 8 ? 8 : frame.length;
  for (std::uint8_t i = 0; i < n; ++i) {
    std::snprintf(buf, sizeof buf, "%02X", frame.data[i]);
    line += buf;
  }
  return line;
}

void CanFrameTrace::Configure() {
  const std::string wanted = WantedDestination();
  Trace& t = TheTrace();
  std::lock_guard lock(t.mutex);
  if (wanted == t.destination && (wanted.empty() || t.file)) return;
  if (t.file && t.file != stderr) std::fclose(t.file);
  t.file = nullptr;
  t.destination = wanted;
  if (wanted == "-") {
    t.file = stderr;
  } else if (!wanted.empty()) {
    // Appended, so that the frames of several runs or processes stay in one log.
    t.file = std::fopen(wanted.c_str(), "ae");
    if (t.file) std::setvbuf(t.file, nullptr, _IOLBF, 0);
  }
  t.on = t.file != nullptr;
}

bool CanFrameTrace::IsOn() {
  return TheTrace().on;
}

void CanFrameTrace::Write(const CanFrameRecord& frame, std::string_view interfaceName) {
  Trace& t = TheTrace();
  if (!t.on) return;
  std::string line = FormatLine(frame, interfaceName) + "\n";
  std::lock_guard lock(t.mutex);
  if (t.sending > 0)
    t.held.push_back(std::move(line));
  else if (t.file)
    std::fputs(line.c_str(), t.file);
}

void CanFrameTrace::BeginSend() {
  Trace& t = TheTrace();
  std::lock_guard lock(t.mutex);
  ++t.sending;
}

void CanFrameTrace::EndSend(const CanFrameRecord& frame, std::string_view interfaceName, bool sent) {
  Trace& t = TheTrace();
  const std::string line = sent && t.on ? FormatLine(frame, interfaceName) + "\n" : std::string();
  std::lock_guard lock(t.mutex);
  if (t.file && !line.empty()) std::fputs(line.c_str(), t.file);
  if (t.sending > 0 && --t.sending > 0) return;
  for (const std::string& held : t.held)
    if (t.file) std::fputs(held.c_str(), t.file);
  t.held.clear();
}

}  // namespace faultbox
