// The serial transfer interface against a device played by a thread on a
// pseudo-terminal's master: connecting, a port another program holds,
// sending, reading, and the three outcomes of an answer wait.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/file.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <ostream>
#include <thread>

#include "comm/QFCSerielleTransferInterface.h"
#include "platform/PseudoTerminal.h"
#include "platform/Settings.h"
#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"
#include "systems/SystemTestBench.h"

namespace faultbox {
namespace {

using namespace std::chrono_literals;
using test::Bench;
using test::MessageCapture;
using test::PinFile;
using Bytes = std::vector<std::uint8_t>;

// Only a broken interface ever waits this long.
constexpr auto kLimit = 10s;
// Enough passes for a device thread on a busy machine to answer.
constexpr const char* kPatientTimeout = "500000";

// The far end of the line. It answers, after each byte with the top bit set
// (where protocol A expects answers), what `answer` makes of the sum of the
// bytes since its last answer; an empty result answers nothing.
class Device {
 public:
  using Answer = std::function<Bytes(std::uint8_t sum)>;

  explicit Device(Answer answer) : answer_(std::move(answer)) {
    std::string error;
    pty_ = PseudoTerminal::Open(&error);
    EXPECT_NE(pty_, nullptr) << error;
    if (pty_ && ::pipe(wake_) == 0) thread_ = std::thread([this] { Run(); });
  }
  ~Device() {
    if (thread_.joinable()) {
      const char stop = 0;
      EXPECT_EQ(::write(wake_[1], &stop, 1), 1);
      thread_.join();
    }
    for (int fd : wake_)
      if (fd >= 0) ::close(fd);
  }

