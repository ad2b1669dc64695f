// `faultbox activate` and `faultbox shell` through the real program on the
// built-in simulated benches of both platforms: the relays the bench shows
// after activation and after deactivation, the trace of what went over the
// bus or line, and the refusals that must not leave a relay switched.
#include <gtest/gtest.h>
#include <signal.h>

#include <filesystem>
#include <regex>
#include <set>
#include <sstream>
#include <string>
#include <string_view>

#include "support/BackgroundProcess.h"
#include "support/RunProcess.h"
#include "TestPaths.h"

namespace faultbox {
namespace {

using test::ProcessResult;
using test::ReadText;
using test::RunFaultbox;
using test::TempDir;

// One sample bench, the pattern built on it, and what the simulated bench
// must show while the pattern is activated.
struct BenchCase {
  const char* name;
  std::vector<const char*> files;  // samples of data/, the pin file first
  const char* document;
  // ECU, pin, failure class, relay vector.
  std::vector<std::array<const char*, 4>> pins;
  std::vector<std::string> relaysOn;
  // Every line the trace holds (a serial trace also has "--" notes).
  const char* traceLine;
  // Lines the trace must hold: a reset, the activation's last command, an answer.
  std::vector<const char*> traced;
};

void PrintTo(const BenchCase& c, std::ostream* os) {
  *os << c.name;
}

const BenchCase kBenches[] = {
    // Class 1 opens the line: load relay 2 of the pin's first load channel.
    {"KR60",
     {"kr60_bench.csv", "kr60_additional.csv"},
     "chassis.fsa",
     {{"ECM", "A12", "1", "0"}, {"ABS_ESP", "1", "1", "0"}},
     {"LOAD 0x011: channel 1 relay 2 on", "LOAD 0x013: channel 1 relay 2 on"},
     R"(\(\d+\.\d{6}\) \S+ [0-9A-F]{8}#([0-9A-F]{2}){0,8})",
     // Offset 0x10: a reset to every LOAD module, a relay frame to LOAD 0x011,
     // the commit to every LOAD module that loaded relays, 0x011's answer to it.
     {"00401000#81", "00401011#8204FE", "00401000#820500", "00411011#4205"}},
    // Protocol A: the state of a relay is its pin's PinConfig as bits.
    {"KR40",
     {"kr40_bench.csv"},
     "body.fss",
     {{"BCM", "X1.1", "2", "1"}, {"DCU_FL", "X1.3", "2", "0"}},
     {"FIU 0x10: relay 1 (state 3) on", "FIU 0x11: relay 2 (state 2) on"},
     R"(\(\d+\.\d{6}\) COM1 ((tx|rx) [0-9A-F]{2}|-- .*))",
     // The reset, the execute, module 0x10's answer to its selection.
     {"COM1 tx 49", "COM1 tx 51", "COM1 rx D0"}},
    // Protocol B: the state is the failure class; nothing is answered.
    {"KR80",
     {"kr80_bench.csv"},
     "powertrain.fss",
     {{"ECM", "K12", "2", "0"}, {"TCU", "7", "3", "0"}},
     {"FIU 0x20: relay 1 (state 2) on", "FIU 0x21: relay 1 (state 3) on"},
     R"(\(\d+\.\d{6}\) COM1 (tx [0-9A-F]{2}|-- .*))",
     // The reset, the execute, the selection of module 0x21.
     {"COM1 tx 9E", "COM1 tx 9F", "COM1 tx 21"}},
};

class HardwareCli : public ::testing::Test {
 protected:
  void SetUp() override {
    // Channel and port tables that lead nowhere: a run that does not ask for
    // the simulator must never reach a port or bus of the machine. A short
    // collection wait keeps the KR60 resets quick; the serial answer waits
    // (100 ms rather than 20) give the simulator's thread time on a busy
    // machine, at the price of a slow KR40 reset (125 silent addresses).
    settings_ = dir_.Write("faultbox.ini", std::string(kTimeouts) + kNowhere);
  }

