// KR40 and KR80 patterns activated and deactivated through the real serial
// transfer interface against the simulated bench on a pseudo-terminal; the
// simulator's relays show what reached the modules.
#include <gtest/gtest.h>

#include <chrono>
#include <ostream>

#include "comm/QFCSerielleTransferInterface.h"
#include "kr40/KR40Simulator.h"
#include "patterns/PatternTestBench.h"
#include "platform/ByteTrace.h"
#include "platform/Settings.h"

namespace faultbox {
namespace {

using namespace std::chrono_literals;
using test::MessageCapture;
using test::PatternBench;
using test::PinLine;

constexpr auto kLimit = 10s;
// Passes enough for the simulator thread to answer on a busy machine.
constexpr const char* kPatientTimeout = "500000";

// Three pins on two modules: module 0x10 relays 1 and 4, module 0x21 relay 10.
const std::vector<PinLine> kPins = {
    {"P1", "Engine", "1", "10", "1"}, {"P2", "Engine", "3", "10", "4"}, {"P3", "Brake", "2", "21", "10"}};

// A bench with the real KR40 pattern and a simulator for its board, the
// system's port (COM1) leading to the simulator.
class SimBench {
 public:
  SimBench(const std::string& board, const char* timeout, const std::string& trace = "")
      : bench_(kPins, board) {
    bench_.patterns().scripted = false;
    bench_.AddClass(1, {"10000"});
    bench_.AddClass(2, {"01000"});
    bench_.AddClass(3, {"00100", "10100"});
    sim::KR40SimulatorOptions options;
    options.protocol = sim::ProtocolForBoardType(board);
    options.pinFile = bench_.pinFilePath();
    std::string error;
    sim_ = sim::KR40Simulator::Start(options, &error);
    EXPECT_NE(sim_, nullptr) << error;
    bench_.files().SetSetting("Timeout", timeout);
    EXPECT_TRUE(Settings::SetString(SerialPort::kPortSection, "COM1", sim_ ? sim_->PortPath() : ""));
    if (!trace.empty()) {
      EXPECT_TRUE(Settings::SetString(SerialPort::kPortSection, ByteTrace::kSettingKey, trace));
    }
    EXPECT_EQ(system()->GetSerialSettings().portName, "COM1");
    EXPECT_EQ(system()->GetTransferInterface()->Connect(true, 0, 0), FAULTBOX_OK);
    // What a hardware reset would have found: every module of the pin file answers.
    for (QFCAbstractPin* pin : bench_.AllPins())
      system()->GetRespondingModules().insert(static_cast<std::uint16_t>(pin->GetModuleAddress()));

    pattern_ = bench_.CreateWith(
        {bench_.Pin("Engine", "P1"), bench_.Pin("Engine", "P2"), bench_.Pin("Brake", "P3")});
    const std::pair<std::int32_t, std::int32_t> choices[] = {{1, 0}, {3, 1}, {2, 0}};
    for (int i = 0; i < 3; ++i)
      EXPECT_EQ(pattern_->SetFailureClass(pattern_->GetPinAt(i), choices[i].first, choices[i].second),
                FAULTBOX_OK);
    pattern_->SelectAllPins(true);
  }
  ~SimBench() {
    system()->GetTransferInterface()->Connect(false, 0, 0);
    if (sim_) sim_->Stop();
  }

  QFCSystem* system() const { return bench_.system(); }
  QFCAbstractFailurePattern& pattern() { return *pattern_; }
  sim::KR40Simulator& sim() { return *sim_; }
  bool Ready() const { return sim_ != nullptr; }

