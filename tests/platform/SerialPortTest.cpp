// The serial port layer on pseudo-terminals: port names and device paths,
// line settings, exclusive use, reading, writing, purging, a vanished
// device, and the byte trace.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/file.h>
#include <termios.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <optional>

#include "platform/ByteTrace.h"
#include "platform/PseudoTerminal.h"
#include "platform/SerialPort.h"
#include "platform/Settings.h"
#include "support/RunProcess.h"

namespace faultbox {
namespace {

using namespace std::chrono_literals;
using Bytes = std::vector<std::uint8_t>;
using Status = SerialPort::Status;

// Only a broken port layer ever waits this long.
constexpr auto kLimit = 10s;

// A settings file of its own, and no trace from the environment.
class SerialPortTest : public ::testing::Test {
 protected:
  SerialPortTest() {
    Settings::SetPathOverride(dir_.File("faultbox.ini"));
    if (const char* trace = std::getenv(ByteTrace::kEnvironmentVariable)) savedTrace_ = trace;
    ::unsetenv(ByteTrace::kEnvironmentVariable);
  }
  ~SerialPortTest() override {
    Settings::SetPathOverride("");
    if (savedTrace_) ::setenv(ByteTrace::kEnvironmentVariable, savedTrace_->c_str(), 1);
  }