  static constexpr const char* kTimeouts =
      "[Components\\Faultbox.Component]\nTimeout=5000\n"
      "[Components\\Faultbox.Component\\Hardware]\nResetCollectionWait=300\n";
  static constexpr const char* kNowhere =
      "[Components\\Faultbox.Component\\Hardware\\CAN]\n*,*,*=socketcan:nowhere0\n"
      "[Components\\Faultbox.Component\\Hardware\\SerialPorts]\nCOM1=/nonexistent/tty\n";

  ProcessResult Run(const std::vector<std::string>& args, const std::string& input = {}) {
    return RunFaultbox(args, input,
                       {"NORVIK_ROOT=" FAULTBOX_BINARY_DIR "/data/norvik", "FAULTBOX_CONFIG=" + settings_});
  }
  void Ok(const std::vector<std::string>& args) {
    const ProcessResult r = Run(args);
    ASSERT_EQ(r.exitCode, 0) << args[0] << " " << args[1] << "\n" << r.out << r.err;
  }

  // The bench's document with the pattern "Test" holding the case's pins.
  std::string MakeDocument(const BenchCase& c) {
    for (const char* file : c.files)
      std::filesystem::copy_file(std::string(FAULTBOX_SOURCE_DIR "/data/") + file, dir_.File(file));
    const std::string doc = dir_.File(c.document);
    Ok({"doc", "new", "--pin-file", dir_.File(c.files.front()), doc});
    Ok({"pattern", "create", doc, "Test"});
    for (const auto& pin : c.pins) {
      Ok({"pattern", "add-pins", doc, "Test", "--pin", pin[0], pin[1]});
      Ok({"pattern", "set-class", doc, "Test", "--pin", pin[0], pin[1], pin[2], pin[3]});
    }
    return doc;
  }

  // Every answer in a KR60 trace (direction 01) comes after a request
  // (direction 00) to its module or to every module of its type.
  static void ExpectRequestsBeforeAnswers(const std::string& trace) {
    std::istringstream lines(trace);
    std::set<std::uint32_t> asked;
    std::string line;
    while (std::getline(lines, line)) {
      const std::size_t at = line.find(' ', line.find(' ') + 1) + 1;
      const std::uint32_t id = static_cast<std::uint32_t>(std::stoul(line.substr(at, 8), nullptr, 16));
      const std::uint32_t module = id & 0xFFFF;
      if (((id >> 16) & 3) == 0)
        asked.insert(module);
      else
        EXPECT_TRUE(asked.count(module) != 0 || asked.count(module & 0xF000) != 0) << line << "\n" << trace;
    }
  }

  // Checks the trace's form and that it holds the case's lines.
  static void ExpectTrace(const BenchCase& c, const std::string& path) {
    std::istringstream lines(ReadText(path));
    const std::regex form(c.traceLine);
    std::string line, all;
    int count = 0;
    while (std::getline(lines, line)) {
      EXPECT_TRUE(std::regex_match(line, form)) << line;
      all += line + "\n";
      ++count;
    }
    EXPECT_GT(count, 4);
    for (const char* wanted : c.traced)
      EXPECT_NE(all.find(wanted), std::string::npos) << wanted << "\n" << all;
    // The activation's relay frame goes out once; the simulated bench's own
    // side of the bus must not write it a second time.
    if (std::string_view(c.name) == "KR60") {
      const std::string once = " 00401011#8204FEFFFFFF7FFF\n";
      EXPECT_EQ(all.find(once), all.rfind(once)) << once << "\n" << all;
      ExpectRequestsBeforeAnswers(all);
    }
  }

