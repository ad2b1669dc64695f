// KR60 patterns activated and deactivated through the real CAN transfer
// interface against the simulated bench, reached as the CAN access driver
// "sim" on the pin file of the system; the simulator's relays show what
// reached the modules.
#include <gtest/gtest.h>
#include <signal.h>

#include <array>
#include <atomic>
#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "patterns/kr60/QFCCANMessageBuilder.h"
#include "comm/QFCCANTransferInterface.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCECU.h"
#include "kr60/KR60Simulator.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatterns.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"
#include "support/BackgroundProcess.h"
#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"
#include "systems/SystemTestBench.h"
#include "TestPaths.h"

namespace faultbox {
namespace {

using namespace std::chrono_literals;
using sim::KR60ModuleId;
using sim::KR60ModuleType;
using sim::KR60Simulator;
using test::MessageCapture;

constexpr auto kLimit = 10s;
// Passes enough for the simulator thread to answer on a busy machine.
constexpr const char* kPatientTimeout = "500000";

// Offset 0x10; FIU 0_0_3, RSIM 0_0_4; P1 and P2 on LOAD module 0_1_2
// (channels 3 and 4), P3 on 0_1_3 (channels 0 and 7).
constexpr KR60ModuleId kFiu{KR60ModuleType::kFIU, 0x003};
constexpr KR60ModuleId kRsim{KR60ModuleType::kRSIM, 0x004};
constexpr KR60ModuleId kLoad12{KR60ModuleType::kLOAD, 0x012};
constexpr KR60ModuleId kLoad13{KR60ModuleType::kLOAD, 0x013};
constexpr std::uint64_t kOff = KR60Simulator::kAllOff;

std::uint64_t On(std::initializer_list<int> bits) {
  std::uint64_t vector = kOff;
  for (int bit : bits) vector &= ~(std::uint64_t{1} << bit);
  return vector;
}
int Load(std::uint32_t channel, std::uint32_t relay) {
  return KR60Simulator::LoadRelayBit(channel, relay);
}
int Fiu(std::uint32_t position) {
  return KR60Simulator::FiuRelayBit(position);
}

// What the frames say in short: "L12" a relay frame to LOAD module 0x12
// ("F" FIU, "R" RSIM), "cL" a LOAD commit ("cF", "cR"), "rL" a reset.
std::vector<std::string> Script(const std::vector<CanFrameRecord>& frames) {
  std::vector<std::string> out;
  for (const CanFrameRecord& f : frames) {
    const std::uint32_t address = f.identifier & 0xFFF;
    const char* type = "?";
    switch ((f.identifier >> 12) & 0xF) {
      case 1:
        type = "L";
        break;
      case 2:
        type = "F";
        break;
      case 3:
        type = "R";
        break;
    }
    char text[16];
    if (f.data[0] == 0x81)
      std::snprintf(text, sizeof text, "r%s", type);
    else if (f.data[1] == 0x05)
      std::snprintf(text, sizeof text, "c%s", type);
    else if (type[0] == 'L')
      std::snprintf(text, sizeof text, "L%X%s", address, f.data[2] == 0xFD ? "h" : "");
    else
      std::snprintf(text, sizeof text, "%s%s", type, f.data[2] == 0xFD ? "h" : "");
    out.push_back(text);
  }
  return out;
}

std::uint32_t LowHalfSent(const CanFrameRecord& f) {
  return (std::uint32_t{f.data[3]} << 24) | (std::uint32_t{f.data[4]} << 16) |
         (std::uint32_t{f.data[5]} << 8) | f.data[6];
}

class KR60EndToEnd : public ::testing::Test {
 protected:
  void SetUp() override {
    test::PinFile file = test::PinFile::KR60();
    file.Set("OffsetLoadAddress", "10").Set("FIULoadAddress", "0_0_3").Set("RSIMLoadAddress", "0_0_4");
    file.pins = {"P1;Engine;1;1;0_1_2;3", "P2;Engine;2;1;0_1_2;4", "P3;Gearbox;3;2;0_1_3;0,7"};
    path_ = bench_.Write("kr60.csv", file);
    bench_.SetSetting("Timeout", kPatientTimeout);
    std::string target;
    ASSERT_NO_FATAL_FAILURE(target = StartBench());
    // Every channel a system names is the simulated bench.
    CanChannelTarget parsed;
    ASSERT_TRUE(ParseCanChannelTarget(target, &parsed));
    CanChannelTable::SetOverride({{{-1, -1, -1}, parsed}});

    system_ = std::make_unique<QFCSystem>("E2E", path_, 1, "Tester", "Rig");
    ASSERT_EQ(system_->OpenFromPinFile(), FAULTBOX_OK);
    system_->GetFailurePatterns()->SetHardwareReset([this] { return ResetHardware(); });
    ASSERT_EQ(can()->Connect(true, 0, 0), FAULTBOX_OK);
    sim_ = sim::FindKR60SimBench(path_);
    // The modules of the bench answer the reset, and the system learns them.
    ASSERT_EQ(ResetHardware(), FAULTBOX_OK);
    ASSERT_EQ(system_->GetRespondingModules(), (std::set<std::uint16_t>{0x003, 0x004, 0x012, 0x013}));
    MakePattern();
  }
  void TearDown() override {
    if (system_) can()->Connect(false, 0, 0);
    sim::RemoveKR60SimBench(path_);
    CanChannelTable::SetOverride({});
  }

