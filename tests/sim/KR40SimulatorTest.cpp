// The simulated KR40/KR80 bench driven with raw bytes through its
// pseudo-terminal, as a serial port would, and the faultbox-sim program.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <termios.h>
#include <unistd.h>

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "config/PinFileText.h"
#include "kr40/KR40Simulator.h"
#include "support/BackgroundProcess.h"
#include "support/RunProcess.h"
#include "TestPaths.h"

namespace faultbox::sim {
namespace {

using Bytes = std::vector<std::uint8_t>;
using namespace std::chrono_literals;

// Generous: only a broken simulator ever reaches it.
constexpr auto kLimit = 10s;

// The port side of the pseudo-terminal, opened raw as the serial layer does.
class Port {
 public:
  explicit Port(const std::string& path) : fd_(::open(path.c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK)) {
    termios tio{};
    if (fd_ >= 0 && ::tcgetattr(fd_, &tio) == 0) {
      ::cfmakeraw(&tio);
      ::tcsetattr(fd_, TCSANOW, &tio);
    }
  }
  ~Port() {
    if (fd_ >= 0) ::close(fd_);
  }
  bool IsOpen() const { return fd_ >= 0; }
  void Write(const Bytes& bytes) const {
    ASSERT_EQ(::write(fd_, bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
  }
  // Waits for `count` bytes (or the limit) and returns what came.
  Bytes Read(std::size_t count) const {
    Bytes out;
    const auto end = std::chrono::steady_clock::now() + kLimit;
    while (out.size() < count && std::chrono::steady_clock::now() < end) {
      pollfd p{fd_, POLLIN, 0};
      if (::poll(&p, 1, 100) <= 0) continue;
      std::uint8_t buffer[256];
      const ssize_t n = ::read(fd_, buffer, sizeof buffer);
      if (n > 0) out.insert(out.end(), buffer, buffer + n);
    }
    return out;
  }
  // What the port holds right now.
  Bytes Pending() const {
    Bytes out;
    std::uint8_t buffer[256];
    ssize_t n;
    while ((n = ::read(fd_, buffer, sizeof buffer)) > 0) out.insert(out.end(), buffer, buffer + n);
    return out;
  }

 private:
  int fd_;
};

std::unique_ptr<KR40Simulator> StartOrFail(const KR40SimulatorOptions& options) {
  return StartBench<KR40Simulator>(options, [](const std::string& error) { ADD_FAILURE() << error; });
}

KR40SimulatorOptions WithModules(KR40Protocol protocol, std::set<std::uint32_t> modules) {
  KR40SimulatorOptions o;
  o.protocol = protocol;
  o.modules = std::move(modules);
  return o;
}

// Sends one step and checks the answers that came back and nothing more.
void Exchange(KR40Simulator& sim, const Port& port, const Bytes& bytes, const Bytes& answers) {
  const std::size_t before = sim.Counters().bytesProcessed;
  port.Write(bytes);
  ASSERT_TRUE(sim.WaitForProcessed(before + bytes.size(), kLimit));
  EXPECT_EQ(port.Read(answers.size()), answers);
  EXPECT_EQ(port.Pending(), Bytes{});
}

struct Step {
  Bytes send;
  Bytes answers;
  std::optional<KR40RelayStates> relays = std::nullopt;  // checked after the step when given
};

struct Scenario {
  const char* name;
  KR40Protocol protocol;
  std::vector<Step> steps;
  KR40RelayStates relays;
};

class KR40Scenario : public testing::TestWithParam<Scenario> {};

TEST_P(KR40Scenario, AnswersAndRelays) {
  const Scenario& s = GetParam();
  auto sim = StartOrFail(WithModules(s.protocol, {5, 6}));
  ASSERT_NE(sim, nullptr);
  Port port(sim->PortPath());
  ASSERT_TRUE(port.IsOpen());
  for (const Step& step : s.steps) {
    Exchange(*sim, port, step.send, step.answers);
    if (step.relays) {
      EXPECT_EQ(sim->RelayStates(), *step.relays);
    }
  }
  EXPECT_EQ(sim->RelayStates(), s.relays);
}

const Scenario kScenarios[] = {
    {"AActivate",
     KR40Protocol::kA,
     {{{0x40, 0x85}, {0xC5}}, {{0x62, 0x83}, {0xE5}}, {{0x51}, {}}},
     {{5, {{3, 2}}}}},
    // Relays switch together at the execute byte, not one by one.
    {"AExecuteSwitches",
     KR40Protocol::kA,
     {{{0x40, 0x85, 0x62, 0x83}, {0xC5, 0xE5}, KR40RelayStates{}}, {{0x51}, {}}},
     {{5, {{3, 2}}}}},
    {"BExecuteSwitches",
     KR40Protocol::kB,
     {{{0x05, 0xD1}, {}, KR40RelayStates{}}, {{0x9F}, {}}},
     {{5, {{3, 2}}}}},
    {"ADeactivate",
     KR40Protocol::kA,
     {{{0x40, 0x85, 0x62, 0x83, 0x51}, {0xC5, 0xE5}}, {{0x40, 0x85, 0x60, 0x83, 0x51}, {0xC5, 0xE3}}},
     {}},
    // Two modules, the top state 31 and relay 10; 0x7F + 0x8A wraps to 0x09.
    {"ATwoModules",
     KR40Protocol::kA,
     {{{0x40, 0x85, 0x62, 0x83, 0x61, 0x84, 0x40, 0x86, 0x7F, 0x8A, 0x51}, {0xC5, 0xE5, 0xE5, 0xC6, 0x09}}},
     {{5, {{3, 2}, {4, 1}}}, {6, {{10, 31}}}}},
    // A later byte for the same relay wins; relays 0 and 11 are acknowledged
    // but switch nothing.
    {"ARelayOutsideRange",
     KR40Protocol::kA,
     {{{0x40, 0x85, 0x61, 0x80, 0x61, 0x8B, 0x61, 0x83, 0x62, 0x83, 0x51}, {0xC5, 0xE1, 0xEC, 0xE4, 0xE5}}},
     {{5, {{3, 2}}}}},
    // Bytes that belong nowhere (a relay byte with no module selected, a state
    // byte before any selection) get no answer, and the execute that ends the
    // sequence keeps them out of the next sums.
    {"AStrayBytes",
     KR40Protocol::kA,
     {{{0x83, 0x62, 0x51}, {}}, {{0x40, 0x85, 0x62, 0x83, 0x51}, {0xC5, 0xE5}}},
     {{5, {{3, 2}}}}},
    {"BActivate", KR40Protocol::kB, {{{0x05, 0xD1, 0x9F}, {}}}, {{5, {{3, 2}}}}},
    {"BDeactivate", KR40Protocol::kB, {{{0x05, 0xD1, 0x9F}, {}}, {{0x05, 0x91, 0x9F}, {}}}, {}},
    // States 1 and 3, relay 10 (10 + 14 = 0x18), and the relay numbers 0 and
    // 11 that protocol B cannot carry.
    {"BStatesAndRange",
     KR40Protocol::kB,
     {{{0x05, 0xAF, 0xF8, 0x8E, 0xD9, 0x06, 0xF1, 0x9F}, {}}},
     {{5, {{1, 1}, {10, 3}}}, {6, {{3, 3}}}}},
};

INSTANTIATE_TEST_SUITE_P(Bytes, KR40Scenario, testing::ValuesIn(kScenarios),
                         [](const auto& info) { return std::string(info.param.name); });

// The reset a host sends: the reset byte, then a selection of every address.
Bytes ResetBytes(KR40Protocol protocol) {
  Bytes out{protocol == KR40Protocol::kA ? std::uint8_t{0x49} : std::uint8_t{0x9E}};
  for (std::uint8_t a = 0; a < 128; ++a) {
    if (protocol == KR40Protocol::kA) {
      out.push_back(0x40);
      out.push_back(a | 0x80);
    } else {
      out.push_back(a);
    }
  }
  return out;
}

TEST(KR40Simulator, ResetSwitchesEverythingOffAndPresentModulesAnswer) {
  struct Case {
    KR40Protocol protocol;
    std::set<std::uint32_t> modules;
    Bytes answers;
  };
  // Address 0 of a bench where every address answers sums the reset byte in
  // as well: it is part of what the host sent since its previous wait.
  Bytes everyAddress{0x09};
  for (int a = 1; a < 128; ++a) everyAddress.push_back(static_cast<std::uint8_t>(0x40 + (a | 0x80)));
  const Case cases[] = {
      {KR40Protocol::kA, {5, 0x7F}, {0xC5, 0x3F}},
      {KR40Protocol::kA, {}, everyAddress},
      {KR40Protocol::kB, {5}, {}},
  };
  for (const Case& c : cases) {
    auto sim = StartOrFail(WithModules(c.protocol, c.modules));
    ASSERT_NE(sim, nullptr);
    Port port(sim->PortPath());
    // One relay switched and one only staged: the reset drops both.
    const Bytes before = c.protocol == KR40Protocol::kA
                             ? Bytes{0x40, 0x85, 0x62, 0x83, 0x51, 0x40, 0x85, 0x61, 0x84}
                             : Bytes{0x05, 0xD1, 0x9F, 0x05, 0xB2};
    port.Write(before);
    ASSERT_TRUE(sim->WaitForProcessed(before.size(), kLimit));
    ASSERT_EQ(sim->RelayState(5, 3), 2u);
    port.Read(c.protocol == KR40Protocol::kA ? 4 : 0);

    const Bytes reset = ResetBytes(c.protocol);
    Exchange(*sim, port, reset, c.answers);
    EXPECT_EQ(sim->Counters().resets, 1u);
    // The staged relay 4 must not come back with the next execute.
    port.Write({c.protocol == KR40Protocol::kA ? std::uint8_t{0x51} : std::uint8_t{0x9F}});
    ASSERT_TRUE(sim->WaitForExecutes(2, kLimit));
    EXPECT_EQ(sim->RelayStates(), KR40RelayStates{});
  }
}

TEST(KR40Simulator, OnlyModulesOfThePinFileAnswer) {
  test::TempDir dir;
  test::PinFileText text = test::PinFileText::KR40();
  text.pins = {"P1;ECU;1,2;10;1;S1", "P2;ECU;1;0x11;3;S2", "P3;ECU;-;20;3;not switched"};
  KR40SimulatorOptions options;
  options.pinFile = dir.Write("bench.csv", text.Build());
  auto sim = StartOrFail(options);
  ASSERT_NE(sim, nullptr);
  EXPECT_TRUE(sim->HasModule(0x10));
  EXPECT_TRUE(sim->HasModule(0x11));
  EXPECT_FALSE(sim->HasModule(0x20));  // its only line is not used
  Port port(sim->PortPath());
  // Module 0x20 stays silent and switches nothing, as absent hardware does.
  Exchange(*sim, port, {0x40, 0xA0}, {});
  Exchange(*sim, port, {0x62, 0x83}, {});
  Exchange(*sim, port, {0x40, 0x91, 0x61, 0x83, 0x51}, {0xD1, 0xE4});
  EXPECT_EQ(sim->RelayStates(), (KR40RelayStates{{0x11, {{3, 1}}}}));
  EXPECT_EQ(sim->SentBytes(), (Bytes{0xD1, 0xE4}));
}

TEST(KR40Simulator, StartRefusesPinFilesItCannotServe) {
  test::TempDir dir;
  struct Case {
    const char* name;
    std::string content;  // empty: no file at all
    KR40Protocol protocol;
  };
  test::PinFileText kr60 = test::PinFileText::KR60();
  test::PinFileText badLine = test::PinFileText::KR40();
  badLine.pins = {"P1;ECU;1;80;1;S1"};  // module beyond 0x7F
  const Case cases[] = {
      {"missing.csv", "", KR40Protocol::kA},
      {"kr80.csv", test::PinFileText::KR40("KR80").Build(), KR40Protocol::kA},
      {"kr40.csv", test::PinFileText::KR40("KR40").Build(), KR40Protocol::kB},
      {"kr60.csv", kr60.Build(), KR40Protocol::kA},
      {"bad.csv", badLine.Build(), KR40Protocol::kA},
  };
  for (const Case& c : cases) {
    KR40SimulatorOptions options;
    options.protocol = c.protocol;
    options.pinFile = c.content.empty() ? dir.File(c.name) : dir.Write(c.name, c.content);
    std::string error;
    EXPECT_EQ(KR40Simulator::Start(options, &error), nullptr) << c.name;
    EXPECT_NE(error.find(c.name), std::string::npos) << error;
  }
  KR40SimulatorOptions outside;
  outside.modules = {128};
  EXPECT_EQ(KR40Simulator::Start(outside), nullptr);
}

TEST(KR40Simulator, FaultModes) {
  struct Case {
    const char* name;
    KR40Fault fault;
    Bytes answers;
    bool timing = false;
  };
  const Case cases[] = {
      {"silent", {KR40FaultMode::kSilent}, {}},
      {"wrong checksum", {KR40FaultMode::kWrongChecksum}, {0x3A, 0x1A}},
      {"wrong after one", {KR40FaultMode::kWrongChecksum, 200ms, 1}, {0xC5, 0x1A}},
      {"late", {KR40FaultMode::kLate, 20ms}, {0xC5, 0xE5}},
      {"line timing", {}, {0xC5, 0xE5}, true},
      {"late with line timing", {KR40FaultMode::kLate, 5ms}, {0xC5, 0xE5}, true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    KR40SimulatorOptions options = WithModules(KR40Protocol::kA, {5});
    options.timing = c.timing;
    auto sim = StartOrFail(options);
    ASSERT_NE(sim, nullptr);
    sim->SetFaultMode(c.fault);
    Port port(sim->PortPath());
    port.Write({0x40, 0x85, 0x62, 0x83, 0x51});
    ASSERT_TRUE(sim->WaitForProcessed(5, kLimit));
    EXPECT_EQ(port.Read(c.answers.size()), c.answers);
    // Whatever happens to the answers, the relays switch.
    EXPECT_EQ(sim->RelayState(5, 3), 2u);
  }
}

TEST(KR40Simulator, LateAnswerIsHeldBackAndStopDoesNotWaitForIt) {
  KR40SimulatorOptions options = WithModules(KR40Protocol::kA, {5});
  options.fault = {KR40FaultMode::kLate, std::chrono::hours(1)};
  auto sim = StartOrFail(options);
  ASSERT_NE(sim, nullptr);
  Port port(sim->PortPath());
  port.Write({0x40, 0x85});
  ASSERT_TRUE(sim->WaitForProcessed(2, kLimit));
  EXPECT_EQ(port.Pending(), Bytes{});
  EXPECT_EQ(sim->Counters().answers, 0u);
  // Switching the fault off does not recall the answer already on its way,
  // and the line sends in order: the next answer queues behind it.
  sim->SetFaultMode(KR40FaultMode::kNone);
  port.Write({0x40, 0x85});
  ASSERT_TRUE(sim->WaitForProcessed(4, kLimit));
  EXPECT_EQ(port.Pending(), Bytes{});
  sim->Stop();
  sim->Stop();
}

// ---------------------------------------------------------------------------
// The program

TEST(FaultboxSimProgram, PrintsThePortAndTheRelaysItSwitches) {
  test::TempDir dir;
  test::PinFileText text = test::PinFileText::KR40("KR080");
  text.pins = {"P1;ECU;1,2,3;20;3;S1"};
  const std::string pinFile = dir.Write("kr80.csv", text.Build());
  for (int signal : {SIGTERM, SIGINT}) {
    test::BackgroundProcess sim({FAULTBOX_SIM_PATH, "kr80", "--pin-file", pinFile, "--verbose"});
    const std::string path = sim.ReadLine();
    ASSERT_EQ(path.rfind("/dev/", 0), 0u) << path;
    Port port(path);
    ASSERT_TRUE(port.IsOpen());
    port.Write({0x20, 0xD1, 0x21, 0xD1, 0x9F, 0x9E});
    EXPECT_EQ(sim.ReadLine(), "execute 1: module 0x20 relays 3=2");
    EXPECT_EQ(sim.ReadLine(), "reset 1: all relays off");
    EXPECT_EQ(sim.Stop(signal), 0);
  }
}

TEST(FaultboxSimProgram, RefusesAPinFileOfTheOtherProtocol) {
  test::TempDir dir;
  const std::string pinFile = dir.Write("kr40.csv", test::PinFileText::KR40().Build());
  const test::ProcessResult r = test::RunProcess({FAULTBOX_SIM_PATH, "kr80", "--pin-file", pinFile});
  EXPECT_EQ(r.exitCode, 1);
  EXPECT_EQ(r.out, "");
  EXPECT_NE(r.err.find("kr40.csv"), std::string::npos) << r.err;
  EXPECT_EQ(test::RunProcess({FAULTBOX_SIM_PATH, "kr40", "--fault", "sometimes"}).exitCode, 2);
}

}  // namespace
}  // namespace faultbox::sim
