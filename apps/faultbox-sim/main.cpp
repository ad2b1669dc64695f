// faultbox-sim: runs one simulated bench until it is told to stop, so that
// the faultbox tools can connect to it as to real hardware. The first line on
// standard output names what to connect to.
#include <pthread.h>
#include <signal.h>
#include <CLI/CLI.hpp>

#include <cctype>
#include <cstdio>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "config/QFCFSHelper.h"
#include "platform/QFCReporter.h"
#include "kr40/KR40Simulator.h"
#include "kr60/KR60Simulator.h"

namespace faultbox::simapp {
namespace {

// Lines go out whole, and never before the first line that names the port.
std::mutex printMutex;

void PrintLine(const std::string& line) {
  std::lock_guard<std::mutex> lock(printMutex);
  std::fputs(line.c_str(), stdout);
  std::fputc('\n', stdout);
  std::fflush(stdout);
}

// What the main loop needs of a running simulator; destroying it stops the
// simulator.
class Session {
 public:
  virtual ~Session() = default;
  virtual std::string ConnectTo() const = 0;
};

// A running simulator of the kind `Simulator`, reached at what `address` gives.
template <class Simulator>
class SimulatorSession : public Session {
 public:
  using Address = const std::string& (Simulator::*)() const;
  SimulatorSession(std::unique_ptr<Simulator> sim, Address address)
      : sim_(std::move(sim)), address_(address) {}
  std::string ConnectTo() const override { return (sim_.get()->*address_)(); }

