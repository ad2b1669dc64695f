// Activating a 100-pin KR40 pattern through the real serial transfer
// interface against the simulated bench with its 9600 bit/s line timing on.
// The host waits for a checksum answer after every address and relay byte,
// so the activation can never be as fast as its bytes alone on the wire:
// wire_ratio compares the time the activation takes with the time its bytes
// need on the line (bytes x 10 bits / 9600 bit/s); wire_ratio_with_answers
// counts the answers' line time as well, so that 1.0 there is the best the
// line allows and anything above it is the host's and the port's overhead.
#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdint>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "comm/QFCAbstractTransferInterface.h"
#include "config/FailureClassLoader.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCECU.h"
#include "platform/ResultCodes.h"
#include "kr40/KR40Simulator.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "platform/SerialPort.h"
#include "platform/Settings.h"
#include "systems/QFCSystem.h"
#include "SimulatedRig.h"

namespace {

using namespace faultbox;
namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

// CPU seconds the calling thread has used so far.
double ThreadCpuSeconds() {
  timespec ts{};
  ::clock_gettime(CLOCK_THREAD_CPUTIME_ID, &ts);
  return static_cast<double>(ts.tv_sec) + static_cast<double>(ts.tv_nsec) * 1e-9;
}

constexpr int kPins = 100;
constexpr int kRelaysPerModule = 10;
constexpr std::uint32_t kFirstModule = 0x10;
constexpr double kSecondsPerByte = 10.0 / 9600.0;
// Far more than the simulator needs even on a loaded machine: the wait ends
// as soon as the answer is there, so this bounds a stall without slowing a
// run that goes well.
constexpr auto kLimit = std::chrono::seconds(10);
constexpr const char* kPatientTimeout = "500000";  // answer wait passes, 20 us each

// Three classes, each switching one of the first three relay positions, so
// that the state bytes differ from pin to pin.
void FillClasses(QFCAbstractFailureClasses& classes) {
  classes.RemoveAll();
  for (int id = 1; id <= 3; ++id) {
    QFCAbstractFailureClass& fc = classes.AddFailureClass();
    fc.SetId(id);
    fc.SetName("Class " + std::to_string(id));
    QFTPossibility p(kRelayPositions, kRelayOff);
    p.Set(static_cast<std::size_t>(id - 1), kRelayOn, 0, 0);
    fc.AddPossibility(p);
  }
}

// A KR40 system of kPins pins, every relay of modules 0x10 ... 0x19 used
// once, its port COM1 leading to a timed simulator of the same pin file, and
// one pattern holding every pin with a failure class chosen and selected.
class Rig : public bench::SimulatedRig<sim::KR40Simulator> {
 public:
  Rig() { error_ = Build(); }

 private:
  // What went wrong, or "".
  std::string Build() {
    const std::string pinFile =
        PrepareFolder("faultbox-bench-serial", kPatientTimeout, 1, FillClasses, PinFileText());
    sim::KR40SimulatorOptions options;
    options.protocol = sim::ProtocolForBoardType("KR40");
    options.pinFile = pinFile;
    options.timing = true;
    std::string error;
    sim_ = sim::KR40Simulator::Start(options, &error);
    if (!sim_) return "the simulator did not start: " + error;
    Settings::SetString(SerialPort::kPortSection, "COM1", sim_->PortPath());

    if (std::string failed = OpenSystem(pinFile, FillClasses); !failed.empty()) return failed;
    if (system_->GetSerialSettings().portName != "COM1") return "the system's port is not COM1";
    if (system_->GetTransferInterface() == nullptr ||
        system_->GetTransferInterface()->Connect(true, 0, 0) != FAULTBOX_OK)
      return "the serial transfer interface could not connect to " + sim_->PortPath();
    // What a hardware reset would have found: every module of the pin file answers.
    for (int m = 0; m < kPins / kRelaysPerModule; ++m)
      system_->GetRespondingModules().insert(static_cast<std::uint16_t>(kFirstModule + m));
    return BuildPattern(kPins);
  }

