// A KR60 pattern of 1000 pins (100 LOAD modules, every channel used once):
// building its frames, and activating and deactivating it through the real
// CAN transfer interface against the simulated bench on an in-process bus.
// Every relay frame is awaited on its own and each commit from all modules
// it loaded, so an activation is a chain of round trips; round_trip_us is
// what one frame costs from sending it to having all its answers. With the
// bench's bus model on (timing:1) bus_ratio compares the activation with the
// time its frames and answers need on a 125000 bit/s bus: 1.0 is the best
// the bus allows, and an answer wait that slept a fixed pass while the
// answer was already there would put it far above (one pass is 30 ms, a
// round trip on the bus about 2 ms).
#include <benchmark/benchmark.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "comm/QFCAbstractTransferInterface.h"
#include "config/FailureClassLoader.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCAbstractHardwareInfo.h"
#include "config/QFCECU.h"
#include "platform/ResultCodes.h"
#include "kr60/KR60Simulator.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternPins.h"
#include "platform/CanAccess.h"
#include "platform/Settings.h"
#include "systems/QFCSystem.h"
#include "SimulatedRig.h"

namespace {

using namespace faultbox;
namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

constexpr int kPins = 1000;
constexpr int kChannelsPerModule = 10;
constexpr int kModules = kPins / kChannelsPerModule;
constexpr int kSlotsPerRack = 16;
// Far more than the simulator needs even on a loaded machine: a wait ends as
// soon as its answers are there, so this bounds a stall without slowing a
// run that goes well.
constexpr auto kLimit = std::chrono::seconds(10);
constexpr const char* kPatientTimeout = "100";  // answer wait passes

// LOAD module m in cabinet 1: racks 1 to 7, slots 0 to 15.
std::string ModuleText(int m) {
  return "1_" + std::to_string(1 + m / kSlotsPerRack) + "_" + std::to_string(m % kSlotsPerRack);
}
std::uint16_t ModuleAddress(int m) {
  return static_cast<std::uint16_t>(0x100 | ((1 + m / kSlotsPerRack) << 4) | (m % kSlotsPerRack));
}

// Three classes, each switching one of the first three load relays, so that
// the relay vectors differ from pin to pin.
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

std::string UniqueBus() {
  static std::atomic<int> counter{0};
  return "can-bench-" + std::to_string(::getpid()) + "-" + std::to_string(counter++);
}

// A KR60 system of kPins pins on an in-process bus shared with the simulated
// bench of the same pin file, connected through its CAN transfer interface,
// and one pattern holding every pin with a failure class chosen and selected.
class Rig : public bench::SimulatedRig<sim::KR60Simulator> {
 public:
  explicit Rig(bool timing) { error_ = Build(timing); }

 private:
  // What went wrong, or "".
  std::string Build(bool timing) {
    const std::string pinFile = PrepareFolder("faultbox-bench-can-" + std::to_string(::getpid()),
                                              kPatientTimeout, fptKR60Platform, FillClasses, PinFileText());
    const std::string target = "virtual:" + UniqueBus();
    sim::KR60SimulatorOptions options;
    options.pinFile = pinFile;
    options.target = target;
    options.timing = timing;
    std::string error;
    sim_ = sim::KR60Simulator::Start(options, &error);
    if (!sim_) return "the simulator did not start: " + error;
    CanChannelTarget parsed;
    if (!ParseCanChannelTarget(target, &parsed)) return "no channel target " + target;
    CanChannelTable::SetOverride({{{-1, -1, -1}, parsed}});

    if (std::string failed = OpenSystem(pinFile, FillClasses); !failed.empty()) return failed;
    if (system_->GetTransferInterface() == nullptr ||
        system_->GetTransferInterface()->Connect(true, 0, 0) != FAULTBOX_OK)
      return "the CAN transfer interface could not connect to " + target;
    // What a hardware reset would have found: every LOAD module answers.
    for (int m = 0; m < kModules; ++m) system_->GetRespondingModules().insert(ModuleAddress(m));
    return BuildPattern(kPins);
  }

