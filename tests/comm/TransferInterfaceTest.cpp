// The transfer interfaces a system creates: owner, answer time-out read once,
// and a connect that never claims success before the hardware layer exists.
#include <gtest/gtest.h>

#include <ostream>

#include "comm/QFCCANTransferInterface.h"
#include "comm/QFCSerielleTransferInterface.h"
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
  QFCAbstractTransferInterface* transfer = system.GetTransferInterface();
  ASSERT_NE(transfer, nullptr);
  EXPECT_EQ(transfer->GetOwnerSystem(), &system);

  MessageCapture cap;
  EXPECT_EQ(transfer->Connect(true, 0, 0), c.result);
  EXPECT_FALSE(transfer->IsConnected());
  EXPECT_TRUE(system.IsInterfaceFree());
  ASSERT_EQ(cap.Numbers(), std::vector<int>{c.message});
  EXPECT_EQ(cap.records[0].errorClass, 3);
  EXPECT_EQ(cap.records[0].first, c.text);

  // Disconnecting what is not connected does nothing.
  cap.Clear();
  EXPECT_EQ(transfer->Connect(false, 0, 0), FAULTBOX_OK);
  EXPECT_TRUE(cap.records.empty());
}

const ConnectCase kConnectCases[] = {
    {"Serial", false, E_FAULTBOX_CONNECT, 171, "COM6"},
    {"Can", true, E_FAIL, 61, ""},
};

INSTANTIATE_TEST_SUITE_P(Cases, ConnectTest, ::testing::ValuesIn(kConnectCases),
                         [](const auto& info) { return std::string(info.param.name); });

TEST(TransferInterfaceTest, WithoutOwner) {
  Bench bench;
  QFCSerielleTransferInterface serial;
  EXPECT_EQ(serial.GetOwnerSystem(), nullptr);
  MessageCapture cap;
  EXPECT_EQ(serial.Connect(true, 0, 0), E_FAULTBOX_CONNECT);
  EXPECT_EQ(cap.Numbers(), std::vector<int>{171});
}

}  // namespace
}  // namespace faultbox