  TempDir dir_;
  std::string settings_;
};

class HardwareCliTest : public HardwareCli, public ::testing::WithParamInterface<BenchCase> {};

// The relay lines printed under "relays WHEN:" (or on that line itself).
std::vector<std::string> RelaysShown(const std::string& out, const std::string& when) {
  const std::string heading = "relays " + when + ":";
  const std::size_t at = out.find(heading);
  if (at == std::string::npos) return {"(no '" + heading + "')"};
  std::istringstream rest(out.substr(at + heading.size()));
  std::string line;
  std::getline(rest, line);
  if (!line.empty()) return {line.substr(1)};
  std::vector<std::string> shown;
  while (std::getline(rest, line) && line.rfind("  ", 0) == 0) shown.push_back(line.substr(2));
  return shown;
}

const std::vector<std::string> kAllOff = {"all relays off"};

TEST_P(HardwareCliTest, ActivateHoldsAndSwitchesBack) {
  const BenchCase& c = GetParam();
  const std::string doc = MakeDocument(c);
  const std::string trace = dir_.File("trace.log");
  const ProcessResult r =
      Run({"activate", doc, "Test", "--hold", "0", "--hardware", "sim", "--trace", trace});
  ASSERT_EQ(r.exitCode, 0) << r.out << r.err;
  EXPECT_EQ(r.out.rfind("hardware: simulated ", 0), 0u) << r.out;
  EXPECT_EQ(RelaysShown(r.out, "after activation"), c.relaysOn) << r.out;
  EXPECT_EQ(RelaysShown(r.out, "after deactivation"), kAllOff) << r.out;
  EXPECT_NE(r.out.find("holding for 0 s"), std::string::npos) << r.out;
  EXPECT_NE(r.out.find("\ndisconnected\n"), std::string::npos) << r.out;
  ExpectTrace(c, trace);
}

TEST_P(HardwareCliTest, ShellKeepsThePatternActivatedBetweenCommands) {
  const BenchCase& c = GetParam();
  const std::string doc = MakeDocument(c);
  const std::string trace = dir_.File("trace.log");
  const ProcessResult r = Run({"shell", doc, "--hardware", "sim", "--trace", trace},
                              "connect\n"
                              "activate Test\n"
                              "status\n"
                              "relays\n"
                              "deactivate Test\n"
                              "relays\n"
                              "disconnect\n");
  ASSERT_EQ(r.exitCode, 0) << r.out << r.err;
  EXPECT_EQ(r.out.rfind("hardware: simulated ", 0), 0u) << r.out;
  // Each command is echoed, as the input is no terminal.
  EXPECT_NE(r.out.find("> activate Test\nactivated Test: "), std::string::npos) << r.out;
  EXPECT_EQ(RelaysShown(r.out, "after activation"), c.relaysOn) << r.out;
  const std::string status = "activated: Test: " + std::string(c.pins[0][0]) + " " + c.pins[0][1];
  EXPECT_NE(r.out.find(status), std::string::npos) << r.out;
  // `relays` between the two shows the same as after the activation.
  EXPECT_EQ(RelaysShown(r.out.substr(r.out.find("> relays")), "now"), c.relaysOn) << r.out;
  EXPECT_EQ(RelaysShown(r.out, "after deactivation"), kAllOff) << r.out;
  ExpectTrace(c, trace);
}

INSTANTIATE_TEST_SUITE_P(Platforms, HardwareCliTest, ::testing::ValuesIn(kBenches),
                         [](const auto& info) { return std::string(info.param.name); });

// The benches whose resets are quick: KR60 and KR80 (whose board answers nothing).
class QuickBenchTest : public HardwareCliTest {};

// The end of the input while a pattern is activated: the session switches it
// off and disconnects by itself.
TEST_P(QuickBenchTest, EndOfInputSwitchesOffWhatIsActivated) {
  const BenchCase& c = GetParam();
  const std::string doc = MakeDocument(c);
  const ProcessResult r = Run({"shell", doc, "--hardware", "sim"}, "connect\nactivate Test\n");
  ASSERT_EQ(r.exitCode, 0) << r.out << r.err;
  EXPECT_EQ(RelaysShown(r.out, "after activation"), c.relaysOn) << r.out;
  const std::size_t deactivated = r.out.find("deactivated Test");
  ASSERT_NE(deactivated, std::string::npos) << r.out;
  EXPECT_EQ(RelaysShown(r.out, "after deactivation"), kAllOff) << r.out;
  EXPECT_NE(r.out.find("disconnected", deactivated), std::string::npos) << r.out;
}

INSTANTIATE_TEST_SUITE_P(Platforms, QuickBenchTest, ::testing::Values(kBenches[0], kBenches[2]),
                         [](const auto& info) { return std::string(info.param.name); });

// On the KR80 bench, which answers nothing: its resets are quick.
const BenchCase& kQuickBench = kBenches[2];

class HardwareCliRefusals : public HardwareCli {
 protected:
  std::string Document() { return MakeDocument(kQuickBench); }
};

// Each bad line is refused with its message, the lines after it still run,
// and the session ends with status 1.
TEST_F(HardwareCliRefusals, BadShellCommandsAreReportedAndTheSessionGoesOn) {
  const std::string doc = Document();
  const struct {
    const char* line;
    const char* message;
  } cases[] = {
      {"frobnicate", "error 930"},
      {"activate", "error 931"},
      {"activate Test --pin ECM", "error 931"},
      {"deactivate Test --pin ECM K12", "error 931"},
      {"sleep soon", "error 931"},
      {"set-class Test --pin ECM K12 two", "error 931"},
      {"config Test --pin ECM K12 5 1", "error 931"},
      {"activate \"Test", "error 931"},
      {"activate Nothing", "error 920"},
      {"activate Test --pin ECM K13", "error 922"},
      {"relays", ""},  // the simulator shows its relays: no refusal
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.line);
    const ProcessResult r = Run({"shell", doc, "--hardware", "sim"}, std::string(c.line) + "\nstatus\n");
    if (*c.message == '\0') {
      EXPECT_EQ(r.exitCode, 0) << r.out << r.err;
      continue;
    }
    EXPECT_EQ(r.exitCode, 1) << r.out << r.err;
    EXPECT_NE(r.err.find(c.message), std::string::npos) << r.err;
    EXPECT_NE(r.out.find("> status\ndocument: "), std::string::npos) << r.out;
  }
}

TEST_F(HardwareCliRefusals, ShellChangesAreSavedOnlyWhenAsked) {
  const std::string doc = Document();
  // config switches entry 0 of TCU 7 on: with entry 2 of its class 3 the
  // interlock takes relay vector 1.
  const ProcessResult unsaved = Run({"shell", doc, "--hardware", "sim"}, "config Test --pin TCU 7 0 1\n");
  EXPECT_EQ(unsaved.exitCode, 0) << unsaved.out << unsaved.err;
  EXPECT_NE(unsaved.out.find("TCU 7: PinConfig 12122, failure class 3, relay vector 1"), std::string::npos)
      << unsaved.out;
  EXPECT_NE(unsaved.err.find("warning 934"), std::string::npos) << unsaved.err;
  EXPECT_NE(Run({"doc", "show", doc}).out.find("TCU 7: PinConfig 02122, failure class 3, relay vector 0"),
            std::string::npos);

  const ProcessResult saved =
      Run({"shell", doc, "--hardware", "sim"}, "set-class Test --pin ECM K12 3 1\nsave\n");
  EXPECT_EQ(saved.exitCode, 0) << saved.out << saved.err;
  EXPECT_NE(saved.out.find("saved " + doc), std::string::npos) << saved.out;
  EXPECT_EQ(saved.err.find("warning 934"), std::string::npos) << saved.err;
  EXPECT_NE(Run({"doc", "show", doc}).out.find("ECM K12: PinConfig 12122, failure class 3, relay vector 1"),
            std::string::npos);
}

TEST_F(HardwareCliRefusals, AMissingPatternIsRefusedBeforeTheHardwareIsTouched) {
  const std::string doc = Document();
  const struct {
    std::vector<std::string> args;
    const char* message;
  } cases[] = {
      {{"activate", doc, "No such pattern", "--hold", "0"},
       "error 920: There is no failure pattern No such pattern"},
      {{"activate", doc, "Test", "--pin", "ECM", "K13", "--hold", "0"}, "error 922"},
      {{"activate", dir_.File("missing.fss"), "Test", "--hold", "0"}, "error 178"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.args[2]);
    const ProcessResult r = Run(c.args);
    EXPECT_EQ(r.exitCode, 1) << r.out << r.err;
    EXPECT_NE(r.err.find(c.message), std::string::npos) << r.err;
    EXPECT_EQ(r.out.find("hardware:"), std::string::npos) << r.out;
  }
}

// Pins that are not ready (here: their ECU is disabled) are left out; when
// none is left, nothing at all is sent and the command fails.
TEST_F(HardwareCliRefusals, PinsThatAreNotReadyAreLeftOut) {
  const std::string doc = Document();
  const struct {
    const char* disable;
    int exitCode;
    const char* told;
    std::vector<std::string> relays;
  } cases[] = {
      {"ECM",
       0,
       "activated Test: TCU 7\nleft out:\n  ECM K12: ECU ECM is disabled.\n",
       {"FIU 0x21: relay 1 (state 3) on"}},
      {"TCU", 1,
       "Test was not activated: no pin is ready\n  ECM K12: ECU ECM is disabled.\n  TCU 7: ECU TCU is "
       "disabled.\n",
       kAllOff},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.disable);
    Ok({"ecu", "disable", doc, c.disable});
    const ProcessResult r = Run({"activate", doc, "Test", "--hold", "0", "--hardware", "sim"});
    EXPECT_EQ(r.exitCode, c.exitCode) << r.out << r.err;
    EXPECT_NE(r.out.find(c.told), std::string::npos) << r.out;
    EXPECT_EQ(r.err.find("error 945") != std::string::npos, c.exitCode != 0) << r.err;
    EXPECT_EQ(RelaysShown(r.out, c.exitCode == 0 ? "after activation" : "now"), c.relays) << r.out;
    EXPECT_NE(r.out.find("\ndisconnected\n"), std::string::npos) << r.out;
  }

