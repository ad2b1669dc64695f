// Connecting systems to the simulated benches and resetting their hardware:
// KR60 on the in-process CAN bus of the driver "sim", the KR40 family on a
// pseudo-terminal. The benches show which modules heard the reset and which
// relays it switched off.
#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <chrono>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "comm/QFCAbstractTransferInterface.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCAbstractPin.h"
#include "config/QFCECU.h"
#include "kr40/KR40Simulator.h"
#include "kr60/KR60Simulator.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "platform/CanAccess.h"
#include "platform/SerialPort.h"
#include "platform/Settings.h"
#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"
#include "systems/SystemTestBench.h"

namespace faultbox {
namespace {

using sim::KR60Fault;
using sim::KR60FaultMode;
using sim::KR60ModuleId;
using sim::KR60ModuleType;
using test::MessageCapture;
using test::PinFile;

// Passes enough for the simulator thread to answer on a busy machine.
constexpr const char* kPatientTimeout = "500000";
// Few passes, for tests in which a module stays silent during a transfer.
constexpr const char* kShortTimeout = "20";
constexpr const char* kBenchName = "connection-bench";

constexpr KR60ModuleId kFiu{KR60ModuleType::kFIU, 0x003};
constexpr KR60ModuleId kRsim{KR60ModuleType::kRSIM, 0x004};
constexpr KR60ModuleId kLoad12{KR60ModuleType::kLOAD, 0x012};
constexpr KR60ModuleId kLoad13{KR60ModuleType::kLOAD, 0x013};

using Modules = std::set<std::uint16_t>;

// "ECU/pin" of every pin the system shows as available.
std::set<std::string> AvailablePins(const QFCSystem& system) {
  std::set<std::string> out;
  for (QFCECU* ecu : system.GetECUs())
    for (int i = 0; i < ecu->GetPinCount(); ++i)
      if (ecu->GetPin(i)->IsPresent()) out.insert(ecu->GetName() + "/" + ecu->GetPin(i)->PinName());
  return out;
}

Modules AllAddressesBut(const std::set<std::uint16_t>& missing) {
  Modules out;
  for (std::uint16_t a = 0; a < 128; ++a)
    if (missing.count(a) == 0) out.insert(a);
  return out;
}

// Offset 0x10; FIU 0_0_3, RSIM 0_0_4; P1 on LOAD 0_1_2, P3 on LOAD 0_1_3.
PinFile KR60Pins(const char* fiu = "0_0_3", const char* offset = "10") {
  PinFile file = PinFile::KR60();
  file.Set("OffsetLoadAddress", offset).Set("FIULoadAddress", fiu).Set("RSIMLoadAddress", "0_0_4");
  file.pins = {"P1;Engine;2;1;0_1_2;3", "P3;Gearbox;3;2;0_1_3;0,7"};
  return file;
}

// ---------------------------------------------------------------------------
// KR60

class KR60Connection : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(sim::RegisterKR60SimDriver());
    // The answers of the in-process bench are there long before this.
    ASSERT_TRUE(Settings::SetString(Settings::kHardwareSection, QFCSystem::kResetCollectionWaitKey, "200"));
    bench_.SetSetting("Timeout", kPatientTimeout);
    admin_ = std::make_unique<QFCSystemAdmin>();
  }
  void TearDown() override {
    admin_.reset();
    sim::RemoveKR60SimBench(kBenchName);
    CanChannelTable::SetOverride({});
  }