 private:
  PatternBench bench_;
  std::unique_ptr<sim::KR40Simulator> sim_;
  QFCAbstractFailurePattern* pattern_ = nullptr;
};

struct RoundTripCase {
  const char* name;
  std::string board;
  sim::KR40RelayStates activated;
};

void PrintTo(const RoundTripCase& c, std::ostream* os) {
  *os << c.name;
}

class RoundTripTest : public ::testing::TestWithParam<RoundTripCase> {};

TEST_P(RoundTripTest, RelaysFollowThePattern) {
  const RoundTripCase& c = GetParam();
  SimBench bench(c.board, kPatientTimeout);
  ASSERT_TRUE(bench.Ready());
  MessageCapture cap;
  ASSERT_EQ(bench.pattern().ActivatePattern(true), FAULTBOX_OK);
  ASSERT_TRUE(bench.sim().WaitForExecutes(1, kLimit));
  EXPECT_EQ(bench.sim().RelayStates(), c.activated);
  for (int i = 0; i < bench.pattern().GetPinCount(); ++i)
    EXPECT_TRUE(bench.pattern().GetPinAt(i)->IsActivated());

  // An activated pin goes off with the others even when it is not selected.
  bench.pattern().GetPinAt(0)->SetSelected(false);
  ASSERT_EQ(bench.pattern().ActivatePattern(false), FAULTBOX_OK);
  ASSERT_TRUE(bench.sim().WaitForExecutes(2, kLimit));
  EXPECT_TRUE(bench.sim().RelayStates().empty());
  EXPECT_FALSE(bench.pattern().IsAnyPinActivated());
  EXPECT_EQ(cap.Count(174), 0);
  EXPECT_EQ(cap.Count(35), 0);
}

const RoundTripCase kRoundTrips[] = {
    // Protocol A: the states are the pins' PinConfig bits (entries 0; 0 and 2; 1).
    {"KR40", "KR40", {{0x10, {{1, 1}, {4, 5}}}, {0x21, {{10, 2}}}}},
    // Protocol B: the states are the failure classes.
    {"KR80", "KR80", {{0x10, {{1, 1}, {4, 3}}}, {0x21, {{10, 2}}}}},
};

INSTANTIATE_TEST_SUITE_P(Boards, RoundTripTest, ::testing::ValuesIn(kRoundTrips),
                         [](const auto& info) { return std::string(info.param.name); });

struct FailureCase {
  const char* name;
  sim::KR40FaultMode fault;
  const char* timeout;
  HRESULT result;
  std::vector<int> messages;  // 69 and 174, in order
};

void PrintTo(const FailureCase& c, std::ostream* os) {
  *os << c.name;
}

class FailureTest : public ::testing::TestWithParam<FailureCase> {};

// Module 0x10 answers its selection and then fails the answer to its first
// relay byte: the transfer ends there, the relays stay off.
TEST_P(FailureTest, TransferStopsAtTheFailedAnswer) {
  const FailureCase& c = GetParam();
  test::TempDir dir;
  const std::string trace = dir.File("serial.trace");
  SimBench bench("KR40", c.timeout, trace);
  ASSERT_TRUE(bench.Ready());
  sim::KR40Fault fault;
  fault.mode = c.fault;
  fault.afterAnswers = 1;
  bench.sim().SetFaultMode(fault);

  MessageCapture cap;
  EXPECT_EQ(bench.pattern().ActivatePattern(true), c.result);
  std::vector<int> reported;
  for (int number : cap.Numbers())
    if (number == 69 || number == 174) reported.push_back(number);
  EXPECT_EQ(reported, c.messages);
  ASSERT_NE(cap.Find(174), nullptr);
  EXPECT_EQ(cap.Find(174)->errorClass, 2);
  EXPECT_EQ(cap.Find(174)->first, "0x10");
  EXPECT_FALSE(bench.pattern().IsAnyPinActivated());

  // Select, address, and the first relay's state and relay bytes; nothing after.
  const std::vector<std::uint8_t> sent = {0x40, 0x90, 0x65, 0x84};
  std::string traced;
  const std::string text = test::ReadText(trace);
  for (std::size_t at = 0; (at = text.find("COM1 tx ", at)) != std::string::npos; at += 8)
    traced += text.substr(at + 8, 2) + " ";
  EXPECT_EQ(traced, "40 90 65 84 ");
  ASSERT_TRUE(bench.sim().WaitForProcessed(sent.size(), kLimit));
  EXPECT_EQ(bench.sim().ReceivedBytes(), sent);
  EXPECT_EQ(bench.sim().Counters().executes, 0u);
  EXPECT_TRUE(bench.sim().RelayStates().empty());
}

const FailureCase kFailures[] = {
    {"WrongChecksum",
     sim::KR40FaultMode::kWrongChecksum,
     "50000",
     E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING,
     {174}},
    {"Silent", sim::KR40FaultMode::kSilent, "25000", E_FAULTBOX_TIME_OUT, {69, 174}},
};

INSTANTIATE_TEST_SUITE_P(Faults, FailureTest, ::testing::ValuesIn(kFailures),
                         [](const auto& info) { return std::string(info.param.name); });

}  // namespace
}  // namespace faultbox
