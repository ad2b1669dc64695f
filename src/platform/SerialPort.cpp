// The serial port on termios: exclusive open, line settings, modem lines,
// reads without waiting and writes that end once the byte is out.
#include "platform/SerialPort.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>

#include "platform/ByteTrace.h"
#include "platform/Settings.h"
#include "platform/Text.h"

namespace faultbox {

namespace {

using Clock = std::chrono::steady_clock;

// One byte of 10 bits at 9600 bit/s.
constexpr std::chrono::microseconds kByteTime{1042};

timespec ToTimespec(Clock::duration duration) {
  if (duration < Clock::duration::zero()) duration = Clock::duration::zero();
  const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(duration);
  const auto nanoseconds = std::chrono::duration_cast<std::chrono::nanoseconds>(duration - seconds);
  timespec ts{};
  ts.tv_sec = static_cast<time_t>(seconds.count());
  ts.tv_nsec = static_cast<long>(nanoseconds.count());
  return ts;
}

}  // namespace

const char* SerialPortStatusText(SerialPort::Status status) {
  switch (status) {
    case SerialPort::Status::kOk:
      return "ok";
    case SerialPort::Status::kNotOpen:
      return "the port is not open";
    case SerialPort::Status::kNoDevice:
      return "no device path is set for the port";
    case SerialPort::Status::kOpenFailed:
      return "the device cannot be opened";
    case SerialPort::Status::kBusy:
      return "another program holds the port";
    case SerialPort::Status::kNotATerminal:
      return "the device is not a serial port";
    case SerialPort::Status::kSettingsFailed:
      return "the line settings cannot be applied";
    case SerialPort::Status::kSetupFailed:
      return "the port cannot be purged or its modem lines raised";
    case SerialPort::Status::kIoError:
      return "the port failed while reading or writing";
    case SerialPort::Status::kTimedOut:
      return "the byte did not get out in time";
  }
  return "unknown";
}

SerialPort::~SerialPort() {
  Close();
}

std::optional<int> SerialPort::PortNumber(std::string_view portName) {
  if (portName.size() < 4 || portName.size() > 9 || !EqualsNoCase(portName.substr(0, 3), "COM"))
    return std::nullopt;
  int number = 0;
  for (char c : portName.substr(3)) {
    if (c < '0' || c > '9') return std::nullopt;
    number = number * 10 + (c - '0');
  }
  return number;
}

std::string SerialPort::DevicePath(const std::string& portName) {
  if (portName.empty()) return {};
  if (auto mapped = Settings::GetString(kPortSection, portName); mapped && !mapped->empty())
    // A relative path would depend on the folder the program was started in.
    return mapped->front() == '/' ? *mapped : std::string();
  if (auto number = PortNumber(portName); number && *number >= 1)
    return "/dev/ttyS" + std::to_string(*number - 1);
  return {};
}

SerialPort::Status SerialPort::Fail(Status status, int error) {
  lastError_ = error;
  if (trace_) trace_->Note(portName_, std::string(SerialPortStatusText(status)) + ": " + DescribeLastError());
  return status;
}

std::string SerialPort::DescribeLastError() const {
  std::string text = devicePath_.empty() ? std::string("no device path") : devicePath_;
  if (lastError_ != 0) text.append(": ").append(std::strerror(lastError_));
  return text;
}

SerialPort::Status SerialPort::OpenDevice(const std::string& portName, const std::string& devicePath) {
  Close();
  portName_ = portName;
  devicePath_ = devicePath.empty() ? DevicePath(portName) : devicePath;
  lastError_ = 0;
  if (devicePath_.empty()) return Fail(Status::kNoDevice, 0);
  // Non-blocking: a port without carrier must not hang the open, and reads
  // look at what is there without waiting.
  const int fd = ::open(devicePath_.c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC);
  if (fd < 0) return Fail(errno == EBUSY ? Status::kBusy : Status::kOpenFailed, errno);
  // Bytes for the relays must never end up in an ordinary file.
  if (!::isatty(fd)) {
    ::close(fd);
    return Fail(Status::kNotATerminal, ENOTTY);
  }
  // The lock keeps out every other user of the port, root included, for whom
  // the terminal's own exclusive mode does not hold.
  if (::flock(fd, LOCK_EX | LOCK_NB) != 0) {
    const int error = errno;
    ::close(fd);
    return Fail(error == EWOULDBLOCK ? Status::kBusy : Status::kOpenFailed, error);
  }
  // Also keeps out programs that do not lock (terminal programs).
  ::ioctl(fd, TIOCEXCL);
  fd_ = fd;
  return Status::kOk;
}

bool SerialPort::CanOpen(const std::string& portName) {
  SerialPort port;
  if (port.OpenDevice(portName, {}) != Status::kOk) return false;
  // Nothing of the port's state was touched; nothing to purge.
  ::ioctl(port.fd_, TIOCNXCL);
  ::close(port.fd_);
  port.fd_ = -1;
  return true;
}

SerialPort::Status SerialPort::Open(const std::string& portName, const std::string& devicePath) {
  Close();
  trace_ = ByteTrace::FromSettings();
  if (Status status = OpenDevice(portName, devicePath); status != Status::kOk) {
    trace_.reset();
    return status;
  }
  Status status = Status::kOk;
  if (::tcflush(fd_, TCIOFLUSH) != 0)
    status = Fail(Status::kSetupFailed, errno);
  else if ((status = ApplyLineSettings()) == Status::kOk)
    status = RaiseModemLines();
  if (status != Status::kOk) {
    ::ioctl(fd_, TIOCNXCL);
    ::close(fd_);
    fd_ = -1;
    trace_.reset();
    return status;
  }
  if (trace_) trace_->Note(portName_, "open " + devicePath_);
  return Status::kOk;
}

SerialPort::Status SerialPort::ApplyLineSettings() {
  termios tio{};
  if (::tcgetattr(fd_, &tio) != 0) return Fail(Status::kSettingsFailed, errno);
  ::cfmakeraw(&tio);
  // No software flow control, no parity marking or stripping: every byte
  // value is data. IXANY stays as the port had it.
  tio.c_iflag &= ~static_cast<tcflag_t>(IXON | IXOFF | INPCK | PARMRK | ISTRIP | IGNPAR);
  // No hardware flow control, and the carrier line is ignored, so that a
  // module that drops it never stops the line.
  tio.c_cflag &= ~static_cast<tcflag_t>(CSIZE | PARENB | CSTOPB | CRTSCTS);
  tio.c_cflag |= CS8 | CREAD | CLOCAL;
  tio.c_cc[VMIN] = 0;
  tio.c_cc[VTIME] = 0;
  tio.c_cc[VSTART] = 0x11;
  tio.c_cc[VSTOP] = 0x13;
  if (::cfsetispeed(&tio, B9600) != 0 || ::cfsetospeed(&tio, B9600) != 0)
    return Fail(Status::kSettingsFailed, errno);
  if (::tcsetattr(fd_, TCSANOW, &tio) != 0) return Fail(Status::kSettingsFailed, errno);
  // tcsetattr succeeds when any one change took; check that all did.
  termios now{};
  if (::tcgetattr(fd_, &now) != 0) return Fail(Status::kSettingsFailed, errno);
  const bool applied = ::cfgetospeed(&now) == B9600 && ::cfgetispeed(&now) == B9600 &&
                       (now.c_cflag & CSIZE) == CS8 && (now.c_cflag & (PARENB | CSTOPB | CRTSCTS)) == 0 &&
                       (now.c_iflag & (IXON | IXOFF)) == 0 && (now.c_lflag & (ICANON | ECHO | ISIG)) == 0;
  return applied ? Status::kOk : Fail(Status::kSettingsFailed, EINVAL);
}

SerialPort::Status SerialPort::RaiseModemLines() {
  for (int line : {TIOCM_DTR, TIOCM_RTS}) {
    // A port without modem lines (a pseudo-terminal, some adapters) answers
    // ENOTTY or EINVAL: nothing to raise there.
    if (::ioctl(fd_, TIOCMBIS, &line) != 0 && errno != ENOTTY && errno != EINVAL)
      return Fail(Status::kSetupFailed, errno);
  }
  return Status::kOk;
}

void SerialPort::Close() {
  if (fd_ < 0) return;
  // Only the input: purging the output would drop the last bytes before a
  // device behind a pseudo-terminal has read them.
  ::tcflush(fd_, TCIFLUSH);
  ::ioctl(fd_, TIOCNXCL);
  ::close(fd_);
  fd_ = -1;
  if (trace_) trace_->Note(portName_, "close");
  trace_.reset();
}

SerialPort::Status SerialPort::Purge(bool input, bool output) {
  if (fd_ < 0) return Status::kNotOpen;
  if (!input && !output) return Status::kOk;
  const int queue = input && output ? TCIOFLUSH : input ? TCIFLUSH : TCOFLUSH;
  return ::tcflush(fd_, queue) == 0 ? Status::kOk : Fail(Status::kIoError, errno);
}

SerialPort::Status SerialPort::BytesAvailable(std::size_t& count) {
  count = 0;
  if (fd_ < 0) return Status::kNotOpen;
  int available = 0;
  if (::ioctl(fd_, FIONREAD, &available) != 0) return Fail(Status::kIoError, errno);
  count = available > 0 ? static_cast<std::size_t>(available) : 0;
  return Status::kOk;
}

SerialPort::Status SerialPort::Read(std::uint8_t* buffer, std::size_t size, std::size_t& count) {
  count = 0;
  if (fd_ < 0) return Status::kNotOpen;
  if (size == 0) return Status::kOk;
  const ssize_t n = ::read(fd_, buffer, size);
  if (n < 0) {
    if (errno == EAGAIN || errno == EWOULDBLOCK || errno == EINTR) return Status::kOk;
    return Fail(Status::kIoError, errno);
  }
  count = static_cast<std::size_t>(n);
  if (trace_ && count > 0) trace_->Received(portName_, buffer, count);
  return Status::kOk;
}

SerialPort::Status SerialPort::WriteByte(std::uint8_t byte) {
  if (fd_ < 0) return Status::kNotOpen;
  const auto deadline = Clock::now() + kWriteLimit;
  for (;;) {
    const ssize_t n = ::write(fd_, &byte, 1);
    if (n == 1) break;
    if (n < 0 && errno == EINTR) continue;
    if (n < 0 && errno != EAGAIN && errno != EWOULDBLOCK) return Fail(Status::kIoError, errno);
    // The output queue is full: wait until it takes the byte.
    pollfd p{fd_, POLLOUT, 0};
    const timespec ts = ToTimespec(deadline - Clock::now());
    const int ready = ::ppoll(&p, 1, &ts, nullptr);
    if (ready == 0) return Fail(Status::kTimedOut, ETIMEDOUT);
    if (ready < 0 && errno != EINTR) return Fail(Status::kIoError, errno);
    if (ready > 0 && (p.revents & POLLOUT) == 0) return Fail(Status::kIoError, EIO);
  }
  if (trace_) trace_->Sent(portName_, &byte, 1);
  return Drain(deadline);
}

SerialPort::Status SerialPort::Drain(Clock::time_point deadline) {
  // tcdrain alone could wait for ever on a stopped line; wait for the
  // driver's queue with a limit first, then let tcdrain wait for the last
  // bits of the transmitter, which the driver bounds itself.
  for (;;) {
    int queued = 0;
    if (::ioctl(fd_, TIOCOUTQ, &queued) != 0 || queued <= 0) break;
    const auto now = Clock::now();
    if (now >= deadline) return Fail(Status::kTimedOut, ETIMEDOUT);
    const timespec ts = ToTimespec(std::min<Clock::duration>(kByteTime * queued, deadline - now));
    ::nanosleep(&ts, nullptr);
  }
  while (::tcdrain(fd_) != 0) {
    if (errno != EINTR) return Fail(Status::kIoError, errno);
  }
  return Status::kOk;
}

SerialPort::Status SerialPort::WaitReadable(Clock::time_point deadline, bool& readable) {
  readable = false;
  if (fd_ < 0) return Status::kNotOpen;
  pollfd p{fd_, POLLIN, 0};
  const timespec ts = ToTimespec(deadline - Clock::now());
  const int ready = ::ppoll(&p, 1, &ts, nullptr);
  if (ready < 0) return errno == EINTR ? Status::kOk : Fail(Status::kIoError, errno);
  if (ready > 0 && (p.revents & POLLNVAL) != 0) return Fail(Status::kIoError, EBADF);
  readable = ready > 0 && (p.revents & POLLIN) != 0;
  return Status::kOk;
}

}  // namespace faultbox