  // The channel of the bench: the driver "sim" on the system's pin file.
  virtual std::string StartBench() {
    EXPECT_TRUE(sim::RegisterKR60SimDriver());
    return "sim:" + path_;
  }
  // Returns once the bench has taken `count` reset frames and answered them.
  virtual void AwaitResets(std::uint64_t before, std::size_t count) {
    ASSERT_NE(sim_, nullptr);
    EXPECT_TRUE(sim_->WaitForResets(before + count, kLimit));
  }

  QFCCANTransferInterface* can() {
    return dynamic_cast<QFCCANTransferInterface*>(system_->GetTransferInterface());
  }

  // P1: load relay 0 in every step, resistor endpoint A on 2 from step 1
  // to step 2 and endpoint B on 3 from step 2 to step 1; P2: load relay 2;
  // P3: load relay 4 of both its channels. The resistor is 32 ohm.
  void MakePattern() {
    QFCAbstractFailureClasses* classes = system_->GetFailureClasses();
    classes->RemoveAll();
    auto add = [&](std::int32_t id, std::initializer_list<std::array<std::uint32_t, 3>> relays) {
      QFCAbstractFailureClass& fc = classes->AddFailureClass();
      fc.SetId(id);
      fc.SetName("Class " + std::to_string(id));
      QFTPossibility p(kRelayPositions, kRelayAny);
      for (const auto& [position, first, last] : relays) p.Set(position, kRelayOn, first, last);
      fc.AddPossibility(std::move(p));
    };
    add(1, {{0, 0, 0}, {10, 1, 2}, {22, 2, 1}});
    add(2, {{2, 0, 0}});
    add(3, {{4, 0, 0}});
    QFCAbstractFailurePattern* created = nullptr;
    ASSERT_EQ(system_->GetFailurePatterns()->CreatePattern(created, "E2E"), FAULTBOX_OK);
    pattern_ = dynamic_cast<QFCKR60FailurePattern*>(created);
    ASSERT_NE(pattern_, nullptr);
    std::vector<QFCAbstractPin*> pins;
    for (QFCECU* ecu : system_->GetECUs())
      for (int i = 0; i < ecu->GetPinCount(); ++i) pins.push_back(ecu->GetPin(i));
    ASSERT_TRUE(pattern_->AddPins(pins));
    // P1 last: choosing a class resets the external hardware, which only P1's needs.
    for (int i : {2, 1, 0})
      ASSERT_EQ(pattern_->SetFailureClass(pattern_->GetPinAt(i), i + 1, 0), FAULTBOX_OK) << "P" << i + 1;
    ASSERT_EQ(pattern_->SetResistorValue(32), FAULTBOX_OK);
    pattern_->SelectAllPins(true);
  }

