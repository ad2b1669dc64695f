// A serial port as the KR40 family's hardware needs it: 9600 bit/s, 8 data
// bits, no parity, one stop bit, raw bytes without any flow control, held
// exclusively, DTR and RTS raised. Ports keep their "COMn" names; the
// settings map each name to a device path.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace faultbox {

class ByteTrace;

class SerialPort {
 public:
  enum class Status {
    kOk,
    kNotOpen,         // the port is closed
    kNoDevice,        // the name maps to no device path
    kOpenFailed,      // the device is missing or may not be opened (see GetLastError)
    kBusy,            // another program holds the port
    kNotATerminal,    // the path names something that is not a serial device
    kSettingsFailed,  // the line settings could not be applied
    kSetupFailed,     // purging or raising the modem lines failed
    kIoError,         // a read, write or query failed, e.g. the device vanished
    kTimedOut,        // a write did not get out in time
  };

  // COMn=/dev/... entries (and the trace setting, see ByteTrace).
  static constexpr const char* kPortSection = "Components\\Faultbox.Component\\Hardware\\SerialPorts";
  // A byte needs about 1 ms at 9600 bit/s; a write still under way after this
  // long will not end (a port that vanished or is stopped).
  static constexpr std::chrono::milliseconds kWriteLimit{2000};

  SerialPort() = default;
  ~SerialPort();
  SerialPort(const SerialPort&) = delete;
  SerialPort& operator=(const SerialPort&) = delete;

  // n of "COMn" (any case, n decimal); nothing for other names.
  static std::optional<int> PortNumber(std::string_view portName);
  // The device path of a port: the settings' entry for the name, else
  // /dev/ttyS<n-1> for "COMn" with n >= 1; "" when there is none.
  static std::string DevicePath(const std::string& portName);
  // Whether the port could be opened now; it is closed again at once.
  static bool CanOpen(const std::string& portName);

  // Opens the port exclusively, purges both directions, applies the line
  // settings and raises DTR, then RTS. On failure the port stays closed and
  // the status tells which step failed. A `devicePath` given is opened
  // instead of the one the tables name for the port.
  Status Open(const std::string& portName, const std::string& devicePath = {});
  // Drops the unread input and closes; closing a closed port does nothing.
  void Close();
  bool IsOpen() const { return fd_ >= 0; }

  // Drops what waits to be read (input) and what waits to be sent (output).
  Status Purge(bool input, bool output);
  // The number of bytes the port holds for reading.
  Status BytesAvailable(std::size_t& count);
  // Reads what is there, at most `size` bytes, without waiting; `count` may be 0.
  Status Read(std::uint8_t* buffer, std::size_t size, std::size_t& count);
  // Writes one byte and returns once it has left the port, or after kWriteLimit.
  Status WriteByte(std::uint8_t byte);
  // Waits until bytes can be read or `deadline` has passed; a deadline in
  // the past only looks.
  Status WaitReadable(std::chrono::steady_clock::time_point deadline, bool& readable);

  const std::string& GetPortName() const { return portName_; }
  const std::string& GetDevicePath() const { return devicePath_; }
  // errno of the last failure, 0 when none was seen.
  int GetLastError() const { return lastError_; }
  // The device path and the reason of the last failure, for messages.
  std::string DescribeLastError() const;

 private:
  Status Fail(Status status, int error);
  Status ApplyLineSettings();
  Status RaiseModemLines();
  // Waits until the output queue is empty or the deadline has passed.
  Status Drain(std::chrono::steady_clock::time_point deadline);
  // Opens the device path of the name exclusively, without settings.
  Status OpenDevice(const std::string& portName, const std::string& devicePath);

  int fd_ = -1;
  std::string portName_;
  std::string devicePath_;
  int lastError_ = 0;
  std::shared_ptr<ByteTrace> trace_;
};

// A status as a short text for traces and messages.
const char* SerialPortStatusText(SerialPort::Status status);

}  // namespace faultbox