  // Defines the bench from the pin file and leads every channel to it.
  void StartBench(const std::string& pinFile, const std::map<KR60ModuleId, KR60Fault>& faults = {},
                  std::optional<std::uint32_t> offset = std::nullopt) {
    sim::KR60SimulatorOptions options;
    options.pinFile = pinFile;
    options.moduleFaults = faults;
    options.offset = offset;
    ASSERT_TRUE(sim::DefineKR60SimBench(kBenchName, options));
    CanChannelTarget target;
    ASSERT_TRUE(ParseCanChannelTarget(std::string("sim:") + kBenchName, &target));
    CanChannelTable::SetOverride({{{-1, -1, -1}, target}});
  }
  QFCSystem* Open(const std::string& path) {
    QFCSystem* system = nullptr;
    EXPECT_EQ(admin_->Open(path, 1, "Tester", "Rig", system), FAULTBOX_OK);
    return system;
  }
  // The standard bench, its system connected.
  QFCSystem* Connected(const std::map<KR60ModuleId, KR60Fault>& faults = {}) {
    const std::string path = bench_.Write("kr60.csv", KR60Pins());
    StartBench(path, faults);
    QFCSystem* system = Open(path);
    if (system != nullptr) {
      EXPECT_EQ(system->SetConnection(true, true), FAULTBOX_OK);
    }
    return system;
  }
  static std::shared_ptr<sim::KR60Simulator> Sim() { return sim::FindKR60SimBench(kBenchName); }

  // P1 switches load relay 2 of its channel, P3 relay 4 of both its channels.
  static QFCAbstractFailurePattern* MakePattern(QFCSystem& system) {
    QFCAbstractFailureClasses* classes = system.GetFailureClasses();
    classes->RemoveAll();
    for (const auto& [id, relay] : {std::array<std::uint32_t, 2>{2, 2}, std::array<std::uint32_t, 2>{3, 4}}) {
      QFCAbstractFailureClass& fc = classes->AddFailureClass();
      fc.SetId(static_cast<std::int32_t>(id));
      fc.SetName("Class " + std::to_string(id));
      QFTPossibility p(kRelayPositions, kRelayAny);
      p.Set(relay, kRelayOn, 0, 0);
      fc.AddPossibility(std::move(p));
    }
    QFCAbstractFailurePattern* pattern = nullptr;
    EXPECT_EQ(system.CreatePattern("Loads", pattern), FAULTBOX_OK);
    if (pattern == nullptr) return nullptr;
    EXPECT_TRUE(pattern->AddPins({system.FindPin("Engine", "P1"), system.FindPin("Gearbox", "P3")}));
    EXPECT_EQ(pattern->SetFailureClass(pattern->GetPinAt(0), 2, 0), FAULTBOX_OK);
    EXPECT_EQ(pattern->SetFailureClass(pattern->GetPinAt(1), 3, 0), FAULTBOX_OK);
    pattern->SelectAllPins(true);
    return pattern;
  }
  static bool AllRelaysOff() {
    for (const auto& [module, vector] : Sim()->RelayVectors())
      if (vector != sim::KR60Simulator::kAllOff) return false;
    return true;
  }

  test::Bench bench_;
  std::unique_ptr<QFCSystemAdmin> admin_;
};

TEST_F(KR60Connection, ConnectingTwiceResetsOnce) {
  MessageCapture cap;
  QFCSystem* system = Connected();
  ASSERT_NE(system, nullptr);
  EXPECT_TRUE(system->IsConnected());
  EXPECT_EQ(system->SetConnection(true, true), FAULTBOX_OK);
  EXPECT_TRUE(system->IsConnected());
  EXPECT_EQ(cap.Count(110), 1) << testing::PrintToString(cap.Numbers());
  EXPECT_EQ(system->GetRespondingModules(), (Modules{0x003, 0x004, 0x012, 0x013}));
}

class KR60DisconnectRefused : public KR60Connection, public ::testing::WithParamInterface<bool> {};

// The activated pattern's relays would stay switched with nobody to switch
// them back; the system and its interface stay connected.
TEST_P(KR60DisconnectRefused, WhileAPatternIsActivated) {
  const bool report = GetParam();
  QFCSystem* system = Connected();
  ASSERT_NE(system, nullptr);
  QFCAbstractFailurePattern* pattern = MakePattern(*system);
  ASSERT_NE(pattern, nullptr);
  ASSERT_EQ(pattern->ActivatePattern(true), FAULTBOX_OK);

  MessageCapture cap;
  EXPECT_EQ(system->SetConnection(false, report), E_FAULTBOX_DISCONNECT);
  EXPECT_TRUE(system->IsConnected());
  EXPECT_TRUE(system->GetTransferInterface()->IsConnected());
  EXPECT_EQ(AvailablePins(*system), (std::set<std::string>{"Engine/P1", "Gearbox/P3"}));
  ASSERT_EQ(cap.Count(85), report ? 1 : 0);
  if (report) {
    EXPECT_EQ(cap.Find(85)->first, system->GetName());
  }

  ASSERT_EQ(pattern->ActivatePattern(false), FAULTBOX_OK);
  EXPECT_EQ(system->SetConnection(false, report), FAULTBOX_OK);
  EXPECT_FALSE(system->IsConnected());
  EXPECT_FALSE(system->GetTransferInterface()->IsConnected());
  EXPECT_TRUE(system->GetRespondingModules().empty());
  EXPECT_TRUE(AvailablePins(*system).empty());
}