  std::unique_ptr<PseudoTerminal> Pty() {
    std::string error;
    auto pty = PseudoTerminal::Open(&error);
    EXPECT_NE(pty, nullptr) << error;
    return pty;
  }
  static void Map(const std::string& port, const std::string& path) {
    ASSERT_TRUE(Settings::SetString(SerialPort::kPortSection, port, path));
  }
  // What the device side receives, waiting for `count` bytes.
  static Bytes ReadMaster(const PseudoTerminal& pty, std::size_t count) {
    Bytes out;
    const auto end = std::chrono::steady_clock::now() + kLimit;
    while (out.size() < count && std::chrono::steady_clock::now() < end) {
      pollfd p{pty.MasterFd(), POLLIN, 0};
      if (::poll(&p, 1, 100) <= 0) continue;
      std::uint8_t buffer[64];
      const ssize_t n = ::read(pty.MasterFd(), buffer, sizeof buffer);
      if (n > 0) out.insert(out.end(), buffer, buffer + n);
    }
    return out;
  }
  static void WriteMaster(const PseudoTerminal& pty, const Bytes& bytes) {
    ASSERT_EQ(::write(pty.MasterFd(), bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
  }
  // Reads from the port until `count` bytes came.
  static Bytes ReadPort(SerialPort& port, std::size_t count) {
    Bytes out;
    const auto end = std::chrono::steady_clock::now() + kLimit;
    while (out.size() < count && std::chrono::steady_clock::now() < end) {
      bool readable = false;
      EXPECT_EQ(port.WaitReadable(end, readable), Status::kOk);
      std::uint8_t buffer[64];
      std::size_t n = 0;
      EXPECT_EQ(port.Read(buffer, sizeof buffer, n), Status::kOk);
      out.insert(out.end(), buffer, buffer + n);
    }
    return out;
  }
  // Waits until the port holds `count` bytes.
  static bool WaitAvailable(SerialPort& port, std::size_t count) {
    const auto end = std::chrono::steady_clock::now() + kLimit;
    std::size_t available = 0;
    while (port.BytesAvailable(available) == Status::kOk && available < count) {
      if (std::chrono::steady_clock::now() > end) return false;
      bool readable = false;
      port.WaitReadable(std::chrono::steady_clock::now() + 1ms, readable);
    }
    return available >= count;
  }

  test::TempDir dir_;
  std::optional<std::string> savedTrace_;
};

TEST_F(SerialPortTest, PortNumbers) {
  const std::pair<const char*, std::optional<int>> cases[] = {{"COM1", 1},
                                                              {"com12", 12},
                                                              {"COM0", 0},
                                                              {"COM007", 7},
                                                              {"COM", std::nullopt},
                                                              {"COM1a", std::nullopt},
                                                              {"LPT1", std::nullopt},
                                                              {"", std::nullopt},
                                                              {" COM1", std::nullopt},
                                                              {"COM-1", std::nullopt},
                                                              {"COM123456789", std::nullopt}};
  for (const auto& [name, number] : cases) EXPECT_EQ(SerialPort::PortNumber(name), number) << name;
}

TEST_F(SerialPortTest, DevicePaths) {
  Map("COM2", "/dev/serial/by-id/usb-FTDI_FT232R-if00-port0");
  Map("COM3", "ttyUSB0");
  Map("Bench", "/dev/ttyUSB1");
  const std::pair<const char*, const char*> cases[] = {
      {"COM1", "/dev/ttyS0"},
      {"com10", "/dev/ttyS9"},
      {"COM2", "/dev/serial/by-id/usb-FTDI_FT232R-if00-port0"},
      {"COM3", ""},  // relative paths would depend on the working folder
      {"COM0", ""},
      {"Bench", "/dev/ttyUSB1"},
      {"LPT1", ""},
      {"", ""}};
  for (const auto& [name, path] : cases) EXPECT_EQ(SerialPort::DevicePath(name), path) << name;
}

TEST_F(SerialPortTest, OpensRawAt9600AndMovesBytesBothWays) {
  auto pty = Pty();
  ASSERT_TRUE(pty);
  Map("COM4", pty->SlavePath());
  SerialPort port;
  ASSERT_EQ(port.Open("com4"), Status::kOk) << port.DescribeLastError();
  EXPECT_TRUE(port.IsOpen());
  EXPECT_EQ(port.GetDevicePath(), pty->SlavePath());

  const int fd = ::open(pty->SlavePath().c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK);
  ASSERT_GE(fd, 0);
  termios tio{};
  ASSERT_EQ(::tcgetattr(fd, &tio), 0);
  ::close(fd);
  EXPECT_EQ(::cfgetospeed(&tio), B9600);
  EXPECT_EQ(::cfgetispeed(&tio), B9600);
  EXPECT_EQ(tio.c_cflag & (CSIZE | PARENB | CSTOPB | CRTSCTS), static_cast<tcflag_t>(CS8));
  EXPECT_NE(tio.c_cflag & CLOCAL, 0u);
  EXPECT_EQ(tio.c_iflag & (IXON | IXOFF | ICRNL | ISTRIP), 0u);
  EXPECT_EQ(tio.c_lflag & (ICANON | ECHO | ISIG), 0u);
  EXPECT_EQ(tio.c_oflag & OPOST, 0u);

  // Every byte value passes unchanged: line ends, flow control characters.
  for (std::uint8_t b : {0x0D, 0x0A, 0x11, 0x13, 0x00, 0xFF}) ASSERT_EQ(port.WriteByte(b), Status::kOk);
  EXPECT_EQ(ReadMaster(*pty, 6), (Bytes{0x0D, 0x0A, 0x11, 0x13, 0x00, 0xFF}));

  std::size_t available = 99;
  EXPECT_EQ(port.BytesAvailable(available), Status::kOk);
  EXPECT_EQ(available, 0u);
  WriteMaster(*pty, {0x03, 0x0D, 0x0A, 0x7F});
  ASSERT_TRUE(WaitAvailable(port, 4));
  EXPECT_EQ(ReadPort(port, 4), (Bytes{0x03, 0x0D, 0x0A, 0x7F}));

  // Purging the input drops what came.
  WriteMaster(*pty, {1, 2});
  ASSERT_TRUE(WaitAvailable(port, 2));
  EXPECT_EQ(port.Purge(true, false), Status::kOk);
  EXPECT_EQ(port.BytesAvailable(available), Status::kOk);
  EXPECT_EQ(available, 0u);
}

TEST_F(SerialPortTest, HeldPortIsBusy) {
  auto pty = Pty();
  ASSERT_TRUE(pty);
  Map("COM5", pty->SlavePath());
  {
    SerialPort first;
    ASSERT_EQ(first.Open("COM5"), Status::kOk);
    SerialPort second;
    EXPECT_EQ(second.Open("COM5"), Status::kBusy);
    EXPECT_FALSE(second.IsOpen());
    EXPECT_FALSE(SerialPort::CanOpen("COM5"));
  }
  // Closing gives it free again; another program's lock holds it too.
  EXPECT_TRUE(SerialPort::CanOpen("COM5"));
  const int other = ::open(pty->SlavePath().c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK);
  ASSERT_GE(other, 0);
  ASSERT_EQ(::flock(other, LOCK_EX | LOCK_NB), 0);
  SerialPort port;
  EXPECT_EQ(port.Open("COM5"), Status::kBusy);
  ::close(other);
  EXPECT_EQ(port.Open("COM5"), Status::kOk);
}

TEST_F(SerialPortTest, OnlySerialDevicesOpen) {
  const std::string file = dir_.Write("not-a-port", "keep me");
  Map("COM6", file);
  Map("COM7", dir_.File("missing"));
  SerialPort port;
  EXPECT_EQ(port.Open("COM6"), Status::kNotATerminal);
  EXPECT_EQ(port.WriteByte(0x40), Status::kNotOpen);
  EXPECT_EQ(test::ReadText(file), "keep me");
  EXPECT_EQ(port.Open("COM7"), Status::kOpenFailed);
  EXPECT_EQ(port.GetLastError(), ENOENT);
  EXPECT_NE(port.DescribeLastError().find(dir_.File("missing")), std::string::npos);
  EXPECT_EQ(port.Open("LPT1"), Status::kNoDevice);
  EXPECT_FALSE(port.IsOpen());

  std::size_t count = 0;
  std::uint8_t byte = 0;
  bool readable = true;
  EXPECT_EQ(port.Read(&byte, 1, count), Status::kNotOpen);
  EXPECT_EQ(port.BytesAvailable(count), Status::kNotOpen);
  EXPECT_EQ(port.Purge(true, true), Status::kNotOpen);
  EXPECT_EQ(port.WaitReadable(std::chrono::steady_clock::now(), readable), Status::kNotOpen);
  EXPECT_FALSE(readable);
}

TEST_F(SerialPortTest, VanishedDeviceFailsInsteadOfHanging) {
  auto pty = Pty();
  ASSERT_TRUE(pty);
  Map("COM8", pty->SlavePath());
  SerialPort port;
  ASSERT_EQ(port.Open("COM8"), Status::kOk);
  pty.reset();
  EXPECT_EQ(port.WriteByte(0x40), Status::kIoError);
  EXPECT_NE(port.GetLastError(), 0);
}

TEST_F(SerialPortTest, TraceShowsEveryByteWithTimeStamps) {
  auto pty = Pty();
  ASSERT_TRUE(pty);
  Map("COM9", pty->SlavePath());
  const std::string trace = dir_.File("serial.trace");
  ASSERT_TRUE(Settings::SetString(SerialPort::kPortSection, ByteTrace::kSettingKey, trace));
  {
    SerialPort port;
    ASSERT_EQ(port.Open("COM9"), Status::kOk);
    ASSERT_EQ(port.WriteByte(0x40), Status::kOk);
    ASSERT_EQ(port.WriteByte(0x85), Status::kOk);
    WriteMaster(*pty, {0xC5, 0x0A});
    ASSERT_EQ(ReadPort(port, 2).size(), 2u);
  }
  const std::string text = test::ReadText(trace);
  std::vector<std::string> lines;
  for (std::size_t start = 0, end; (end = text.find('\n', start)) != std::string::npos; start = end + 1) {
    const std::string line = text.substr(start, end - start);
    // "(secs.usecs) " in front of every line.
    ASSERT_GT(line.size(), 20u);
    EXPECT_EQ(line[0], '(');
    const std::size_t close = line.find(") ");
    ASSERT_NE(close, std::string::npos);
    EXPECT_EQ(line[close - 7], '.');
    lines.push_back(line.substr(close + 2));
  }
  ASSERT_GE(lines.size(), 4u);
  EXPECT_EQ(lines.front(), "COM9 -- open " + pty->SlavePath());
  EXPECT_EQ(lines[1], "COM9 tx 40");
  EXPECT_EQ(lines[2], "COM9 tx 85");
  // A line per byte, whether the answer came in one read or two.
  std::string received;
  for (std::size_t i = 3; i + 1 < lines.size(); ++i) received += lines[i] + "|";
  EXPECT_EQ(received, "COM9 rx C5|COM9 rx 0A|");
  EXPECT_EQ(lines.back(), "COM9 -- close");
}

}  // namespace
}  // namespace faultbox