  // The reset of the system's hardware reset: the reset frames of LOAD, FIU
  // and RSIM, then the answers, from which the system learns the modules.
  // The bench tells when it took the frames, instead of a fixed wait.
  HRESULT ResetHardware() {
    ++resets_;
    system_->GetRespondingModules().clear();
    std::uint32_t offset = 0;
    EXPECT_EQ(system_->GetLoadAddress("OffsetLoadAddress", offset), FAULTBOX_OK);
    QFCMessageList list;
    for (std::uint32_t type : {kModuleLOAD, kModuleFIU, kModuleRSIM})
      QFCCANMessageBuilder::BuildResetMessages(QFCCANMessageBuilder::kResetSelector, type, list, offset);
    const std::uint64_t resets = sim_ ? sim_->Counters().resets : 0;
    for (const auto& message : list) {
      if (HRESULT hr = can()->SendMessage(dynamic_cast<const QFCCANMessage*>(message.get()));
          hr != FAULTBOX_OK)
        return hr;
    }
    AwaitResets(resets, list.size());
    // Until a pass brings no module more: over the hub, answers may trail the
    // bench's word; other traffic on the bus must not keep the loop going.
    HRESULT hr = E_FAULTBOX_TIME_OUT;
    std::set<std::uint16_t>& modules = system_->GetRespondingModules();
    for (std::size_t heard = 0;; heard = modules.size()) {
      QFCCANReceivedMap received;
      if (can()->Receive(received) != FAULTBOX_OK) break;
      hr = FAULTBOX_OK;
      for (const auto& [identifier, message] : received)
        if ((identifier & 0x30000) == 0x10000) modules.insert(static_cast<std::uint16_t>(identifier & 0xFFF));
      if (modules.size() == heard) break;
    }
    system_->GetFailurePatterns()->ClearActivatedFlags();
    return hr;
  }