INSTANTIATE_TEST_SUITE_P(Report, KR60DisconnectRefused, ::testing::Bool(),
                         [](const auto& info) { return info.param ? "Reported" : "Silent"; });

struct SameHilCase {
  const char* name;
  const char* firstFiu;
  const char* secondFiu;
  bool conflict;
};

class KR60SameHil : public KR60Connection, public ::testing::WithParamInterface<SameHilCase> {};

TEST_P(KR60SameHil, SecondSystemOnTheSameSimulatorCannotConnect) {
  const SameHilCase& c = GetParam();
  const std::string firstPath = bench_.Write("first.csv", KR60Pins(c.firstFiu));
  const std::string secondPath = bench_.Write("second.csv", KR60Pins(c.secondFiu));
  StartBench(firstPath);
  QFCSystem* first = Open(firstPath);
  QFCSystem* second = Open(secondPath);
  ASSERT_TRUE(first && second);
  ASSERT_EQ(first->SetConnection(true, true), FAULTBOX_OK);

  MessageCapture cap;
  const HRESULT connected = second->SetConnection(true, true);
  if (!c.conflict) {
    EXPECT_EQ(connected, FAULTBOX_OK);
    EXPECT_TRUE(second->IsConnected());
    EXPECT_EQ(cap.Count(145), 0);
    return;
  }
  EXPECT_EQ(connected, E_FAULTBOX_OTHER_SYSTEM_FOR_SAME_HIL_IS_ACTIVATED);
  EXPECT_FALSE(second->IsConnected());
  EXPECT_FALSE(second->GetTransferInterface()->IsConnected());
  EXPECT_TRUE(AvailablePins(*second).empty());
  ASSERT_EQ(cap.Count(145), 1);
  EXPECT_EQ(cap.Find(145)->first, first->GetName());
  // The first one stays as it was and can still leave.
  EXPECT_TRUE(first->IsConnected());
  EXPECT_EQ(first->SetConnection(false, true), FAULTBOX_OK);
  EXPECT_EQ(second->SetConnection(true, true), FAULTBOX_OK);
}

const SameHilCase kSameHilCases[] = {
    {"EqualAddresses", "0_0_3", "0_0_3", true},
    // Neither can be read: both count as 0.
    {"BothUnreadable", "none", "none", true},
    {"DifferentAddresses", "0_0_3", "0_0_5", false},
    {"OneUnreadable", "none", "0_0_3", false},
};

INSTANTIATE_TEST_SUITE_P(Fiu, KR60SameHil, ::testing::ValuesIn(kSameHilCases),
                         [](const auto& info) { return std::string(info.param.name); });

struct KR60ResetCase {
  const char* name;
  std::vector<KR60ModuleId> silent;
  const char* offset;  // of the pin file
  std::optional<std::uint32_t> benchOffset;
  HRESULT result;
  Modules responding;
  std::set<std::string> available;
  std::map<int, std::string> reported;  // message -> first text ("" for the system's name)
  // Modules that refuse the reset once the pattern of both pins is activated.
  std::vector<KR60ModuleId> refusing = {};
};

class KR60Reset : public KR60Connection, public ::testing::WithParamInterface<KR60ResetCase> {};

