// The transfer interfaces a system creates: owner, answer time-out read once,
// and a connect that fails with a message when the hardware cannot be reached.
#include <gtest/gtest.h>

#include <ostream>

#include "comm/QFCCANTransferInterface.h"
#include "comm/QFCSerielleTransferInterface.h"
#include "platform/Settings.h"
#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"
#include "systems/SystemTestBench.h"

namespace faultbox {
namespace {

using test::Bench;
using test::MessageCapture;
using test::PinFile;

TEST(TransferInterfaceTest, AnswerTimeoutIsReadOnceAndKept) {
  Bench bench;
  bench.SetSetting("Timeout", "250");
  QFCCANTransferInterface can;
  QFCSerielleTransferInterface serial;
  EXPECT_EQ(can.GetAnswerTimeout(), 250);
  bench.SetSetting("Timeout", "40");
  // A wait under way keeps its limit; the serial interface had not asked yet.
  EXPECT_EQ(can.GetAnswerTimeout(), 250);
  EXPECT_EQ(serial.GetAnswerTimeout(), 40);
  EXPECT_EQ(QFCCANTransferInterface().GetAnswerTimeout(), 40);
}

TEST(TransferInterfaceTest, AnswerTimeoutDefault) {
  Bench bench;
  EXPECT_EQ(QFCSerielleTransferInterface().GetAnswerTimeout(), 1000);
}

struct ConnectCase {
  const char* name;
  bool kr60;
  HRESULT result;
  int message;
  const char* text;
};

// Test names and failures show the case's name, not its bytes.
void PrintTo(const ConnectCase& c, std::ostream* os) {
  *os << c.name;
}

class ConnectTest : public ::testing::TestWithParam<ConnectCase> {};

TEST_P(ConnectTest, FailsWithAMessageAndStaysDisconnected) {
  const ConnectCase& c = GetParam();
  Bench bench;
  QFCSystem system("Bench", bench.Write("bench.csv", c.kr60 ? PinFile::KR60() : PinFile::KR40()), 1, "", "");
  ASSERT_EQ(system.OpenFromPinFile(), FAULTBOX_OK);
  ASSERT_EQ(system.SetInterfaceParameter(c.kr60 ? 4 : 200, 6, 0), FAULTBOX_OK);
  // COM6 leads nowhere, whatever serial ports the machine has.
  ASSERT_TRUE(Settings::SetString(SerialPort::kPortSection, "COM6", bench.File("no-such-port")));
  QFCAbstractTransferInterface* transfer = system.GetTransferInterface();
  ASSERT_NE(transfer, nullptr);
  EXPECT_EQ(transfer->GetOwnerSystem(), &system);

  MessageCapture cap;
  EXPECT_EQ(transfer->Connect(true, 0, 0), c.result);
  EXPECT_FALSE(transfer->IsConnected());
  EXPECT_TRUE(system.IsInterfaceFree());
  // What went wrong may be told first (how depends on the machine's CAN
  // interfaces); the failed connect is said last.
  ASSERT_FALSE(cap.records.empty());
  EXPECT_EQ(cap.records.back().number, c.message);
  EXPECT_EQ(cap.records.back().errorClass, 3);
  EXPECT_EQ(cap.records.back().first, c.text);

  // Disconnecting what is not connected does nothing.
  cap.Clear();
  EXPECT_EQ(transfer->Connect(false, 0, 0), FAULTBOX_OK);
  EXPECT_TRUE(cap.records.empty());
}

const ConnectCase kConnectCases[] = {
    {"Serial", false, E_FAULTBOX_CONNECT, 173, "COM6"},
    {"Can", true, E_FAIL, 61, ""},
};

INSTANTIATE_TEST_SUITE_P(Cases, ConnectTest, ::testing::ValuesIn(kConnectCases),
                         [](const auto& info) { return std::string(info.param.name); });

TEST(TransferInterfaceTest, WithoutOwner) {
  Bench bench;
  QFCSerielleTransferInterface serial;
  EXPECT_EQ(serial.GetOwnerSystem(), nullptr);
  MessageCapture cap;
  // No system, so no port name.
  EXPECT_EQ(serial.Connect(true, 0, 0), E_FAULTBOX_CONNECT);
  EXPECT_EQ(cap.Numbers(), std::vector<int>{173});
}

}  // namespace
}  // namespace faultbox