  // What the pattern's failure classes say once it is activated.
  std::map<KR60ModuleId, std::uint64_t> Activated() const {
    return {{kFiu, On({Fiu(10), Fiu(22)})},
            {kRsim, 0xFFFFFFFF'FFFC0020},
            {kLoad12, On({Load(3, 0), Load(4, 2)})},
            {kLoad13, On({Load(0, 4), Load(7, 4)})}};
  }
  static std::map<KR60ModuleId, std::uint64_t> AllOff() {
    return {{kFiu, kOff}, {kRsim, kOff}, {kLoad12, kOff}, {kLoad13, kOff}};
  }
  // The frames the bench took since `from`.
  std::vector<CanFrameRecord> FramesSince(std::size_t from) const {
    std::vector<CanFrameRecord> all = sim_->ReceivedFrames();
    return {all.begin() + static_cast<std::ptrdiff_t>(std::min(from, all.size())), all.end()};
  }

  test::Bench bench_;
  std::string path_;
  std::unique_ptr<QFCSystem> system_;
  std::shared_ptr<KR60Simulator> sim_;
  QFCKR60FailurePattern* pattern_ = nullptr;
  int resets_ = 0;
};

TEST_F(KR60EndToEnd, ActivationAndDeactivationSwitchTheRelaysStepByStep) {
  // The bench takes no receive event name from the systems.
  EXPECT_EQ(can()->GetReceiveEventName(), "FS_CAN_RECEIVE_EVENT_0");
  EXPECT_EQ(sim_->RelayVectors(), AllOff());

  std::size_t before = sim_->ReceivedFrames().size();
  const std::uint64_t answers = sim_->Counters().answers;
  ASSERT_EQ(pattern_->ActivatePattern(true), FAULTBOX_OK);
  EXPECT_EQ(sim_->RelayVectors(), Activated());
  EXPECT_EQ(sim_->RsimState(0x004), 0xFFFC0020u);  // 32 ohm
  // All of step 1, its commits in the order RSIM, LOAD, FIU, before step 2,
  // which only the FIU has.
  const std::vector<CanFrameRecord> activation = FramesSince(before);
  EXPECT_EQ(Script(activation), (std::vector<std::string>{"L12", "L12h", "L13", "L13h", "R", "F", "Fh", "cR",
                                                          "cL", "cF", "F", "Fh", "cF"}));
  // Step 2 starts from step 1: endpoint A stays on beside endpoint B.
  ASSERT_EQ(activation.size(), 13u);
  EXPECT_EQ(LowHalfSent(activation[5]), static_cast<std::uint32_t>(On({Fiu(10)})));
  EXPECT_EQ(LowHalfSent(activation[10]), static_cast<std::uint32_t>(On({Fiu(10), Fiu(22)})));
  // Each relay frame answered by its module, the LOAD commit by both.
  EXPECT_TRUE(sim_->WaitForAnswers(answers + 9 + 1 + 2 + 1 + 1, kLimit));
  EXPECT_EQ(sim_->Counters().refused, 0u);
  EXPECT_TRUE(pattern_->GetPinAt(0)->IsActivated());

  before = sim_->ReceivedFrames().size();
  ASSERT_EQ(pattern_->ActivatePattern(false), FAULTBOX_OK);
  EXPECT_EQ(sim_->RelayVectors(), AllOff());
  // The same steps in the same order; the commits reversed.
  const std::vector<CanFrameRecord> deactivation = FramesSince(before);
  EXPECT_EQ(Script(deactivation), (std::vector<std::string>{"L12", "L12h", "L13", "L13h", "R", "F", "Fh",
                                                            "cF", "cL", "cR", "F", "Fh", "cF"}));
  // Endpoint B leaves in step 1, endpoint A in step 2.
  ASSERT_EQ(deactivation.size(), 13u);
  EXPECT_EQ(LowHalfSent(deactivation[5]), static_cast<std::uint32_t>(On({Fiu(10)})));
  EXPECT_EQ(LowHalfSent(deactivation[10]), static_cast<std::uint32_t>(kOff));
  EXPECT_FALSE(pattern_->GetPinAt(0)->IsActivated());
  EXPECT_EQ(resets_, 1);  // the one of connecting
}

struct FailureCase {
  const char* name;
  KR60ModuleId module;
  sim::KR60Fault fault;
  HRESULT result;
  int message;
};

class KR60EndToEndFailure : public KR60EndToEnd, public ::testing::WithParamInterface<FailureCase> {};

// Every failure ends the activation with its result, and the pattern then
// resets the hardware: whatever step 1 switched is off again.
TEST_P(KR60EndToEndFailure, EndsTheActivationAndResetsTheHardware) {
  const FailureCase& c = GetParam();
  // Read at the first wait for answers; a silent module costs 10 passes of 30 ms.
  bench_.SetSetting("Timeout", "10");
  ASSERT_TRUE(sim_->SetFaultMode(c.module, c.fault));

  MessageCapture cap;
  EXPECT_EQ(pattern_->ActivatePattern(true), c.result);
  EXPECT_EQ(cap.Count(c.message), 1) << testing::PrintToString(cap.Numbers());
  EXPECT_EQ(resets_, 2);
  EXPECT_EQ(sim_->RelayVectors(), AllOff());
  EXPECT_FALSE(pattern_->GetPinAt(0)->IsActivated());
}

const FailureCase kFailureCases[] = {
    // The FIU answers step 1 (two relay frames and the commit), then falls silent.
    {"SilentModuleInStepTwo", kFiu, {sim::KR60FaultMode::kSilent, 0ms, 3}, E_FAULTBOX_TIME_OUT, 69},
    {"RefusingModule", kRsim, {sim::KR60FaultMode::kRefuse}, E_FAIL, 107},
    {"WrongAnswerContent", kLoad13, {sim::KR60FaultMode::kWrongContent}, E_FAULTBOX_RECEIVE_MESSAGE, 101},
    {"AnswerUnderAWrongIdentifier", kLoad12, {sim::KR60FaultMode::kWrongIdentifier}, E_FAULTBOX_TIME_OUT, 69},
};

INSTANTIATE_TEST_SUITE_P(Faults, KR60EndToEndFailure, ::testing::ValuesIn(kFailureCases),
                         [](const auto& info) { return std::string(info.param.name); });

// A module that never answers while the bus stays busy is named (message
// 108): only a wait that heard nothing at all is a time-out.
TEST_F(KR60EndToEnd, AModuleSilentOnABusyBusIsNamed) {
  // The passes end at every frame of the busy bus: enough of them for 0x12's answer.
  bench_.SetSetting("Timeout", "300");
  // LOAD 0x13 takes its two relay frames and stays silent at the commit,
  // which 0x12 answers.
  ASSERT_TRUE(sim_->SetFaultMode(kLoad13, {sim::KR60FaultMode::kSilent, 0ms, 2}));
  // Another bench's traffic on the same bus, never for this one.
  std::atomic<bool> stop{false};
  std::thread chatter([&] {
    CanHandle handle = 0;
    if (CanAccess::RegisterInterfaceTarget("sim:" + path_, &handle) != CanResult::kOk) return;
    std::uint32_t access = 0;
    CanAccess::InitInterface(handle, 0, 0, &access);
    CanAccess::ActivateChannel(handle);
    CanFrameRecord frame;
    frame.frameType = kCanFrameData;
    frame.flags = kCanFlagExtended;
    frame.identifier = 0x00802345;  // offset 0x20
    frame.length = 8;
    while (!stop) {
      CanAccess::TransmitMessage(handle, frame);
      std::this_thread::sleep_for(1ms);
    }
    CanAccess::UnRegisterInterface(handle);
  });

  MessageCapture cap;
  EXPECT_EQ(pattern_->ActivatePattern(true), E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING);
  stop = true;
  chatter.join();
  ASSERT_EQ(cap.Count(108), 1) << testing::PrintToString(cap.Numbers());
  EXPECT_EQ(cap.Find(108)->first, "13");
  EXPECT_EQ(sim_->RelayVectors(), AllOff());
}

// The bench keeps its relays across a disconnect, as a real one does, and a
// second system on the same bench gets the next receive event.
TEST_F(KR60EndToEnd, TheBenchOutlivesTheConnection) {
  ASSERT_EQ(pattern_->ActivatePattern(true), FAULTBOX_OK);
  QFCCANTransferInterface second;
  ASSERT_EQ(second.Connect(true, 0, 0), FAULTBOX_OK);
  EXPECT_EQ(second.GetReceiveEventName(), "FS_CAN_RECEIVE_EVENT_1");
  ASSERT_EQ(second.Connect(false, 0, 0), FAULTBOX_OK);
  ASSERT_EQ(can()->Connect(false, 0, 0), FAULTBOX_OK);
  EXPECT_EQ(sim_->RelayVectors(), Activated());
  ASSERT_EQ(can()->Connect(true, 0, 0), FAULTBOX_OK);
  ASSERT_EQ(pattern_->ActivatePattern(false), FAULTBOX_OK);
  EXPECT_EQ(sim_->RelayVectors(), AllOff());
}

// ---------------------------------------------------------------------------
// The same over the hub's TCP bus, with the bench in a faultbox-sim process:
// its printed relay changes show what reached the modules.

class KR60OverTheHub : public KR60EndToEnd {
 protected:
  std::string StartBench() override {
    hub_ = std::make_unique<test::BackgroundProcess>(
        std::vector<std::string>{FAULTBOX_CANHUB_PATH, "--port", "0"});
    const std::string port = hub_->ReadLine();
    EXPECT_FALSE(port.empty()) << "the hub did not start";
    const std::string bus = "127.0.0.1:" + port + "/e2e";
    std::vector<std::string> argv{FAULTBOX_SIM_PATH, "kr60", "--pin-file", path_, "--hub", bus};
    for (std::string& arg : FaultArguments()) argv.push_back(std::move(arg));
    bench_process_ = std::make_unique<test::BackgroundProcess>(std::move(argv));
    const std::string target = bench_process_->ReadLine();
    EXPECT_EQ(target, "tcp:" + bus);
    return target;
  }
  virtual std::vector<std::string> FaultArguments() { return {}; }
  // One printed line per module reset: three types, four modules. Commits
  // of an activation that failed may come first.
  void AwaitResets(std::uint64_t, std::size_t) override {
    int resets = 0;
    for (std::string line = Printed(); !line.empty(); line = Printed())
      if (line.rfind("reset ", 0) == 0 && ++resets == resetLines_) return;
    ADD_FAILURE() << "the bench printed " << resets << " of " << resetLines_ << " resets";
  }
  int resetLines_ = 4;
  void TearDown() override {
    KR60EndToEnd::TearDown();
    if (bench_process_) {
      EXPECT_EQ(bench_process_->Stop(SIGTERM), 0);
    }
  }
  std::string Printed() { return bench_process_->ReadLine(kLimit); }