  // On KR60 a pattern whose external hardware is in use (class 2 wires the
  // resistor) would still have RSIM and FIU frames to send without any pin.
  const std::string chassis = MakeDocument(kBenches[0]);
  const std::string trace = dir_.File("nothing.trace");
  Ok({"pattern", "set-class", chassis, "Test", "--pin", "ECM", "A12", "2", "0"});
  for (const char* ecu : {"ECM", "ABS_ESP"}) Ok({"ecu", "disable", chassis, ecu});
  const ProcessResult r =
      Run({"activate", chassis, "Test", "--hold", "0", "--hardware", "sim", "--trace", trace});
  EXPECT_EQ(r.exitCode, 1) << r.out << r.err;
  EXPECT_NE(r.err.find("error 945"), std::string::npos) << r.err;
  // Only the reset of connecting went out: no relay frame, no commit.
  const std::string traced = ReadText(trace);
  EXPECT_NE(traced.find("#81"), std::string::npos) << traced;
  EXPECT_EQ(traced.find("#82"), std::string::npos) << traced;
}

// Without --hardware the settings' hardware is driven, with the defaults for
// what they do not name, and never the simulator: an interface that is not
// there stops the command before anything is switched.
TEST_F(HardwareCliRefusals, WithoutHardwareSimTheSettingsHardwareIsDriven) {
  const std::string doc = Document();
  const std::string chassis = MakeDocument(kBenches[0]);
  const std::string empty = dir_.Write("empty.ini", kTimeouts);
  const struct {
    std::string doc;
    const char* hardware;
    std::string settings;
    const char* firstLine;
    const char* missing;  // named by message 940; "" when the run works
  } cases[] = {
      {doc, "", settings_, "hardware: serial port COM1 at /nonexistent/tty", "COM1 at /nonexistent/tty"},
      {doc, "config", settings_, "hardware: serial port COM1 at /nonexistent/tty",
       "COM1 at /nonexistent/tty"},
      {chassis, "", settings_, "hardware: CAN channel socketcan:nowhere0", "socketcan:nowhere0"},
      // Without a table: board 1, channel 1 is the kernel's can0.
      {chassis, "", empty, "hardware: CAN channel socketcan:can0", "socketcan:can0"},
      {doc, "sim", settings_, "hardware: simulated KR80 bench", ""},
  };
  const bool haveCan0 = std::filesystem::exists("/sys/class/net/can0");
  for (const auto& c : cases) {
    SCOPED_TRACE(c.firstLine);
    if (std::string(c.missing) == "socketcan:can0" && haveCan0) continue;  // a real bus: not to be touched
    std::vector<std::string> args = {"activate", c.doc, "Test", "--hold", "0"};
    if (*c.hardware != '\0') args.insert(args.end(), {"--hardware", c.hardware});
    const ProcessResult r = RunFaultbox(
        args, {}, {"NORVIK_ROOT=" FAULTBOX_BINARY_DIR "/data/norvik", "FAULTBOX_CONFIG=" + c.settings});
    EXPECT_EQ(r.out.rfind(c.firstLine, 0), 0u) << r.out;
    if (*c.missing == '\0') {
      EXPECT_EQ(r.exitCode, 0) << r.out << r.err;
      continue;
    }
    EXPECT_EQ(r.exitCode, 1) << r.out << r.err;
    const std::size_t told = r.err.find("error 940: ");
    ASSERT_NE(told, std::string::npos) << r.err;
    const std::string line = r.err.substr(told, r.err.find('\n', told) - told);
    EXPECT_NE(line.find(c.missing), std::string::npos) << line;
    EXPECT_NE(line.find("--hardware sim"), std::string::npos) << line;
    EXPECT_EQ(r.out.find("connected"), std::string::npos) << r.out;
  }
}