// Silent modules are named and their pins become unavailable; the reset
// itself succeeds as long as any answer came. A module that refuses it was
// not reset: the reset fails and the activated pattern stays activated.
TEST_P(KR60Reset, LearnsWhichModulesAnswer) {
  const KR60ResetCase& c = GetParam();
  const std::string path = bench_.Write("kr60.csv", KR60Pins("0_0_3", c.offset));
  std::map<KR60ModuleId, KR60Fault> faults;
  for (const KR60ModuleId& id : c.silent) faults[id] = KR60Fault{KR60FaultMode::kSilent};
  StartBench(path, faults, c.benchOffset);
  QFCSystem* system = Open(path);
  ASSERT_NE(system, nullptr);
  ASSERT_EQ(system->SetConnection(true, true), FAULTBOX_OK);
  QFCAbstractFailurePattern* pattern = nullptr;
  if (!c.refusing.empty()) {
    ASSERT_NE(pattern = MakePattern(*system), nullptr);
    ASSERT_EQ(pattern->ActivatePattern(true), FAULTBOX_OK);
    for (const KR60ModuleId& id : c.refusing) ASSERT_TRUE(Sim()->SetFaultMode(id, {KR60FaultMode::kRefuse}));
  }

  MessageCapture cap;
  EXPECT_EQ(system->ResetHardware(), c.result);
  EXPECT_EQ(system->GetLastResetResult(), c.result);
  EXPECT_TRUE(system->IsConnected());
  EXPECT_EQ(system->GetRespondingModules(), c.responding);
  EXPECT_EQ(AvailablePins(*system), c.available);
  for (int number : {113, 162, 942, 943}) {
    const auto expected = c.reported.find(number);
    ASSERT_EQ(cap.Count(number), expected == c.reported.end() ? 0 : 1) << number;
    if (expected != c.reported.end()) {
      EXPECT_EQ(cap.Find(number)->first, expected->second.empty() ? system->GetName() : expected->second);
    }
  }
  EXPECT_EQ(cap.Count(110), c.refusing.empty() ? 1 : 0);
  if (pattern != nullptr) {
    EXPECT_TRUE(pattern->IsAnyPinActivated());
  }
  // Every pin left out is named.
  EXPECT_EQ(cap.Count(109), 2 - static_cast<int>(c.available.size()));
}

const std::set<std::string> kBothPins = {"Engine/P1", "Gearbox/P3"};

// clang-format off
const KR60ResetCase kKR60ResetCases[] = {
    {"AllAnswer", {}, "10", std::nullopt, FAULTBOX_OK, {0x003, 0x004, 0x012, 0x013}, kBothPins, {}},
    {"SilentFiu", {kFiu}, "10", std::nullopt, FAULTBOX_OK, {0x004, 0x012, 0x013}, kBothPins, {{113, "0x3"}}},
    {"SilentRsim", {kRsim}, "10", std::nullopt, FAULTBOX_OK, {0x003, 0x012, 0x013}, kBothPins, {{162, "0x4"}}},
    {"SilentLoadModule", {kLoad13}, "10", std::nullopt, FAULTBOX_OK, {0x003, 0x004, 0x012}, {"Engine/P1"}, {}},
    // Without any answer the load modules are not looked at.
    {"NothingAnswers", {kFiu, kRsim, kLoad12, kLoad13}, "10", std::nullopt, E_FAULTBOX_TIME_OUT, {}, {}, {{943, ""}}},
    {"RefusingLoadModule", {}, "10", std::nullopt, E_FAIL, {0x003, 0x004, 0x012}, {"Engine/P1"}, {{942, "LOAD 0x13"}}, {kLoad13}},
    // It answered: not named as silent too.
    {"RefusingFiu", {}, "10", std::nullopt, E_FAIL, {0x004, 0x012, 0x013}, kBothPins, {{942, "FIU 0x3"}}, {kFiu}},
    // The reset still goes out, under offset 0.
    {"UnreadableOffsetCountsAsZero", {}, "none", 0u, FAULTBOX_OK, {0x003, 0x004, 0x012, 0x013}, kBothPins, {}},
};
// clang-format on

INSTANTIATE_TEST_SUITE_P(Modules, KR60Reset, ::testing::ValuesIn(kKR60ResetCases),
                         [](const auto& info) { return std::string(info.param.name); });

