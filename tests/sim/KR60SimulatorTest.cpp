// The simulated KR60 bench driven with raw frames through the CAN access
// layer, as the transfer interface would; its driver "sim"; and the kr60
// command of the faultbox-sim program on the hub's TCP bus.
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "config/PinFileText.h"
#include "kr60/KR60Simulator.h"
#include "platform/CanAccess.h"
#include "support/BackgroundProcess.h"
#include "support/RunProcess.h"
#include "TestPaths.h"

namespace faultbox::sim {
namespace {

using namespace std::chrono_literals;

// Generous: only a broken simulator ever reaches it.
constexpr auto kLimit = 10s;

using Bytes = std::vector<std::uint8_t>;

// The bench of most tests: offset 0x10, FIU 3, LOAD 0x12 and 0x13, RSIM 0xF2.
constexpr KR60ModuleId kFiu{KR60ModuleType::kFIU, 3};
constexpr KR60ModuleId kLoad12{KR60ModuleType::kLOAD, 0x12};
constexpr KR60ModuleId kLoad13{KR60ModuleType::kLOAD, 0x13};
constexpr KR60ModuleId kRsim{KR60ModuleType::kRSIM, 0xF2};

// Identifiers written out: offset 0x10 is 0x00400000, type code LOAD 0x1000,
// FIU 0x2000, RSIM 0x3000, an answer adds 0x10000.
constexpr std::uint32_t kFiuRequest = 0x00402003;
constexpr std::uint32_t kFiuAnswer = 0x00412003;
constexpr std::uint32_t kFiuAll = 0x00402000;
constexpr std::uint32_t kLoadAll = 0x00401000;
constexpr std::uint32_t kRsimAll = 0x00403000;

struct Frame {
  std::uint32_t identifier;
  Bytes data;
  bool operator==(const Frame&) const = default;
};

std::ostream& operator<<(std::ostream& out, const Frame& f) {
  char text[16];
  std::snprintf(text, sizeof text, "%08X#", f.identifier);
  out << text;
  for (std::uint8_t b : f.data) {
    std::snprintf(text, sizeof text, "%02X", b);
    out << text;
  }
  return out;
}

Frame RelayLow(std::uint32_t id, std::uint32_t half) {
  return {id,
          {0x82, 0x04, 0xFE, std::uint8_t(half >> 24), std::uint8_t(half >> 16), std::uint8_t(half >> 8),
           std::uint8_t(half), 0xFF}};
}
Frame RelayHigh(std::uint32_t id, std::uint32_t half) {
  Frame f = RelayLow(id, half);
  f.data[2] = 0xFD;
  return f;
}
Frame Commit(std::uint32_t id) {
  return {id, {0x82, 0x05, 0x00, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF}};
}
Frame Reset(std::uint32_t id) {
  return {id, {0x81, 0x01, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF}};
}
// What a module answers to `request` from its own address.
Frame Accepted(const Frame& request, std::uint32_t address, std::uint8_t verdict = 0x01) {
  const std::uint32_t id = (request.identifier & 0xFFFCF000u) | 0x10000u | address;
  return {
      id,
      {std::uint8_t(0x40 | (request.data[0] & 0x3F)), request.data[1], verdict, request.data[2], 0, 0, 0, 0}};
}
Frame Refused(const Frame& request, std::uint32_t address) {
  return Accepted(request, address, 0x14);
}

std::string UniqueName(const char* stem) {
  static std::atomic<int> counter{0};
  return std::string(stem) + "-" + std::to_string(::getpid()) + "-" + std::to_string(counter++);
}

// The host's side of the bus: one channel of the layer.
class Host {
 public:
  explicit Host(const std::string& target) {
    EXPECT_EQ(CanAccess::RegisterInterfaceTarget(target, &handle_), CanResult::kOk)
        << CanAccess::LastErrorText();
    std::uint32_t access = 0;
    event_ = NamedEvent::CreateFirstFree("KR60_SIMULATOR_TEST_%i");
    EXPECT_EQ(CanAccess::InitInterface(handle_, 2, 0, &access), CanResult::kOk);
    EXPECT_EQ(CanAccess::SetEventNotification(handle_, event_, 1), CanResult::kOk);
    EXPECT_EQ(CanAccess::ActivateChannel(handle_), CanResult::kOk);
  }
  ~Host() { CanAccess::UnRegisterInterface(handle_); }