  // FIU and RSIM modules are fitted, though these classes switch neither.
  static std::string PinFileText() {
    static const char* const kLines[] = {
        "/Comment",
        "CAN benchmark",
        "/CommentEnd",
        "/Format",
        "BoardType;KR60",
        "AdditionalFiles;none",
        "FaultClassFile;classes.fcd",
        "Potential0;UBATT",
        "Potential1;GND",
        "Potential2;none",
        "Potential3;none",
        "Potential4;U5V",
        "OffsetCANAddress;none",
        "OffsetLoadAddress;10",
        "OffsetPowerSwitchAddress;none",
        "FIULoadAddress;0_0_3",
        "RSIMLoadAddress;0_0_4",
        "FIUCANAddress;none",
        "RSIMCANAddress(1);none",
        "RSIMCANAddress(2);none",
        "/FormatEnd",
        "/Signallist",
        "columns",
        "pin_name(1);ecu_name(1);faults_ecu(1);load_channels_required;load_module_id;load_module_channel",
        "",
        "",
        ""};
    std::string text;
    for (const char* line : kLines) text += std::string(line) + "\r\n";
    for (int i = 0; i < kPins; ++i)
      text += "P" + std::to_string(i) + ";ECU" + std::to_string(i / 100) + ";1,2,3;1;" +
              ModuleText(i / kChannelsPerModule) + ";" + std::to_string(i % kChannelsPerModule) + "\r\n";
    return text + "/SignallistEnd\r\n";
  }

};

// The frames that activate the whole pattern, built and destroyed again.
void BM_BuildKR60Frames(benchmark::State& state) {
  Rig rig(false);
  if (!rig.error().empty()) {
    state.SkipWithError(rig.error().c_str());
    return;
  }
  std::size_t frames = 0;
  for (auto _ : state) {
    QFCMessageList messages;
    if (!rig.pattern().BuildMessages(messages, true)) {
      state.SkipWithError("the frames could not be built");
      break;
    }
    frames = messages.size();
    rig.pattern().FreeMessages(messages);
  }
  state.counters["frames"] = static_cast<double>(frames);
  state.counters["per_frame"] =
      benchmark::Counter(static_cast<double>(frames),
                         benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}
BENCHMARK(BM_BuildKR60Frames)->Unit(benchmark::kMillisecond);

// The frames (requests and answers) the bench saw since `before`, on the bus.
double BusSeconds(sim::KR60Simulator& sim, const sim::KR60Counters& before, const sim::KR60Counters& after) {
  std::chrono::nanoseconds total{0};
  const std::vector<CanFrameRecord> received = sim.ReceivedFrames();
  const std::vector<CanFrameRecord> sent = sim.SentFrames();
  const std::size_t requests = after.frames - before.frames;
  const std::size_t answers = after.answers - before.answers;
  for (std::size_t i = received.size() - std::min(requests, received.size()); i < received.size(); ++i)
    total += sim::KR60Simulator::FrameTime(received[i]);
  for (std::size_t i = sent.size() - std::min(answers, sent.size()); i < sent.size(); ++i)
    total += sim::KR60Simulator::FrameTime(sent[i]);
  return std::chrono::duration<double>(total).count();
}

// The frames of the pattern in its present state: of an activation while
// nothing is activated, of a deactivation once it is; 0 when none build.
std::uint64_t CountFrames(QFCAbstractFailurePattern& pattern, bool activate) {
  QFCMessageList messages;
  const bool built = pattern.BuildMessages(messages, activate);
  const std::uint64_t count = built ? messages.size() : 0;
  pattern.FreeMessages(messages);
  return count;
}

// Switches the pattern and returns how long that took, once the bench has
// counted all `frames` of it; a negative time when it failed (with the
// reason in `error`).
double Switch(Rig& rig, bool activate, std::uint64_t frames, std::string& error) {
  const std::uint64_t before = rig.sim().Counters().frames;
  const auto start = Clock::now();
  const HRESULT result = rig.pattern().ActivatePattern(activate);
  const double seconds = std::chrono::duration<double>(Clock::now() - start).count();
  if (result != FAULTBOX_OK) {
    error = std::string(activate ? "activation" : "deactivation") + " failed: " + ResultCodeText(result);
    return -1;
  }
  // The bench publishes a frame's count just after its answers: the host may be first.
  if (!rig.sim().WaitForFrames(before + frames, kLimit)) {
    error = "the simulated bench did not count every frame";
    return -1;
  }
  return seconds;
}

// One activation and the deactivation after it, both timed: what the
// engineer waits for.
void BM_KR60ActivationRoundTrips(benchmark::State& state) {
  const bool timing = state.range(0) != 0;
  Rig rig(timing);
  std::string error = rig.error();
  // An untimed round first, which also tells how many frames each half sends.
  const std::uint64_t onFrames = error.empty() ? CountFrames(rig.pattern(), true) : 0;
  std::uint64_t offFrames = 0;
  if (error.empty() && Switch(rig, true, onFrames, error) >= 0) {
    offFrames = CountFrames(rig.pattern(), false);
    Switch(rig, false, offFrames, error);
  }
  if (error.empty() && (onFrames == 0 || offFrames == 0)) error = "the frames could not be built";
  if (!error.empty()) {
    state.SkipWithError(error.c_str());
    return;
  }

  double seconds = 0;
  double activationSeconds = 0;
  double activationBusSeconds = 0;
  std::uint64_t answers = 0;
  for (auto _ : state) {
    const sim::KR60Counters before = rig.sim().Counters();
    const double on = Switch(rig, true, onFrames, error);
    if (on < 0) break;
    const sim::KR60Counters afterOn = rig.sim().Counters();
    activationBusSeconds += BusSeconds(rig.sim(), before, afterOn);
    const double off = Switch(rig, false, offFrames, error);
    if (off < 0) break;
    state.SetIterationTime(on + off);
    seconds += on + off;
    activationSeconds += on;
    answers += rig.sim().Counters().answers - before.answers;
  }
  if (!error.empty()) {
    state.SkipWithError(error.c_str());
    return;
  }
  const double iterations = static_cast<double>(state.iterations());
  state.counters["frames"] = static_cast<double>(onFrames + offFrames);
  state.counters["answers"] = static_cast<double>(answers) / iterations;
  state.counters["round_trip_us"] = seconds / (iterations * static_cast<double>(onFrames + offFrames)) * 1e6;
  if (timing) state.counters["bus_ratio"] = activationSeconds / activationBusSeconds;
}
BENCHMARK(BM_KR60ActivationRoundTrips)
    ->ArgName("timing")
    ->Arg(0)
    ->Arg(1)
    ->UseManualTime()
    ->Unit(benchmark::kMillisecond)
    ->Iterations(10);

}  // namespace

BENCHMARK_MAIN();