  static std::string PinFileText() {
    const char* eol = "\r\n";
    std::ostringstream out;
    out << "/Comment" << eol << "serial benchmark" << eol << "/CommentEnd" << eol << "/Format" << eol
        << "BoardType;KR40" << eol << "AdditionalFiles;none" << eol << "FaultClassFile;classes.fcd" << eol
        << "/FormatEnd" << eol << "/Signallist" << eol << "columns" << eol
        << "pin_name(1);ecu_name(1);faults_ecu(1);fiu_module_id;fiu_module_channel" << eol << eol << eol
        << eol;
    for (int i = 0; i < kPins; ++i) {
      const int module = static_cast<int>(kFirstModule) + i / kRelaysPerModule;
      out << "P" << i << ";ECU" << i / 50 << ";1,2,3;" << std::hex << std::uppercase << module << std::dec
          << ";" << i % kRelaysPerModule + 1 << eol;
    }
    out << "/SignallistEnd" << eol;
    return out.str();
  }

};

std::size_t RelayCount(const sim::KR40RelayStates& states) {
  std::size_t count = 0;
  for (const auto& [module, relays] : states) count += relays.size();
  return count;
}

// Only ActivatePattern is timed: what the engineer waits for. The execute
// byte that ends it may still be on the simulated line when the call
// returns; the host does not wait for it, and neither does the time here.
// The deactivation that readies the next iteration is not timed.
void BM_ActivateKR40Pattern(benchmark::State& state) {
  Rig rig;
  if (!rig.error().empty()) {
    state.SkipWithError(rig.error().c_str());
    return;
  }
  double seconds = 0;
  double cpuSeconds = 0;  // of the host thread during the activations
  std::uint64_t bytes = 0;
  std::uint64_t answers = 0;
  for (auto _ : state) {
    const sim::KR40Counters before = rig.sim().Counters();
    const double cpuStart = ThreadCpuSeconds();
    const auto start = Clock::now();
    const HRESULT activated = rig.pattern().ActivatePattern(true);
    const double elapsed = std::chrono::duration<double>(Clock::now() - start).count();
    const double cpu = ThreadCpuSeconds() - cpuStart;
    state.SetIterationTime(elapsed);
    if (activated != FAULTBOX_OK) {
      state.SkipWithError(("activation failed: " + ResultCodeText(activated)).c_str());
      break;
    }
    if (!rig.sim().WaitForExecutes(before.executes + 1, kLimit)) {
      state.SkipWithError("the simulated bench saw no execute");
      break;
    }
    const sim::KR40Counters after = rig.sim().Counters();
    if (RelayCount(rig.sim().RelayStates()) != kPins) {
      state.SkipWithError("the simulated bench did not switch every pin's relay");
      break;
    }
    seconds += elapsed;
    cpuSeconds += cpu;
    bytes += after.bytesProcessed - before.bytesProcessed;
    answers += after.answers - before.answers;

    if (rig.pattern().ActivatePattern(false) != FAULTBOX_OK ||
        !rig.sim().WaitForExecutes(before.executes + 2, kLimit) || !rig.sim().RelayStates().empty()) {
      state.SkipWithError("deactivation failed");
      break;
    }
  }
  if (bytes == 0) return;
  const double iterations = static_cast<double>(state.iterations());
  state.counters["bytes"] = static_cast<double>(bytes) / iterations;
  state.counters["answers"] = static_cast<double>(answers) / iterations;
  state.counters["wire_ratio"] = seconds / (static_cast<double>(bytes) * kSecondsPerByte);
  // The answer waits look at the port in short passes: this shows what the
  // waiting costs the host while the line is slow.
  state.counters["host_cpu_share"] = cpuSeconds / seconds;
  state.counters["wire_ratio_with_answers"] =
      seconds / (static_cast<double>(bytes + answers) * kSecondsPerByte);
}
BENCHMARK(BM_ActivateKR40Pattern)->UseManualTime()->Unit(benchmark::kMillisecond)->Iterations(10);

}  // namespace

BENCHMARK_MAIN();
