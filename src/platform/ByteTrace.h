// A trace of every byte that goes over a serial port, with time stamps, for
// users who need to see what the hardware was told and what it answered.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>

namespace faultbox {

class ByteTrace {
 public:
  // Names the trace file and overrides the setting; "-" traces to stderr,
  // an empty value turns the trace off.
  static constexpr const char* kEnvironmentVariable = "FAULTBOX_SERIAL_TRACE";
  // The setting in the serial port section (SerialPort::kPortSection).
  static constexpr const char* kSettingKey = "Trace";

  // The trace the environment or the settings ask for, or nullptr when
  // tracing is off or the file cannot be opened. Ports that trace into the
  // same file share one trace, so that their lines never interleave.
  static std::shared_ptr<ByteTrace> FromSettings();
  // Appends to `path` ("-": stderr); nullptr when it cannot be opened.
  static std::shared_ptr<ByteTrace> Open(const std::string& path);

  ~ByteTrace();
  ByteTrace(const ByteTrace&) = delete;
  ByteTrace& operator=(const ByteTrace&) = delete;

  // One line per byte: "(secs.usecs) PORT tx 40", "(...) PORT rx C5"; and
  // "(...) PORT -- text" for a note.
  void Sent(std::string_view port, const std::uint8_t* bytes, std::size_t count);
  void Received(std::string_view port, const std::uint8_t* bytes, std::size_t count);
  void Note(std::string_view port, std::string_view text);

 private:
  explicit ByteTrace(std::FILE* file, bool owned) : file_(file), owned_(owned) {}
  void Bytes(std::string_view port, const char* direction, const std::uint8_t* bytes, std::size_t count);
  void Line(std::string_view port, std::string_view body);

  std::mutex mutex_;
  std::FILE* file_;
  bool owned_;
};

}  // namespace faultbox