  void Send(const Frame& f, bool extended = true) const {
    CanFrameRecord r;
    r.frameType = kCanFrameData;
    r.flags = extended ? kCanFlagExtended : 0;
    r.identifier = f.identifier;
    r.length = static_cast<std::uint8_t>(f.data.size());
    std::copy(f.data.begin(), f.data.end(), r.data);
    ASSERT_EQ(CanAccess::TransmitMessage(handle_, r), CanResult::kOk) << CanAccess::LastErrorText();
  }
  // Waits until `count` frames came, or the limit; returns what came.
  std::vector<Frame> Receive(std::size_t count) const {
    std::vector<Frame> got = Pending();
    const auto end = std::chrono::steady_clock::now() + kLimit;
    while (got.size() < count && std::chrono::steady_clock::now() < end) {
      event_->Wait(100ms);
      for (Frame& f : Pending()) got.push_back(std::move(f));
    }
    return got;
  }
  // What the queue holds right now.
  std::vector<Frame> Pending() const {
    std::vector<CanFrameRecord> buffer(256);
    auto n = static_cast<std::uint32_t>(buffer.size());
    EXPECT_EQ(CanAccess::ReadReceiveQueue(handle_, buffer.data(), &n), CanResult::kOk);
    std::vector<Frame> out;
    for (std::uint32_t i = 0; i < n; ++i)
      out.push_back({buffer[i].identifier, Bytes(buffer[i].data, buffer[i].data + buffer[i].length)});
    return out;
  }