// A module that does not acknowledge the reset was not reset, on the bench
// of another process over the hub: the command says that relays may still be
// switched and fails, whichever reset it was.
TEST_F(HardwareCliRefusals, AResetThatIsNotAcknowledgedFailsTheCommand) {
  const std::string doc = MakeDocument(kBenches[0]);
  const struct {
    const char* name;
    std::vector<std::string> fault;  // faultbox-sim's options
    std::vector<const char*> told;
    bool activated;
  } cases[] = {
      // The reset of connecting: nothing is activated.
      {"refused at connecting",
       {"--fault", "refuse", "--fault-module", "load:11"},
       {"error 942: Module LOAD 0x11 ", "error 944"},
       false},
      // LOAD 0x11 takes the reset and the activation, then refuses the
      // deactivation and every reset after it: the pattern stays activated.
      {"refused at the end",
       {"--fault", "refuse", "--fault-module", "load:11", "--fault-after", "4"},
       {"error 942: Module LOAD 0x11 ", "error 944", "error 933"},
       true},
      {"nobody answers", {"--fault", "silent"}, {"warning 943", "error 944"}, false},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    test::BackgroundProcess hub({FAULTBOX_CANHUB_PATH, "--port", "0"});
    const std::string port = hub.ReadLine();
    ASSERT_FALSE(port.empty()) << "the hub did not start";
    const std::string bus = "127.0.0.1:" + port + "/refusing";
    std::vector<std::string> argv = {FAULTBOX_SIM_PATH,           "kr60",  "--pin-file",
                                     dir_.File("kr60_bench.csv"), "--hub", bus};
    argv.insert(argv.end(), c.fault.begin(), c.fault.end());
    test::BackgroundProcess bench(argv);
    ASSERT_EQ(bench.ReadLine(), "tcp:" + bus);
    // Long enough for the answers over the hub on a busy machine.
    const std::string settings =
        dir_.Write("hub.ini",
                   "[Components\\Faultbox.Component]\nTimeout=5000\n"
                   "[Components\\Faultbox.Component\\Hardware]\nResetCollectionWait=2000\n"
                   "[Components\\Faultbox.Component\\Hardware\\CAN]\n*,*,*=tcp:" +
                       bus + "\n");
    const ProcessResult r =
        RunFaultbox({"activate", doc, "Test", "--hold", "0"}, {},
                    {"NORVIK_ROOT=" FAULTBOX_BINARY_DIR "/data/norvik", "FAULTBOX_CONFIG=" + settings});
    EXPECT_EQ(r.exitCode, 1) << r.out << r.err;
    for (const char* told : c.told) EXPECT_NE(r.err.find(told), std::string::npos) << told << "\n" << r.err;
    EXPECT_NE(r.err.find("may still be switched"), std::string::npos) << r.err;
    EXPECT_EQ(r.out.find("activated Test: ") != std::string::npos, c.activated) << r.out;
    EXPECT_EQ(bench.Stop(SIGTERM), 0);
  }
}