 private:
  std::unique_ptr<Simulator> sim_;
  Address address_;
};

// Starts the simulator; nullptr with `error` set when it cannot.
template <class Simulator, class Options>
std::unique_ptr<Session> StartSession(const Options& options,
                                      typename SimulatorSession<Simulator>::Address address,
                                      std::string* error) {
  std::unique_ptr<Simulator> simulator = Simulator::Start(options, error);
  if (!simulator) return nullptr;
  return std::make_unique<SimulatorSession<Simulator>>(std::move(simulator), address);
}

struct Common {
  bool verbose = false;
};

// Starts the simulator that a subcommand's options describe; nullptr with
// `error` set when it cannot.
using Starter = std::function<std::unique_ptr<Session>(const Common&, std::string* error)>;

// One simulator kind: its subcommand name and help, and the function that
// adds its options to the subcommand and returns its starter. Another bench
// kind is one more row of kSubcommands.
struct Subcommand {
  const char* name;
  const char* help;
  Starter (*add)(CLI::App& command);
};

// ---------------------------------------------------------------------------
// KR40 family

std::string Hex2(std::uint32_t value) {
  char text[8];
  std::snprintf(text, sizeof text, "0x%02X", value);
  return text;
}

std::string Describe(const sim::KR40Event& event) {
  std::string line = event.kind == sim::KR40Event::Kind::kExecute ? "execute " : "reset ";
  line += std::to_string(event.number) + ":";
  if (event.states.empty()) return line + " all relays off";
  for (const auto& [module, relays] : event.states) {
    line += " module " + Hex2(module) + " relays";
    for (const auto& [relay, state] : relays)
      line += " " + std::to_string(relay) + "=" + std::to_string(state);
    line += ";";
  }
  line.pop_back();
  return line;
}

struct KR40Args {
  sim::KR40SimulatorOptions options;
  std::string fault = "none";
  int lateMs = 200;
  std::uint64_t faultAfter = 0;
};

Starter AddKR40Family(CLI::App& command, sim::KR40Protocol protocol) {
  auto args = std::make_shared<KR40Args>();
  args->options.protocol = protocol;
  command.add_option(
      "--pin-file", args->options.pinFile,
      "Pin file of the bench: only the relay modules it names answer (default: every address)");
  command.add_option("--ecu-version", args->options.ecuVersion, "ECU version n of the pin file's columns")
      ->capture_default_str();
  command.add_option("--fault", args->fault, "Fault mode of every answer")
      ->check(CLI::IsMember({"none", "silent", "wrong-checksum", "late"}))
      ->capture_default_str();
  command.add_option("--late-ms", args->lateMs, "Delay of a late answer in milliseconds")
      ->check(CLI::Range(0, 3'600'000))
      ->capture_default_str();
  command.add_option("--fault-after", args->faultAfter, "Answers given correctly before the fault sets in")
      ->capture_default_str();
  command.add_flag("--timing", args->options.timing,
                   "Take and answer bytes at the pace of a 9600 bit/s line");
  return [args](const Common& common, std::string* error) -> std::unique_ptr<Session> {
    sim::KR40SimulatorOptions options = args->options;
    if (args->fault == "silent") options.fault.mode = sim::KR40FaultMode::kSilent;
    if (args->fault == "wrong-checksum") options.fault.mode = sim::KR40FaultMode::kWrongChecksum;
    if (args->fault == "late") options.fault.mode = sim::KR40FaultMode::kLate;
    options.fault.lateBy = std::chrono::milliseconds(args->lateMs);
    options.fault.afterAnswers = args->faultAfter;
    if (common.verbose) options.onEvent = [](const sim::KR40Event& e) { PrintLine(Describe(e)); };
    return StartSession<sim::KR40Simulator>(options, &sim::KR40Simulator::PortPath, error);
  };
}

Starter AddKR40(CLI::App& command) {
  return AddKR40Family(command, sim::KR40Protocol::kA);
}
Starter AddKR80(CLI::App& command) {
  return AddKR40Family(command, sim::KR40Protocol::kB);
}

// ---------------------------------------------------------------------------
// KR60

std::string Hex(std::uint64_t value, int digits) {
  char text[24];
  std::snprintf(text, sizeof text, "0x%0*llX", digits, static_cast<unsigned long long>(value));
  return text;
}

// The relays a vector switches on, in the module's own terms: bits for FIU,
// channel.relay for LOAD.
std::string RelaysOn(sim::KR60ModuleType type, std::uint64_t vector) {
  std::string out;
  for (int bit = 0; bit < 64; ++bit) {
    if (((vector >> bit) & 1u) != 0) continue;
    if (type == sim::KR60ModuleType::kLOAD) {
      for (std::uint32_t channel = 0; channel <= 9; ++channel)
        for (std::uint32_t relay = 0; relay <= 4; ++relay)
          if (sim::KR60Simulator::LoadRelayBit(channel, relay) == bit)
            out += " " + std::to_string(channel) + "." + std::to_string(relay);
      if (bit == 30 || bit == 31 || bit >= 52) out += " bit" + std::to_string(bit);
    } else {
      out += " " + std::to_string(bit);
    }
  }
  return out;
}

std::string Describe(const sim::KR60Event& event) {
  std::string line = event.kind == sim::KR60Event::Kind::kCommit ? "commit " : "reset ";
  line += std::string(sim::KR60ModuleTypeName(event.module.type)) + " " + Hex(event.module.address, 3) + ": ";
  if (event.module.type == sim::KR60ModuleType::kRSIM) {
    const auto state = static_cast<std::uint32_t>(event.after & 0xFFFFFFFFu);
    return line + (state == 0xFFFFFFFFu ? "all relays off" : "state " + Hex(state, 8));
  }
  if (event.after == sim::KR60Simulator::kAllOff) return line + "all relays off";
  return line + "relays " + Hex(event.after, 16) + ", on:" + RelaysOn(event.module.type, event.after);
}

// "fiu:2F7", "load:0_1_2": a module type and its address, hexadecimal or
// cabinet_rack_slot.
bool ParseModule(const std::string& text, sim::KR60ModuleId& id) {
  const std::size_t colon = text.find(':');
  if (colon == std::string::npos) return false;
  std::string type = text.substr(0, colon);
  for (char& c : type) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  if (type == "fiu") {
    id.type = sim::KR60ModuleType::kFIU;
  } else if (type == "load") {
    id.type = sim::KR60ModuleType::kLOAD;
  } else if (type == "rsim") {
    id.type = sim::KR60ModuleType::kRSIM;
  } else {
    return false;
  }
  const std::string address = text.substr(colon + 1);
  std::uint32_t cabinet = 0, rack = 0, slot = 0;
  if (address.find('_') != std::string::npos) {
    if (!QFCFSHelper::ParseModuleAddress(address, cabinet, rack, slot, false)) return false;
    id.address = QFCFSHelper::ModuleAddress(cabinet, rack, slot);
    return true;
  }
  return QFCFSHelper::StringToNumber(address, id.address, 16);
}

struct KR60Args {
  sim::KR60SimulatorOptions options;
  std::string bus;
  std::string hub;
  std::string fault = "none";
  std::vector<std::string> faultModules;
  int lateMs = 200;
  std::uint64_t faultAfter = 0;
};

Starter AddKR60(CLI::App& command) {
  auto args = std::make_shared<KR60Args>();
  command
      .add_option("--pin-file", args->options.pinFile,
                  "Pin file of the bench: its FIU, RSIM and LOAD modules")
      ->required();
  command.add_option("--ecu-version", args->options.ecuVersion, "ECU version n of the pin file's columns")
      ->capture_default_str();
  auto* bus = command.add_option(
      "--bus", args->bus,
      "CAN channel to sit on: driver:interface (virtual:NAME, socketcan:vcan0) or a kernel interface");
  command
      .add_option("--hub", args->hub,
                  "TCP bus of faultbox-canhub, HOST:PORT/BUS (default 127.0.0.1:29536/bench1)")
      ->excludes(bus);
  command.add_option("--fault", args->fault, "Fault mode of the modules")
      ->check(CLI::IsMember({"none", "silent", "refuse", "late", "wrong-id", "wrong-content"}))
      ->capture_default_str();
  command.add_option("--fault-module", args->faultModules,
                     "Only this module has the fault: TYPE:ADDRESS, e.g. fiu:2F7 or load:0_1_2 (repeatable)");
  command.add_option("--late-ms", args->lateMs, "Delay of a late answer in milliseconds")
      ->check(CLI::Range(0, 3'600'000))
      ->capture_default_str();
  command
      .add_option("--fault-after", args->faultAfter,
                  "Answers each module gives correctly before the fault sets in")
      ->capture_default_str();
  command.add_flag("--timing", args->options.timing, "Frames take their time on a 125000 bit/s bus");
  return [args](const Common&, std::string* error) -> std::unique_ptr<Session> {
    sim::KR60SimulatorOptions options = args->options;
    if (!args->bus.empty())
      options.target = args->bus.find(':') == std::string::npos ? "socketcan:" + args->bus : args->bus;
    else
      options.target = "tcp:" + (args->hub.empty() ? std::string("127.0.0.1:29536/bench1") : args->hub);
    sim::KR60Fault fault;
    if (args->fault == "silent") fault.mode = sim::KR60FaultMode::kSilent;
    if (args->fault == "refuse") fault.mode = sim::KR60FaultMode::kRefuse;
    if (args->fault == "late") fault.mode = sim::KR60FaultMode::kLate;
    if (args->fault == "wrong-id") fault.mode = sim::KR60FaultMode::kWrongIdentifier;
    if (args->fault == "wrong-content") fault.mode = sim::KR60FaultMode::kWrongContent;
    fault.lateBy = std::chrono::milliseconds(args->lateMs);
    fault.afterAnswers = args->faultAfter;
    if (args->faultModules.empty()) {
      options.fault = fault;
    } else {
      for (const std::string& text : args->faultModules) {
        sim::KR60ModuleId id;
        if (!ParseModule(text, id)) {
          *error = "--fault-module " + text +
                   " is not TYPE:ADDRESS (fiu, load or rsim; hexadecimal or cabinet_rack_slot)";
          return nullptr;
        }
        options.moduleFaults[id] = fault;
      }
    }
    // Relay changes are what the bench is watched for: always printed.
    options.onEvent = [](const sim::KR60Event& e) { PrintLine(Describe(e)); };
    return StartSession<sim::KR60Simulator>(options, &sim::KR60Simulator::Target, error);
  };
}

const Subcommand kSubcommands[] = {
    {"kr40", "A KR40 bench on a pseudo-terminal (protocol A, checksum answers)", AddKR40},
    {"kr80", "A KR80 bench on a pseudo-terminal (protocol B, no answers)", AddKR80},
    {"kr60", "A KR60 bench on a CAN bus (FIU, LOAD and RSIM modules)", AddKR60},
};

// Warnings and errors of the pin file reader go to standard error, one per
// line; its progress notes only with --verbose.
class StderrSink : public MessageSink {
 public:
  explicit StderrSink(bool verbose) : verbose_(verbose) {}
  void Display(const ErrorRecord& record, bool) override {
    if (!verbose_ && record.errorClass < 2) return;
    std::fprintf(stderr, "faultbox-sim: message %d: %s\n", record.number, record.Text().c_str());
  }