  const std::string& Path() const { return pty_->SlavePath(); }
  // Writes bytes towards the port as the device would, unasked.
  void Send(const Bytes& bytes) {
    ASSERT_EQ(::write(pty_->MasterFd(), bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
  }
  // The bytes received, once there are at least `count` of them.
  Bytes Received(std::size_t count) {
    std::unique_lock lock(mutex_);
    changed_.wait_for(lock, kLimit, [&] { return received_.size() >= count; });
    return received_;
  }

  static Bytes Checksum(std::uint8_t sum) { return {sum}; }
  static Bytes Silent(std::uint8_t) { return {}; }

 private:
  void Run() {
    std::uint8_t sum = 0;
    for (;;) {
      pollfd p[2] = {{pty_->MasterFd(), POLLIN, 0}, {wake_[0], POLLIN, 0}};
      if (::poll(p, 2, -1) < 0) continue;
      if (p[1].revents != 0) return;
      std::uint8_t buffer[256];
      const ssize_t n = ::read(pty_->MasterFd(), buffer, sizeof buffer);
      for (ssize_t i = 0; i < n; ++i) {
        sum = static_cast<std::uint8_t>(sum + buffer[i]);
        if ((buffer[i] & 0x80) != 0) {
          const Bytes answer = answer_(sum);
          if (!answer.empty()) Send(answer);
          sum = 0;
        }
      }
      std::lock_guard lock(mutex_);
      if (n > 0) received_.insert(received_.end(), buffer, buffer + n);
      changed_.notify_all();
    }
  }

  Answer answer_;
  std::unique_ptr<PseudoTerminal> pty_;
  int wake_[2] = {-1, -1};
  std::thread thread_;
  std::mutex mutex_;
  std::condition_variable changed_;
  Bytes received_;
};

// A KR40 system whose serial settings name COM3, mapped to the device.
class SerialBench {
 public:
  explicit SerialBench(const std::string& devicePath, const char* timeout = kPatientTimeout) {
    bench_.SetSetting("Timeout", timeout);
    EXPECT_TRUE(Settings::SetString(SerialPort::kPortSection, "COM3", devicePath));
    system_ = std::make_unique<QFCSystem>("Bench", bench_.Write("bench.csv", PinFile::KR40()), 1, "", "");
    EXPECT_EQ(system_->OpenFromPinFile(), FAULTBOX_OK);
    EXPECT_EQ(system_->SetInterfaceParameter(fdtRS232_IF_PORT, 3, 0), FAULTBOX_OK);
  }
  QFCSystem& system() { return *system_; }
  QFCSerielleTransferInterface& serial() {
    return *dynamic_cast<QFCSerielleTransferInterface*>(system_->GetTransferInterface());
  }
  const Bench& files() const { return bench_; }

 private:
  Bench bench_;
  std::unique_ptr<QFCSystem> system_;
};

QFCSerielleMessage Byte(std::uint32_t value) {
  return QFCSerielleMessage(QFCSerielleMessage::kKindModuleSelection, 5, value);
}

// Sends the bytes and waits for the answer to all of them.
HRESULT SendAndWait(QFCSerielleTransferInterface& serial, const std::vector<QFCSerielleMessage>& bytes) {
  QFCSerielleMessageMap sent;
  for (std::size_t i = 0; i < bytes.size(); ++i) {
    if (HRESULT result = serial.SendByte(&bytes[i]); result != FAULTBOX_OK) return result;
    sent[static_cast<std::int32_t>(i)] = &bytes[i];
  }
  return serial.WaitForAnswers(sent);
}

TEST(SerielleTransferInterface, ConnectsAndDisconnects) {
  Device device(Device::Checksum);
  SerialBench bench(device.Path());
  MessageCapture cap;
  auto& serial = bench.serial();
  EXPECT_EQ(serial.GetPortName(), "COM3");
  ASSERT_EQ(serial.Connect(true, 0, 0), FAULTBOX_OK);
  EXPECT_TRUE(serial.IsConnected());
  EXPECT_FALSE(bench.system().IsInterfaceFree());
  EXPECT_EQ(serial.Connect(true, 0, 0), FAULTBOX_OK);  // nothing opened twice
  EXPECT_EQ(cap.Numbers(), std::vector<int>{62});
  EXPECT_EQ(cap.records[0].errorClass, 1);

  cap.Clear();
  EXPECT_EQ(serial.Connect(false, 0, 0), FAULTBOX_OK);
  EXPECT_FALSE(serial.IsConnected());
  EXPECT_EQ(serial.Connect(false, 0, 0), FAULTBOX_OK);
  EXPECT_EQ(cap.Numbers(), std::vector<int>{103});
  // The port is free for others again.
  EXPECT_TRUE(SerialPort::CanOpen("COM3"));
}

TEST(SerielleTransferInterface, PortHeldByAnotherProgram) {
  Device device(Device::Checksum);
  SerialBench bench(device.Path());
  const int other = ::open(device.Path().c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK);
  ASSERT_GE(other, 0);
  ASSERT_EQ(::flock(other, LOCK_EX | LOCK_NB), 0);
  MessageCapture cap;
  EXPECT_EQ(bench.serial().Connect(true, 0, 0), E_FAULTBOX_CONNECT);
  ::close(other);
  EXPECT_FALSE(bench.serial().IsConnected());
  EXPECT_TRUE(bench.system().IsInterfaceFree());
  ASSERT_EQ(cap.Numbers(), std::vector<int>{173});
  EXPECT_EQ(cap.records[0].errorClass, 3);
  EXPECT_EQ(cap.records[0].first, "COM3");
  EXPECT_NE(cap.records[0].second.find(device.Path()), std::string::npos);
}

TEST(SerielleTransferInterface, SendingOnAClosedPortWritesNothing) {
  Device device(Device::Checksum);
  SerialBench bench(device.Path());
  auto& serial = bench.serial();
  MessageCapture cap;
  const QFCSerielleMessage first = Byte(0x40);
  EXPECT_EQ(serial.SendByte(&first), E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE);
  EXPECT_EQ(cap.Numbers(), std::vector<int>{54});
  EXPECT_EQ(serial.SendByte(nullptr), E_FAULTBOX_NULL_POINTER);
  QFCSerielleReceivedMap received;
  EXPECT_EQ(serial.ReadBytes(received), E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE);

  // The first byte the device ever sees is the one sent after connecting.
  ASSERT_EQ(serial.Connect(true, 0, 0), FAULTBOX_OK);
  const QFCSerielleMessage second = Byte(0x41);
  ASSERT_EQ(serial.SendByte(&second), FAULTBOX_OK);
  EXPECT_EQ(device.Received(1), Bytes{0x41});
}

struct WaitCase {
  const char* name;
  Device::Answer answer;
  const char* timeout;
  HRESULT result;
};

void PrintTo(const WaitCase& c, std::ostream* os) {
  *os << c.name;
}

class WaitTest : public ::testing::TestWithParam<WaitCase> {};

TEST_P(WaitTest, Outcome) {
  const WaitCase& c = GetParam();
  Device device(c.answer);
  SerialBench bench(device.Path(), c.timeout);
  auto& serial = bench.serial();
  ASSERT_EQ(serial.Connect(true, 0, 0), FAULTBOX_OK);
  MessageCapture cap;
  // 0x40 + 0x85 = 0xC5.
  EXPECT_EQ(SendAndWait(serial, {Byte(0x40), Byte(0x85)}), c.result);
  EXPECT_TRUE(cap.records.empty());
  EXPECT_EQ(device.Received(2), (Bytes{0x40, 0x85}));
}

const WaitCase kWaitCases[] = {
    {"Answered", Device::Checksum, kPatientTimeout, FAULTBOX_OK},
    {"AnswerAmongOtherBytes",
     [](std::uint8_t sum) {
       return Bytes{0x00, 0x51, sum, 0xFF};
     },
     kPatientTimeout, FAULTBOX_OK},
    {"WrongChecksum", [](std::uint8_t sum) { return Bytes{static_cast<std::uint8_t>(sum + 1)}; }, "50000",
     E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING},
    {"Silent", Device::Silent, "200", E_FAULTBOX_TIME_OUT},
};

INSTANTIATE_TEST_SUITE_P(Cases, WaitTest, ::testing::ValuesIn(kWaitCases),
                         [](const auto& info) { return std::string(info.param.name); });

TEST(SerielleTransferInterface, TimeoutZeroGivesUpWithoutReading) {
  Device device(Device::Checksum);
  SerialBench bench(device.Path(), "0");
  auto& serial = bench.serial();
  ASSERT_EQ(serial.Connect(true, 0, 0), FAULTBOX_OK);
  const QFCSerielleMessage byte = Byte(0x85);
  ASSERT_EQ(serial.SendByte(&byte), FAULTBOX_OK);
  ASSERT_EQ(device.Received(1), Bytes{0x85});
  // The answer is on its way or there; the wait does not look.
  EXPECT_EQ(serial.WaitForAnswers({{0, &byte}}), E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING);
  QFCSerielleReceivedMap received;
  const auto end = std::chrono::steady_clock::now() + kLimit;
  while (serial.ReadBytes(received) == E_FAULTBOX_TIME_OUT && std::chrono::steady_clock::now() < end)
    std::this_thread::sleep_for(1ms);
  ASSERT_EQ(received.size(), 1u);
  EXPECT_EQ(received[0]->GetByte(), 0x85);
}

TEST(SerielleTransferInterface, WaitWithoutSentBytes) {
  Device device(Device::Checksum);
  SerialBench bench(device.Path());
  MessageCapture cap;
  EXPECT_EQ(bench.serial().WaitForAnswers({}), E_FAULTBOX_MSG_WAS_NOT_TRANSMITED);
  ASSERT_EQ(cap.Numbers(), std::vector<int>{65});
  EXPECT_EQ(cap.records[0].errorClass, 0);
  cap.Clear();
  EXPECT_EQ(bench.serial().WaitForAnswers({{0, nullptr}}), E_FAULTBOX_NULL_POINTER);
  EXPECT_EQ(cap.Numbers(), std::vector<int>{35});
}

TEST(SerielleTransferInterface, ReadBytesKeepsPositions) {
  Device device(Device::Silent);
  SerialBench bench(device.Path());
  auto& serial = bench.serial();
  ASSERT_EQ(serial.Connect(true, 0, 0), FAULTBOX_OK);
  QFCSerielleReceivedMap received;
  received[7] = std::make_unique<QFCSerielleMessage>();
  EXPECT_EQ(serial.ReadBytes(received), E_FAULTBOX_TIME_OUT);
  EXPECT_TRUE(received.empty());

  device.Send({0xC5, 0x00, 0xE5});
  Bytes got;
  const auto end = std::chrono::steady_clock::now() + kLimit;
  while (got.size() < 3 && std::chrono::steady_clock::now() < end) {
    if (serial.ReadBytes(received) != FAULTBOX_OK) {
      std::this_thread::sleep_for(1ms);
      continue;
    }
    // Positions count from 0 in every read.
    std::int32_t position = 0;
    for (const auto& [index, message] : received) {
      EXPECT_EQ(index, position++);
      EXPECT_EQ(message->GetKind(), QFCSerielleMessage::kKindNew);
      got.push_back(message->GetByte());
    }
  }
  EXPECT_EQ(got, (Bytes{0xC5, 0x00, 0xE5}));
}

TEST(SerielleTransferInterface, ListsThePortsThatOpen) {
  Device com1(Device::Silent);
  Device com3(Device::Silent);
  Bench bench;
  // Every other name points nowhere, whatever ports the machine has.
  std::string ini = std::string("[") + SerialPort::kPortSection + "]\n";
  for (int n = 0; n < QFCSerielleTransferInterface::kListedPorts; ++n)
    ini += "COM" + std::to_string(n) + "=" + bench.File("none") + "\n";
  ini.replace(ini.find("COM1="), 0, "COM1=" + com1.Path() + "\n");
  ini.replace(ini.find("COM3="), 0, "COM3=" + com3.Path() + "\n");
  bench.WriteFile("faultbox.ini", ini);

  std::vector<std::int32_t> ports = {42};
  QFCSerielleTransferInterface::ListPorts(ports);
  EXPECT_EQ(ports, (std::vector<std::int32_t>{1, 3}));

  // A port in use is not offered.
  SerialPort held;
  ASSERT_EQ(held.Open("COM3"), SerialPort::Status::kOk);
  QFCSerielleTransferInterface::ListPorts(ports);
  EXPECT_EQ(ports, (std::vector<std::int32_t>{1}));
}

}  // namespace
}  // namespace faultbox