// SIGTERM during an open-ended hold ends it the regular way: deactivated,
// disconnected, status 0.
TEST_F(HardwareCliRefusals, TerminationDuringTheHoldSwitchesBack) {
  const std::string doc = Document();
  test::BackgroundProcess run({"/usr/bin/env", "NORVIK_ROOT=" FAULTBOX_BINARY_DIR "/data/norvik",
                               "FAULTBOX_CONFIG=" + settings_, FAULTBOX_CLI_PATH, "activate", doc, "Test",
                               "--hardware", "sim"});
  ASSERT_TRUE(run.Started());
  std::string out, line;
  while ((line = run.ReadLine()) != "holding until Ctrl-C") {
    ASSERT_FALSE(line.empty()) << "no hold in:\n" << out;
    out += line + "\n";
  }
  EXPECT_EQ(RelaysShown(out, "after activation"), kQuickBench.relaysOn) << out;
  out.clear();
  // Stop sends the signal and waits; the lines it printed are still readable.
  const int status = run.Stop(SIGTERM);
  while (!(line = run.ReadLine()).empty()) out += line + "\n";
  EXPECT_EQ(status, 0) << out;
  EXPECT_NE(out.find("deactivated Test"), std::string::npos) << out;
  EXPECT_EQ(RelaysShown(out, "after deactivation"), kAllOff) << out;
  EXPECT_NE(out.find("disconnected"), std::string::npos) << out;
}

// `make demo` as a new user sees it: it must run through, and its sessions
// must show the relays switched and switched back.
TEST(DemoScript, RunsThroughOnTheSimulatedBenches) {
  const ProcessResult r =
      test::RunProcess({"/bin/bash", FAULTBOX_SOURCE_DIR "/scripts/demo.sh", FAULTBOX_BINARY_DIR});
  ASSERT_EQ(r.exitCode, 0) << r.out << r.err;
  for (const char* line : {"relays after activation: LOAD 0x013: channel 1 relay 2 on; channel 2 relay 2 on",
                           "relays after activation: FIU 0x11: relays 2 (state 2), 3 (state 8) on"})
    EXPECT_NE(r.out.find(line), std::string::npos) << line << "\n" << r.out;
  EXPECT_EQ(RelaysShown(r.out, "after deactivation"), kAllOff) << r.out;
  // Progress notes are left out; nothing went wrong.
  EXPECT_EQ(r.out.find("info "), std::string::npos) << r.out;
  EXPECT_EQ(r.out.find("error "), std::string::npos) << r.out;
  EXPECT_EQ(r.out.find("warning "), std::string::npos) << r.out;
}

}  // namespace
}  // namespace faultbox