  std::unique_ptr<test::BackgroundProcess> hub_;
  std::unique_ptr<test::BackgroundProcess> bench_process_;
};

TEST_F(KR60OverTheHub, ActivationAndDeactivationSwitchTheRelaysStepByStep) {
  ASSERT_EQ(pattern_->ActivatePattern(true), FAULTBOX_OK);
  // Step 1 commits RSIM, LOAD (both modules), FIU; step 2 the FIU again.
  const std::vector<std::string> activation = {
      "commit RSIM 0x004: state 0xFFFC0020",
      "commit LOAD 0x012: relays 0xFFFFFFFFFFBF7FFF, on: 3.0 4.2",
      "commit LOAD 0x013: relays 0xFFFFFDFFFFFFFFEF, on: 0.4 7.4",
      "commit FIU 0x003: relays 0xFFFFFFFFFFFFFFDF, on: 5",
      "commit FIU 0x003: relays 0xFFFFFFFFFFFDFFDF, on: 5 17",
  };
  for (const std::string& line : activation) EXPECT_EQ(Printed(), line);
  ASSERT_EQ(pattern_->ActivatePattern(false), FAULTBOX_OK);
  const std::vector<std::string> deactivation = {
      "commit FIU 0x003: relays 0xFFFFFFFFFFFFFFDF, on: 5",
      "commit LOAD 0x012: all relays off",
      "commit LOAD 0x013: all relays off",
      "commit RSIM 0x004: all relays off",
      "commit FIU 0x003: all relays off",
  };
  for (const std::string& line : deactivation) EXPECT_EQ(Printed(), line);
}

// The failures again, with the fault given to the bench process at its
// start: the reset's answer counts among the good ones.
struct HubFailureCase {
  const char* name;
  const char* module;  // faultbox-sim's --fault-module
  const char* fault;
  int after;
  HRESULT result;
  int message;
  int resetLines;  // of the reset after the failure: a refusing module acts on nothing
};

class KR60OverTheHubFailure : public KR60OverTheHub, public ::testing::WithParamInterface<HubFailureCase> {
 protected:
  std::vector<std::string> FaultArguments() override {
    const HubFailureCase& c = GetParam();
    return {"--fault-module", c.module, "--fault", c.fault, "--fault-after", std::to_string(c.after)};
  }
};

TEST_P(KR60OverTheHubFailure, EndsTheActivationAndResetsTheHardware) {
  const HubFailureCase& c = GetParam();
  bench_.SetSetting("Timeout", "10");
  resetLines_ = c.resetLines;
  MessageCapture cap;
  EXPECT_EQ(pattern_->ActivatePattern(true), c.result);
  EXPECT_EQ(cap.Count(c.message), 1) << testing::PrintToString(cap.Numbers());
  EXPECT_EQ(resets_, 2);  // the failed transfer's reset was printed by every module
  EXPECT_FALSE(pattern_->GetPinAt(0)->IsActivated());
}

const HubFailureCase kHubFailureCases[] = {
    {"SilentModuleInStepTwo", "fiu:3", "silent", 4, E_FAULTBOX_TIME_OUT, 69, 4},
    {"RefusingModule", "rsim:4", "refuse", 1, E_FAIL, 107, 3},
    {"WrongAnswerContent", "load:13", "wrong-content", 1, E_FAULTBOX_RECEIVE_MESSAGE, 101, 4},
    {"AnswerUnderAWrongIdentifier", "load:12", "wrong-id", 1, E_FAULTBOX_TIME_OUT, 69, 4},
};

INSTANTIATE_TEST_SUITE_P(Faults, KR60OverTheHubFailure, ::testing::ValuesIn(kHubFailureCases),
                         [](const auto& info) { return std::string(info.param.name); });

}  // namespace
}  // namespace faultbox