 private:
  CanHandle handle_ = 0;
  std::shared_ptr<NamedEvent> event_;
};

KR60SimulatorOptions FourModules(const std::string& bus) {
  KR60SimulatorOptions o;
  o.target = "virtual:" + bus;
  o.offset = 0x10;
  o.modules = {kFiu, kLoad12, kLoad13, kRsim};
  return o;
}

std::unique_ptr<KR60Simulator> StartOrFail(const KR60SimulatorOptions& options) {
  return StartBench<KR60Simulator>(options, [](const std::string& error) { ADD_FAILURE() << error; });
}

// Sends frames one by one and checks that exactly `answers` came back, in this order.
void Exchange(const KR60Simulator& sim, const Host& host, const std::vector<Frame>& send,
              const std::vector<Frame>& answers) {
  const std::uint64_t before = sim.Counters().frames;
  for (const Frame& f : send) host.Send(f);
  ASSERT_TRUE(sim.WaitForFrames(before + send.size(), kLimit));
  EXPECT_EQ(host.Receive(answers.size()), answers);
  EXPECT_EQ(host.Pending(), std::vector<Frame>{});
}

using Vectors = std::map<KR60ModuleId, std::uint64_t>;
constexpr std::uint64_t kOff = KR60Simulator::kAllOff;
const Vectors kAllOff = {{kFiu, kOff}, {kLoad12, kOff}, {kLoad13, kOff}, {kRsim, kOff}};

Vectors With(std::initializer_list<std::pair<const KR60ModuleId, std::uint64_t>> changes) {
  Vectors v = kAllOff;
  for (const auto& [id, vector] : changes) v[id] = vector;
  return v;
}

struct Step {
  std::vector<Frame> send;
  std::vector<Frame> answers;
  Vectors relays;  // in effect after the step
};

struct Scenario {
  const char* name;
  std::vector<Step> steps;
};

class KR60Scenario : public testing::TestWithParam<Scenario> {};

TEST_P(KR60Scenario, AnswersAndRelays) {
  auto sim = StartOrFail(FourModules(UniqueName("kr60-scenario")));
  ASSERT_NE(sim, nullptr);
  Host host(sim->Target());
  for (const Step& step : GetParam().steps) {
    Exchange(*sim, host, step.send, step.answers);
    EXPECT_EQ(sim->RelayVectors(), step.relays);
  }
}

const Frame kFiuLow = RelayLow(kFiuRequest, 0xFFFFFFFC);
const Frame kFiuHigh = RelayHigh(kFiuRequest, 0xFFFFFFDF);
const Frame kLoad12Low = RelayLow(0x00401012, 0xFFFF7FFF);
const Frame kLoad13High = RelayHigh(0x00401013, 0xFFFFFFFE);
const Frame kRsimLow = RelayLow(0x004030F2, 0xFFF9FFFE);

const Scenario kScenarios[] = {
    // Relays 5, 6 and 42 of a failure class: loaded half by half, in effect at the commit.
    {"FiuRelaysTakeEffectAtTheCommit",
     {{{kFiuLow, kFiuHigh}, {Accepted(kFiuLow, 3), Accepted(kFiuHigh, 3)}, kAllOff},
      {{Commit(kFiuAll)}, {Accepted(Commit(kFiuAll), 3)}, With({{kFiu, 0xFFFFFFDFFFFFFFFC}})}}},
    // One LOAD commit, answered by both loaded modules, lowest identifier first.
    {"OneLoadCommitAnsweredByBothModules",
     {{{kLoad13High, kLoad12Low}, {Accepted(kLoad13High, 0x13), Accepted(kLoad12Low, 0x12)}, kAllOff},
      {{Commit(kLoadAll)},
       {Accepted(Commit(kLoadAll), 0x12), Accepted(Commit(kLoadAll), 0x13)},
       With({{kLoad12, 0xFFFFFFFFFFFF7FFF}, {kLoad13, 0xFFFFFFFEFFFFFFFF}})}}},
    // A module that was not loaded since its last commit neither takes nor answers the next one.
    {"CommitOnlyFromLoadedModules",
     {{{kLoad12Low, Commit(kLoadAll)},
       {Accepted(kLoad12Low, 0x12), Accepted(Commit(kLoadAll), 0x12)},
       With({{kLoad12, 0xFFFFFFFFFFFF7FFF}})},
      {{Commit(kLoadAll), Commit(kFiuAll)}, {}, With({{kLoad12, 0xFFFFFFFFFFFF7FFF}})}}},
    // A step-2 record starts from the step-1 vector: what is not sent stays.
    {"SecondStepKeepsTheOtherHalf",
     {{{kFiuLow, kFiuHigh, Commit(kFiuAll)},
       {Accepted(kFiuLow, 3), Accepted(kFiuHigh, 3), Accepted(Commit(kFiuAll), 3)},
       With({{kFiu, 0xFFFFFFDFFFFFFFFC}})},
      {{RelayLow(kFiuRequest, 0xFFFFFFFF), Commit(kFiuAll)},
       {Accepted(RelayLow(kFiuRequest, 0xFFFFFFFF), 3), Accepted(Commit(kFiuAll), 3)},
       With({{kFiu, 0xFFFFFFDFFFFFFFFF}})}}},
    // The RSIM module has only the low half; a high half is refused and changes nothing.
    {"RsimLowHalfOnly",
     {{{kRsimLow, RelayHigh(0x004030F2, 0)},
       {Accepted(kRsimLow, 0xF2), Refused(RelayHigh(0x004030F2, 0), 0xF2)},
       kAllOff},
      {{Commit(kRsimAll)}, {Accepted(Commit(kRsimAll), 0xF2)}, With({{kRsim, 0xFFFFFFFFFFF9FFFE}})}}},
    // A reset switches everything off and drops loaded vectors; every module of the type answers.
    {"ResetDropsRelaysAndLoadedVectors",
     {{{kLoad12Low, Commit(kLoadAll), kLoad13High},
       {Accepted(kLoad12Low, 0x12), Accepted(Commit(kLoadAll), 0x12), Accepted(kLoad13High, 0x13)},
       With({{kLoad12, 0xFFFFFFFFFFFF7FFF}})},
      {{Reset(kLoadAll)}, {Accepted(Reset(kLoadAll), 0x12), Accepted(Reset(kLoadAll), 0x13)}, kAllOff},
      {{Commit(kLoadAll)}, {}, kAllOff},
      {{Reset(kFiuAll), Reset(kRsimAll)},
       {Accepted(Reset(kFiuAll), 3), Accepted(Reset(kRsimAll), 0xF2)},
       kAllOff}}},
    // Frames that are not for this bench: another offset, an answer, an
    // absent module, an unknown type code.
    {"FramesForOthersAreIgnored",
     {{{RelayLow(0x00442003, 0),
        Accepted(kFiuLow, 3),
        RelayLow(0x00402004, 0),
        RelayLow(0x00404003, 0),
        {kFiuRequest | 0x20000, kFiuLow.data}},
       {},
       kAllOff}}},
    // An addressed module refuses what it cannot read: unknown commands, short frames.
    {"UnknownCommandsAreRefused",
     {{{{kFiuRequest, {0x82, 0x07, 0x00, 0, 0, 0, 0, 0}}, {kFiuRequest, {0x82, 0x04, 0xFE, 0, 0, 0, 0}}},
       {Refused({kFiuRequest, {0x82, 0x07, 0x00, 0, 0, 0, 0, 0}}, 3),
        {0x00412003, {0x42, 0x04, 0x14, 0xFE, 0, 0, 0, 0}}},
       kAllOff}}},
};

INSTANTIATE_TEST_SUITE_P(Frames, KR60Scenario, testing::ValuesIn(kScenarios),
                         [](const auto& info) { return std::string(info.param.name); });

TEST(KR60Simulator, FaultModes) {
  struct Case {
    const char* name;
    KR60Fault fault;
    std::vector<Frame> answers;  // to kFiuLow, then Commit(kFiuAll)
    std::uint64_t relays;
    bool oneModule = false;  // the fault only on FIU 3; LOAD 0x12 answers its frame too
  };
  const std::uint64_t switched = 0xFFFFFFFFFFFFFFFC;
  const Frame wrongId{0x00422003, Accepted(kFiuLow, 3).data};
  Frame wrongContent = Accepted(kFiuLow, 3);
  wrongContent.data[0] = 0x82;
  Frame wrongCommit = Accepted(Commit(kFiuAll), 3);
  wrongCommit.data[0] = 0x82;
  const Case cases[] = {
      {"silent modules still switch", {KR60FaultMode::kSilent}, {}, switched},
      // Never loaded, the module does not take the broadcast commit either.
      {"refusing modules switch nothing", {KR60FaultMode::kRefuse}, {Refused(kFiuLow, 3)}, kOff},
      {"late", {KR60FaultMode::kLate, 20ms}, {Accepted(kFiuLow, 3), Accepted(Commit(kFiuAll), 3)}, switched},
      {"wrong identifier",
       {KR60FaultMode::kWrongIdentifier},
       {wrongId, {0x00422003, Accepted(Commit(kFiuAll), 3).data}},
       switched},
      {"wrong content", {KR60FaultMode::kWrongContent}, {wrongContent, wrongCommit}, switched},
      {"fault after one answer", {KR60FaultMode::kSilent, 200ms, 1}, {Accepted(kFiuLow, 3)}, switched},
      {"one module", {KR60FaultMode::kRefuse}, {Refused(kFiuLow, 3), Accepted(kLoad12Low, 0x12)}, kOff, true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    auto sim = StartOrFail(FourModules(UniqueName("kr60-fault")));
    ASSERT_NE(sim, nullptr);
    if (c.oneModule) {
      ASSERT_TRUE(sim->SetFaultMode(kFiu, c.fault));
    } else {
      sim->SetFaultMode(c.fault);
    }
    Host host(sim->Target());
    const std::vector<Frame> send =
        c.oneModule ? std::vector<Frame>{kFiuLow, kLoad12Low} : std::vector<Frame>{kFiuLow, Commit(kFiuAll)};
    for (const Frame& f : send) host.Send(f);
    ASSERT_TRUE(sim->WaitForFrames(2, kLimit));
    EXPECT_EQ(host.Receive(c.answers.size()), c.answers);
    if (!c.oneModule) {
      EXPECT_EQ(sim->RelayVector(kFiu), c.relays);
    }
  }
  auto sim = StartOrFail(FourModules(UniqueName("kr60-fault")));
  ASSERT_NE(sim, nullptr);
  EXPECT_FALSE(sim->SetFaultMode({KR60ModuleType::kFIU, 4}, {KR60FaultMode::kSilent}));
}

TEST(KR60Simulator, LateAnswerIsHeldBackAndStopDoesNotWaitForIt) {
  KR60SimulatorOptions options = FourModules(UniqueName("kr60-late"));
  options.moduleFaults[kFiu] = {KR60FaultMode::kLate, std::chrono::hours(1)};
  auto sim = StartOrFail(options);
  ASSERT_NE(sim, nullptr);
  Host host(sim->Target());
  // The late module does not hold up the others.
  Exchange(*sim, host, {kFiuLow, kLoad12Low}, {Accepted(kLoad12Low, 0x12)});
  EXPECT_EQ(sim->Counters().answers, 1u);
  EXPECT_EQ(sim->StagedVector(kFiu), 0xFFFFFFFFFFFFFFFCu);
  sim->Stop();
  sim->Stop();
}

// With the bus model on, the frames still get the same answers; broadcast
// answers leave in the order arbitration gives them.
TEST(KR60Simulator, TimedBusAnswersInArbitrationOrder) {
  KR60SimulatorOptions options = FourModules(UniqueName("kr60-timing"));
  options.timing = true;
  options.modules.push_back({KR60ModuleType::kLOAD, 0x11});
  auto sim = StartOrFail(options);
  ASSERT_NE(sim, nullptr);
  Host host(sim->Target());
  const Frame load11 = RelayLow(0x00401011, 0xFFFFFFFE);
  for (const Frame& f : {kLoad13High, load11, kLoad12Low}) {
    host.Send(f);
    EXPECT_EQ(host.Receive(1), std::vector<Frame>{Accepted(f, f.identifier & 0xFFF)});
  }
  host.Send(Commit(kLoadAll));
  EXPECT_EQ(host.Receive(3),
            (std::vector<Frame>{Accepted(Commit(kLoadAll), 0x11), Accepted(Commit(kLoadAll), 0x12),
                                Accepted(Commit(kLoadAll), 0x13)}));
  EXPECT_EQ(sim->RelayVector(kLoad12), 0xFFFFFFFFFFFF7FFFu);
}

TEST(KR60Simulator, FrameBitsCountStuffBits) {
  struct Case {
    Frame frame;
    bool extended;
    std::uint32_t bits;
  };
  // Counted independently, bit stream built and stuffed bit by bit.
  const Case cases[] = {
      {kFiuLow, true, 145},     {Accepted(kFiuLow, 3), true, 145},     {{0x00000000, Bytes(8, 0)}, true, 150},
      {{0x123, {}}, false, 48}, {{0x7FF, Bytes(8, 0xFF)}, false, 126},
  };
  for (const Case& c : cases) {
    CanFrameRecord r;
    r.frameType = kCanFrameData;
    r.flags = c.extended ? kCanFlagExtended : 0;
    r.identifier = c.frame.identifier;
    r.length = static_cast<std::uint8_t>(c.frame.data.size());
    std::copy(c.frame.data.begin(), c.frame.data.end(), r.data);
    EXPECT_EQ(KR60Simulator::FrameBits(r), c.bits) << c.frame;
    EXPECT_EQ(KR60Simulator::FrameTime(r), std::chrono::microseconds(8 * c.bits));
  }
}

// ---------------------------------------------------------------------------
// Benches from pin files

test::PinFileText BenchText() {
  test::PinFileText text = test::PinFileText::KR60();
  text.pins = {"P1;Engine;1;1;0_1_2;3", "P2;Engine;2;2;1_2_10;0,6", "P3;Engine;-;0;0_3_3;1"};
  return text;
}

TEST(KR60Simulator, ModulesComeFromThePinFile) {
  test::TempDir dir;
  test::PinFileText text = BenchText();
  text.format[1] = "AdditionalFiles;extra.csv";
  // Wider than the identifier's 11 bits: the host sends the low ones, 0x010.
  text.format[9] = "OffsetLoadAddress;810";
  test::PinFileText extra = test::PinFileText::KR60();
  extra.format = {"BoardType;KR60"};
  extra.pins = {"P9;Brake;1;1;0_4_5;2"};
  dir.Write("extra.csv", extra.Build());
  KR60SimulatorOptions options;
  options.pinFile = dir.Write("bench.csv", text.Build());
  options.target = "virtual:" + UniqueName("kr60-pinfile");
  auto sim = StartOrFail(options);
  ASSERT_NE(sim, nullptr);
  EXPECT_EQ(sim->Offset(), 0x10u);
  // FIU 0_15_1, RSIM 0_15_2; P3 is not used, so its module 0_3_3 is not there.
  EXPECT_EQ(sim->Modules(), (std::vector<KR60ModuleId>{{KR60ModuleType::kFIU, 0x0F1},
                                                       {KR60ModuleType::kLOAD, 0x012},
                                                       {KR60ModuleType::kLOAD, 0x045},
                                                       {KR60ModuleType::kLOAD, 0x12A},
                                                       {KR60ModuleType::kRSIM, 0x0F2}}));
  Host host(sim->Target());
  Exchange(
      *sim, host, {Reset(kLoadAll)},
      {Accepted(Reset(kLoadAll), 0x012), Accepted(Reset(kLoadAll), 0x045), Accepted(Reset(kLoadAll), 0x12A)});
}

TEST(KR60Simulator, StartRefusesBenchesItCannotServe) {
  test::TempDir dir;
  struct Case {
    const char* name;
    std::string content;  // empty: no file at all
    KR60SimulatorOptions options;
    const char* mentions;
  };
  test::PinFileText noOffset = BenchText();
  noOffset.format[9] = "OffsetLoadAddress;none";
  test::PinFileText zeroFiu = BenchText();
  zeroFiu.format[11] = "FIULoadAddress;0_0_0";
  KR60SimulatorOptions explicitZero;
  explicitZero.offset = 0x10;
  explicitZero.modules = {{KR60ModuleType::kLOAD, 0}};
  KR60SimulatorOptions noOffsetAtAll;
  noOffsetAtAll.modules = {kFiu};
  KR60SimulatorOptions wideOffset = noOffsetAtAll;
  wideOffset.offset = 0x800;
  KR60SimulatorOptions absentFault = FourModules("kr60-never-opened");
  absentFault.moduleFaults[{KR60ModuleType::kRSIM, 1}] = {KR60FaultMode::kSilent};
  KR60SimulatorOptions badTarget = FourModules("x");
  badTarget.target = "nosuchdriver:x";
  const Case cases[] = {
      {"missing.csv", "", {}, "missing.csv"},
      {"kr40.csv", test::PinFileText::KR40().Build(), {}, "kr40.csv"},
      {"nooffset.csv", noOffset.Build(), {}, "OffsetLoadAddress"},
      {"zerofiu.csv", zeroFiu.Build(), {}, "FIULoadAddress"},
      {"explicit address 0", "", explicitZero, "address 0"},
      {"no offset", "", noOffsetAtAll, "offset"},
      {"offset beyond 11 bits", "", wideOffset, "11 bits"},
      {"fault for an absent module", "", absentFault, "RSIM"},
      {"unknown driver", "", badTarget, "nosuchdriver"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    KR60SimulatorOptions options = c.options;
    if (std::string(c.name).ends_with(".csv"))
      options.pinFile = c.content.empty() ? dir.File(c.name) : dir.Write(c.name, c.content);
    std::string error;
    EXPECT_EQ(KR60Simulator::Start(options, &error), nullptr);
    EXPECT_NE(error.find(c.mentions), std::string::npos) << error;
  }
}

// ---------------------------------------------------------------------------
// The driver "sim"

TEST(KR60SimDriver, ChannelsReachTheDefinedBenchWhichKeepsItsRelays) {
  ASSERT_TRUE(RegisterKR60SimDriver());
  ASSERT_TRUE(RegisterKR60SimDriver());
  CanAccess::UnregisterDriver("sim");
  ASSERT_TRUE(RegisterKR60SimDriver());
  const std::string name = UniqueName("drv");
  KR60SimulatorOptions options = FourModules("ignored");
  ASSERT_TRUE(DefineKR60SimBench(name, options));
  EXPECT_EQ(FindKR60SimBench(name), nullptr);  // starts with its first channel
  {
    Host host("sim:" + name);
    std::shared_ptr<KR60Simulator> sim = FindKR60SimBench(name);
    ASSERT_NE(sim, nullptr);
    Exchange(*sim, host, {kFiuLow, Commit(kFiuAll)}, {Accepted(kFiuLow, 3), Accepted(Commit(kFiuAll), 3)});
  }
  // A real bench keeps its relays when the host lets go of the bus.
  Host again("sim:" + name);
  std::shared_ptr<KR60Simulator> sim = FindKR60SimBench(name);
  ASSERT_NE(sim, nullptr);
  EXPECT_EQ(sim->RelayVector(kFiu), 0xFFFFFFFFFFFFFFFCu);
  Exchange(*sim, again, {Reset(kFiuAll)}, {Accepted(Reset(kFiuAll), 3)});
  RemoveKR60SimBench(name);
  EXPECT_EQ(FindKR60SimBench(name), nullptr);
  EXPECT_FALSE(DefineKR60SimBench("two words", options));
  EXPECT_FALSE(DefineKR60SimBench(std::string(61, 'x'), options));
}

TEST(KR60SimDriver, APinFilePathIsABench) {
  ASSERT_TRUE(RegisterKR60SimDriver());
  test::TempDir dir;
  const std::string path = dir.Write("bench.csv", BenchText().Build());
  CanHandle handle = 0;
  EXPECT_EQ(CanAccess::RegisterInterfaceTarget("sim:" + dir.File("none.csv"), &handle),
            CanResult::kNoChannel);
  EXPECT_NE(CanAccess::LastErrorText().find("none.csv"), std::string::npos);
  {
    Host host("sim:" + path);
    std::shared_ptr<KR60Simulator> sim = FindKR60SimBench(path);
    ASSERT_NE(sim, nullptr);
    Exchange(*sim, host, {Reset(0x00402000)}, {Accepted(Reset(0x00402000), 0x0F1)});
  }
  RemoveAllKR60SimBenches();
  EXPECT_EQ(FindKR60SimBench(path), nullptr);
}

// ---------------------------------------------------------------------------
// The program on the hub's TCP bus

TEST(FaultboxSimProgram, KR60AnswersOnTheHubAndPrintsRelayChanges) {
  test::TempDir dir;
  const std::string pinFile = dir.Write("bench.csv", BenchText().Build());
  test::BackgroundProcess hub({FAULTBOX_CANHUB_PATH, "--port", "0"});
  const std::string port = hub.ReadLine();
  ASSERT_FALSE(port.empty());
  const std::string bus = "127.0.0.1:" + port + "/" + UniqueName("kr60");
  test::BackgroundProcess sim({FAULTBOX_SIM_PATH, "kr60", "--pin-file", pinFile, "--hub", bus, "--fault",
                               "refuse", "--fault-module", "load:0_1_2"});
  ASSERT_EQ(sim.ReadLine(), "tcp:" + bus);

  Host host("tcp:" + bus);
  const Frame fiuLow = RelayLow(0x004020F1, 0xFFFFFFFC);
  host.Send(fiuLow);
  EXPECT_EQ(host.Receive(1), std::vector<Frame>{Accepted(fiuLow, 0x0F1)});
  host.Send(Commit(kFiuAll));
  EXPECT_EQ(host.Receive(1), std::vector<Frame>{Accepted(Commit(kFiuAll), 0x0F1)});
  EXPECT_EQ(sim.ReadLine(), "commit FIU 0x0F1: relays 0xFFFFFFFFFFFFFFFC, on: 0 1");
  // Only the named module refuses.
  host.Send(Reset(kLoadAll));
  EXPECT_EQ(host.Receive(2),
            (std::vector<Frame>{Refused(Reset(kLoadAll), 0x012), Accepted(Reset(kLoadAll), 0x12A)}));
  EXPECT_EQ(sim.ReadLine(), "reset LOAD 0x12A: all relays off");
  EXPECT_EQ(sim.Stop(SIGTERM), 0);
}

TEST(FaultboxSimProgram, KR60RefusesWhatItCannotStart) {
  test::TempDir dir;
  const test::ProcessResult noFile =
      test::RunProcess({FAULTBOX_SIM_PATH, "kr60", "--pin-file", dir.File("none.csv"), "--bus", "virtual:x"});
  EXPECT_EQ(noFile.exitCode, 1);
  EXPECT_NE(noFile.err.find("none.csv"), std::string::npos) << noFile.err;
  const std::string pinFile = dir.Write("bench.csv", BenchText().Build());
  const test::ProcessResult badModule = test::RunProcess(
      {FAULTBOX_SIM_PATH, "kr60", "--pin-file", pinFile, "--bus", "virtual:x", "--fault-module", "dsp:12"});
  EXPECT_EQ(badModule.exitCode, 1);
  EXPECT_NE(badModule.err.find("dsp:12"), std::string::npos) << badModule.err;
  EXPECT_EQ(test::RunProcess({FAULTBOX_SIM_PATH, "kr60"}).exitCode, 2);
}

}  // namespace
}  // namespace faultbox::sim
