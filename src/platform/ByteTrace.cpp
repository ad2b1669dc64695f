// The serial byte trace: where it goes and how a line looks.
#include "platform/ByteTrace.h"

#include <sys/time.h>

#include <cstdlib>
#include <map>

#include "platform/SerialPort.h"
#include "platform/Settings.h"

namespace faultbox {

namespace {

std::mutex& RegistryMutex() {
  static std::mutex mutex;
  return mutex;
}

std::map<std::string, std::weak_ptr<ByteTrace>>& Registry() {
  static std::map<std::string, std::weak_ptr<ByteTrace>> traces;
  return traces;
}

}  // namespace

std::shared_ptr<ByteTrace> ByteTrace::FromSettings() {
  std::string path;
  if (const char* variable = std::getenv(kEnvironmentVariable))
    path = variable;
  else if (auto setting = Settings::GetString(SerialPort::kPortSection, kSettingKey))
    path = *setting;
  if (path.empty()) return nullptr;
  return Open(path);
}

std::shared_ptr<ByteTrace> ByteTrace::Open(const std::string& path) {
  std::lock_guard lock(RegistryMutex());
  auto& entry = Registry()[path];
  if (auto trace = entry.lock()) return trace;
  std::shared_ptr<ByteTrace> trace;
  if (path == "-") {
    trace.reset(new ByteTrace(stderr, false));
  } else {
    std::FILE* file = std::fopen(path.c_str(), "ae");
    if (file == nullptr) return nullptr;
    trace.reset(new ByteTrace(file, true));
  }
  entry = trace;
  return trace;
}

ByteTrace::~ByteTrace() {
  if (owned_) std::fclose(file_);
}

void ByteTrace::Sent(std::string_view port, const std::uint8_t* bytes, std::size_t count) {
  Bytes(port, "tx", bytes, count);
}

void ByteTrace::Received(std::string_view port, const std::uint8_t* bytes, std::size_t count) {
  Bytes(port, "rx", bytes, count);
}

void ByteTrace::Note(std::string_view port, std::string_view text) {
  Line(port, std::string("-- ").append(text));
}

void ByteTrace::Bytes(std::string_view port, const char* direction, const std::uint8_t* bytes,
                      std::size_t count) {
  // A line per byte, however the bytes were read: scripts then match one
  // byte per line and never depend on how the reads happened to split.
  static const char kDigits[] = "0123456789ABCDEF";
  for (std::size_t i = 0; i < count; ++i) {
    std::string body = direction;
    body += ' ';
    body += kDigits[bytes[i] >> 4];
    body += kDigits[bytes[i] & 0xF];
    Line(port, body);
  }
}

void ByteTrace::Line(std::string_view port, std::string_view body) {
  // Wall-clock time as seconds and microseconds, so that the trace can be
  // laid beside the logs of the bench's other tools.
  timeval now{};
  ::gettimeofday(&now, nullptr);
  char stamp[40];
  std::snprintf(stamp, sizeof stamp, "(%lld.%06ld) ", static_cast<long long>(now.tv_sec),
                static_cast<long>(now.tv_usec));
  std::string line = stamp;
  line.append(port).append(" ").append(body).append("\n");
  std::lock_guard lock(mutex_);
  std::fwrite(line.data(), 1, line.size(), file_);
  std::fflush(file_);
}

}  // namespace faultbox