 private:
  bool verbose_;
};

}  // namespace
}  // namespace faultbox::simapp

int main(int argc, char** argv) {
  using namespace faultbox;
  using namespace faultbox::simapp;

  // Blocked before any thread starts, so that only sigwait below sees them.
  sigset_t stopSignals;
  sigemptyset(&stopSignals);
  sigaddset(&stopSignals, SIGINT);
  sigaddset(&stopSignals, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);
  signal(SIGPIPE, SIG_IGN);

  CLI::App app{"faultbox-sim: a simulated failure insertion bench to connect faultbox to"};
  app.require_subcommand(1);
  app.fallthrough();
  Common common;
  app.add_flag("--verbose", common.verbose, "Print a line for every execute and reset with the relay states");

  std::vector<std::pair<CLI::App*, Starter>> commands;
  for (const Subcommand& entry : kSubcommands) {
    CLI::App* command = app.add_subcommand(entry.name, entry.help);
    commands.emplace_back(command, entry.add(*command));
  }
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    const int code = app.exit(e);
    return code == 0 ? 0 : 2;
  }

  StderrSink sink(common.verbose);
  TheReporter().StartReporting();
  if (TheReporter().Module()) TheReporter().Module()->AddSink(&sink);

  std::unique_ptr<Session> session;
  std::string error;
  {
    // Held until the port is printed: a verbose line must not come first.
    std::lock_guard<std::mutex> lock(printMutex);
    for (auto& [command, start] : commands) {
      if (command->parsed()) session = start(common, &error);
    }
    if (!session) {
      std::fprintf(stderr, "faultbox-sim: %s\n", error.c_str());
      return 1;
    }
    std::printf("%s\n", session->ConnectTo().c_str());
    std::fflush(stdout);
  }

  int received = 0;
  sigwait(&stopSignals, &received);
  session.reset();
  if (TheReporter().Module()) TheReporter().Module()->RemoveSink(&sink);
  return 0;
}