// Other traffic on the bus while the answers are collected: answers of a
// bench under another offset, and requests under this system's offset. None
// of it is a module of this system.
TEST_F(KR60Connection, OnlyAnswersUnderTheOwnOffsetCount) {
  const std::string path = bench_.Write("kr60.csv", KR60Pins());
  StartBench(path);
  QFCSystem* system = Open(path);
  ASSERT_NE(system, nullptr);

  std::atomic<bool> stop{false};
  std::atomic<int> sent{0};
  std::thread chatter([&] {
    CanHandle handle = 0;
    if (CanAccess::RegisterInterfaceTarget(std::string("sim:") + kBenchName, &handle) != CanResult::kOk)
      return;
    std::uint32_t access = 0;
    CanAccess::InitInterface(handle, 0, 0, &access);
    CanAccess::ActivateChannel(handle);
    CanFrameRecord frame;
    frame.frameType = kCanFrameData;
    frame.flags = kCanFlagExtended;
    frame.length = 8;
    // Offset 0x20, answer direction, LOAD 0x055; offset 0x10, request direction, LOAD 0x066.
    const std::uint32_t identifiers[] = {(0x20u << 18) | 0x10000u | 0x1000u | 0x055u,
                                         (0x10u << 18) | 0x1000u | 0x066u};
    while (!stop) {
      for (std::uint32_t identifier : identifiers) {
        frame.identifier = identifier;
        CanAccess::TransmitMessage(handle, frame);
      }
      ++sent;
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    CanAccess::UnRegisterInterface(handle);
  });
  const HRESULT connected = system->SetConnection(true, true);
  stop = true;
  chatter.join();
  ASSERT_EQ(connected, FAULTBOX_OK);
  ASSERT_GT(sent.load(), 0);
  EXPECT_EQ(system->GetRespondingModules(), (Modules{0x003, 0x004, 0x012, 0x013}));
}

struct FailedTransferCase {
  const char* name;
  bool activatedBefore;  // the failure hits the deactivation of a working activation
};

class KR60FailedTransfer : public KR60Connection, public ::testing::WithParamInterface<FailedTransferCase> {};

// A module falls silent in the middle of a transfer: the system resets the
// hardware, so that no relay stays switched and no pattern counts as activated.
TEST_P(KR60FailedTransfer, ResetsTheHardware) {
  const FailedTransferCase& c = GetParam();
  bench_.SetSetting("Timeout", kShortTimeout);
  QFCSystem* system = Connected();
  ASSERT_NE(system, nullptr);
  QFCAbstractFailurePattern* pattern = MakePattern(*system);
  ASSERT_NE(pattern, nullptr);
  if (c.activatedBefore) {
    ASSERT_EQ(pattern->ActivatePattern(true), FAULTBOX_OK);
    ASSERT_FALSE(AllRelaysOff());
  }
  ASSERT_TRUE(Sim()->SetFaultMode(kLoad13, KR60Fault{KR60FaultMode::kSilent}));

  MessageCapture cap;
  EXPECT_NE(pattern->ActivatePattern(!c.activatedBefore), FAULTBOX_OK);
  EXPECT_EQ(cap.Count(110), 1) << testing::PrintToString(cap.Numbers());
  EXPECT_TRUE(AllRelaysOff());
  EXPECT_FALSE(pattern->IsAnyPinActivated());
  QFCAbstractFailurePattern* activated = nullptr;
  EXPECT_FALSE(system->HasActivatedPattern(activated));
  // The silent module missed the reset's question too.
  EXPECT_EQ(AvailablePins(*system), (std::set<std::string>{"Engine/P1"}));
  EXPECT_TRUE(system->IsConnected());
}

const FailedTransferCase kFailedTransfers[] = {{"Activation", false}, {"Deactivation", true}};

INSTANTIATE_TEST_SUITE_P(Direction, KR60FailedTransfer, ::testing::ValuesIn(kFailedTransfers),
                         [](const auto& info) { return std::string(info.param.name); });

// ---------------------------------------------------------------------------
// KR40 family

// P1 on module 0x10, P2 on module 0x21.
PinFile KR40Pins(const std::string& board) {
  PinFile file = PinFile::KR40(board);
  file.pins = {"P1;Engine;1,2;10;1", "P2;Engine;3;21;2"};
  return file;
}

struct KR40ResetCase {
  const char* name;
  std::string board;
  std::set<std::uint16_t> absent;  // addresses without a module on the bench
  Modules responding;
  std::set<std::string> available;
};

class KR40Reset : public ::testing::TestWithParam<KR40ResetCase> {};

TEST_P(KR40Reset, LearnsWhichModulesAnswer) {
  const KR40ResetCase& c = GetParam();
  test::Bench bench;
  const std::string path = bench.Write("kr40.csv", KR40Pins(c.board));
  sim::KR40SimulatorOptions options;
  options.protocol = sim::ProtocolForBoardType(c.board);
  for (std::uint32_t a = 0; a < 128; ++a)
    if (c.absent.count(static_cast<std::uint16_t>(a)) == 0) options.modules.insert(a);
  std::string error;
  std::unique_ptr<sim::KR40Simulator> sim = sim::KR40Simulator::Start(options, &error);
  ASSERT_NE(sim, nullptr) << error;
  // An absent module costs the whole wait; present ones answer within a few passes.
  bench.SetSetting("Timeout", "10000");
  ASSERT_TRUE(Settings::SetString(SerialPort::kPortSection, "COM1", sim->PortPath()));

  QFCSystemAdmin admin;
  QFCSystem* system = nullptr;
  ASSERT_EQ(admin.Open(path, 1, "Tester", "Rig", system), FAULTBOX_OK);
  MessageCapture cap;
  ASSERT_EQ(system->SetConnection(true, true), FAULTBOX_OK);
  EXPECT_TRUE(sim->WaitForResets(1, std::chrono::seconds(10)));
  EXPECT_EQ(system->GetRespondingModules(), c.responding);
  EXPECT_EQ(AvailablePins(*system), c.available);
  EXPECT_EQ(cap.Count(110), 1);

  EXPECT_EQ(system->SetConnection(false, true), FAULTBOX_OK);
  EXPECT_TRUE(AvailablePins(*system).empty());
  EXPECT_TRUE(system->GetRespondingModules().empty());
}

const KR40ResetCase kKR40ResetCases[] = {
    {"ProtocolAAllPresent", "KR40", {}, AllAddressesBut({}), {"Engine/P1", "Engine/P2"}},
    {"ProtocolASilentModule", "KR40", {0x10}, AllAddressesBut({0x10}), {"Engine/P2"}},
    // No answers in protocol B: every address the reset selects counts.
    {"ProtocolBTakesEveryAddress", "KR80", {0x10, 0x21}, AllAddressesBut({}), {"Engine/P1", "Engine/P2"}},
    {"ProtocolBOtherSpelling", "KR080", {}, AllAddressesBut({}), {"Engine/P1", "Engine/P2"}},
};

INSTANTIATE_TEST_SUITE_P(Boards, KR40Reset, ::testing::ValuesIn(kKR40ResetCases),
                         [](const auto& info) { return std::string(info.param.name); });

TEST(KR40Connection, AFailedConnectLeavesTheSystemDisconnected) {
  test::Bench bench;
  const std::string path = bench.Write("kr40.csv", KR40Pins("KR40"));
  ASSERT_TRUE(Settings::SetString(SerialPort::kPortSection, "COM1", bench.File("no-such-port")));
  QFCSystemAdmin admin;
  QFCSystem* system = nullptr;
  ASSERT_EQ(admin.Open(path, 1, "Tester", "Rig", system), FAULTBOX_OK);

  MessageCapture cap;
  EXPECT_EQ(system->SetConnection(true, true), E_FAULTBOX_CONNECT);
  EXPECT_EQ(cap.Count(173), 1);
  EXPECT_FALSE(system->IsConnected());
  EXPECT_TRUE(AvailablePins(*system).empty());
  // Nothing to reset without a connection, and nothing is reported.
  cap.Clear();
  EXPECT_EQ(system->ResetHardware(), E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE);
  EXPECT_TRUE(cap.records.empty());
}

}  // namespace
}  // namespace faultbox
