// The safety interlock on large patterns: a full check of 1 000 and 10 000
// pins, each defining five failure classes of three relay vectors, and
// configuring every pin of a 1 000-pin pattern one PinConfig switch at a time
// (each switch runs a full check, as in the standard user mode). KR40 pins,
// and KR60 pins with the pattern's external hardware in use, so that the
// exclusive-entry rule judges every pin with entry 0, 1 or 3 on.
#include <benchmark/benchmark.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>
#include <string>

#include "config/FailureClassLoader.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCECU.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCAbstractFailurePatternSafetyInterlock.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/QFCFailurePatterns.h"
#include "patterns/kr40/QFCKR40FailurePattern.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"
#include "platform/Settings.h"
#include "systems/QFCSystem.h"

namespace {

using namespace faultbox;
namespace fs = std::filesystem;

enum class Platform { kKR40, kKR60 };

// A relay vector from the states of positions 0 to 4. On KR40 the rest are
// off; on KR60 the external hardware positions do not matter, except that the
// first vector of each class needs the resistor on potential 0 and endpoint 2.
QFTPossibility Vector(const char* states, Platform platform, bool first) {
  QFTPossibility p(kRelayPositions, platform == Platform::kKR40 ? kRelayOff : kRelayAny);
  for (std::size_t k = 0; states[k] != '\0'; ++k) p.Set(k, static_cast<std::uint32_t>(states[k] - '0'), 0, 0);
  if (platform == Platform::kKR60 && first) {
    p.Set(5, kRelayOn, 0, 0);
    p.Set(10, kRelayOn, 0, 0);
  }
  return p;
}

// Five classes of three vectors: each class fits some PinConfig settings and
// forbids others, so that the interlock has real work on every pin.
void FillClasses(QFCAbstractFailureClasses& classes, Platform platform) {
  static const char* kVectors[5][3] = {{"10000", "12000", "10200"},
                                       {"01000", "21000", "01002"},
                                       {"00100", "00120", "20100"},
                                       {"00010", "02010", "00012"},
                                       {"00001", "20001", "00201"}};
  classes.RemoveAll();
  for (int id = 1; id <= 5; ++id) {
    QFCAbstractFailureClass& fc = classes.AddFailureClass();
    fc.SetId(id);
    fc.SetName("Class " + std::to_string(id));
    for (int j = 0; j < 3; ++j) fc.AddPossibility(Vector(kVectors[id - 1][j], platform, j == 0));
  }
}

// A system of `pins` pins in 100-pin ECUs, each pin defining classes 1 to 5.
// KR60 pins each have a load channel of their own.
class Rig {
 public:
  explicit Rig(int pins, Platform platform = Platform::kKR40) {
    const bool kr60 = platform == Platform::kKR60;
    dir_ = fs::temp_directory_path() /
           ("faultbox-bench-interlock-" + std::string(kr60 ? "kr60-" : "kr40-") + std::to_string(pins));
    fs::create_directories(dir_);
    Settings::SetPathOverride((dir_ / "faultbox.ini").string());
    auto classes = QFCAbstractFailureClasses::Create(kr60 ? 2 : 1);
    classes->SetVersion("bench");
    FillClasses(*classes, platform);
    const auto bytes = StoreFailureClasses(*classes);
    std::ofstream((dir_ / "classes.fcd").string(), std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));

    std::ostringstream out;
    const char* eol = "\r\n";
    out << "/Comment" << eol << "interlock benchmark" << eol << "/CommentEnd" << eol << "/Format" << eol
        << "BoardType;" << (kr60 ? "KR60" : "KR40") << eol << "AdditionalFiles;none" << eol
        << "FaultClassFile;classes.fcd" << eol;
    if (kr60)
      out << "Potential0;UBATT" << eol << "Potential1;GND" << eol << "Potential2;none" << eol
          << "Potential3;none" << eol << "Potential4;U5V" << eol << "OffsetCANAddress;none" << eol
          << "OffsetLoadAddress;7E0" << eol << "OffsetPowerSwitchAddress;none" << eol << "FIULoadAddress;none"
          << eol << "RSIMLoadAddress;none" << eol << "FIUCANAddress;none" << eol << "RSIMCANAddress(1);none"
          << eol << "RSIMCANAddress(2);none" << eol;
    out << "/FormatEnd" << eol << "/Signallist" << eol << "columns" << eol
        << (kr60 ? "pin_name(1);ecu_name(1);faults_ecu(1);load_channels_required;load_module_id;load_module_"
                   "channel"
                 : "pin_name(1);ecu_name(1);faults_ecu(1);fiu_module_id;fiu_module_channel")
        << eol << eol << eol << eol;
    for (int i = 0; i < pins; ++i) {
      out << "P" << i << ";ECU" << i / 100 << ";1,2,3,4,5;";
      if (kr60) {
        out << "1;" << i / 2560 << "_" << i / 160 % 16 << "_" << i / 10 % 16 << ";" << i % 10 << eol;
      } else {
        char module[8];
        std::snprintf(module, sizeof module, "%X", i % 128);
        out << module << ";" << i % 10 + 1 << eol;
      }
    }
    out << "/SignallistEnd" << eol;
    const std::string path = (dir_ / "bench.csv").string();
    std::ofstream(path, std::ios::binary) << out.str();

    system_ = std::make_unique<QFCSystem>("Bench", path, 1, "", "");
    if (system_->OpenFromPinFile() != FAULTBOX_OK || system_->GetFailureClasses() == nullptr) {
      ok_ = false;
      return;
    }
    FillClasses(*system_->GetFailureClasses(), platform);
    patterns_ = std::make_unique<QFCFailurePatterns>(system_.get());
    if (patterns_->CreatePattern(pattern_, "Bench") != FAULTBOX_OK) {
      ok_ = false;
      return;
    }
    // The resistor on potential UBATT between endpoints 2 and 3.
    if (auto* kr60Pattern = dynamic_cast<QFCKR60FailurePattern*>(pattern_)) {
      if (!kr60Pattern->SetPotentialChoice("UBATT", QFCExternHardware::kResistor) ||
          !kr60Pattern->Connect(QFCExternHardware::kResistor, -1, 2, 3)) {
        ok_ = false;
        return;
      }
    }
    std::vector<QFCAbstractPin*> all;
    for (QFCECU* ecu : system_->GetECUs())
      for (int i = 0; i < ecu->GetPinCount(); ++i) all.push_back(ecu->GetPin(i));
    pattern_->AddPins(all);
    ok_ = pattern_->GetPinCount() == pins;
  }
  ~Rig() {
    patterns_.reset();
    system_.reset();
    Settings::SetPathOverride("");
    std::error_code ignored;
    fs::remove_all(dir_, ignored);
  }

  bool ok() const { return ok_; }
  QFCAbstractFailurePattern* pattern() const { return pattern_; }

 private:
  fs::path dir_;
  std::unique_ptr<QFCSystem> system_;
  std::unique_ptr<QFCFailurePatterns> patterns_;
  QFCAbstractFailurePattern* pattern_ = nullptr;
  bool ok_ = true;
};

void CheckAll(benchmark::State& state, Platform platform) {
  Rig rig(static_cast<int>(state.range(0)), platform);
  if (!rig.ok()) {
    state.SkipWithError("rig could not be built");
    return;
  }
  // Different settings per pin, so that candidates and matches vary.
  auto* pins = rig.pattern()->GetPins();
  for (int i = 0; i < pins->GetCount(); ++i) pins->GetAt(i)->SetPinConfigs({0, 0, 0, 0, 0});
  for (int i = 0; i < pins->GetCount(); i += 2)
    pins->GetAt(i)->SetPinConfigs({i % 5 == 0 ? 1u : 0u, 0, i % 5 == 2 ? 1u : 0u, 0, 0});
  for (auto _ : state) benchmark::DoNotOptimize(rig.pattern()->GetInterlock()->CheckAll());
  state.SetItemsProcessed(state.iterations() * state.range(0));
  // What the check decided, so that a rig that gives no pin a class shows.
  int withClass = 0;
  for (int i = 0; i < pins->GetCount(); ++i) withClass += pins->GetAt(i)->GetFailureClassId() != -1 ? 1 : 0;
  state.counters["pins_with_class"] = withClass;
}

void BM_CheckAll(benchmark::State& state) {
  CheckAll(state, Platform::kKR40);
}
BENCHMARK(BM_CheckAll)->Arg(1000)->Arg(10000)->Unit(benchmark::kMillisecond);

void BM_KR60CheckAll(benchmark::State& state) {
  CheckAll(state, Platform::kKR60);
}
BENCHMARK(BM_KR60CheckAll)->Arg(1000)->Arg(10000)->Unit(benchmark::kMillisecond);

// One iteration switches one entry on for every pin of the pattern, one
// SetPinConfig at a time: the time per iteration is the total an engineer
// waits while configuring the whole pattern.
void ConfigureEveryPin(benchmark::State& state, Platform platform) {
  Rig rig(static_cast<int>(state.range(0)), platform);
  if (!rig.ok()) {
    state.SkipWithError("rig could not be built");
    return;
  }
  auto* pins = rig.pattern()->GetPins();
  for (auto _ : state) {
    state.PauseTiming();
    rig.pattern()->ClearAllPinConfigs();
    state.ResumeTiming();
    for (int i = 0; i < pins->GetCount(); ++i) pins->GetAt(i)->SetPinConfig(i % 5, 1, false);
  }
  state.counters["seconds_per_switch"] =
      benchmark::Counter(static_cast<double>(state.range(0)),
                         benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

void BM_ConfigureEveryPin(benchmark::State& state) {
  ConfigureEveryPin(state, Platform::kKR40);
}
BENCHMARK(BM_ConfigureEveryPin)->Arg(1000)->Unit(benchmark::kMillisecond)->Iterations(3);

void BM_KR60ConfigureEveryPin(benchmark::State& state) {
  ConfigureEveryPin(state, Platform::kKR60);
}
BENCHMARK(BM_KR60ConfigureEveryPin)->Arg(1000)->Unit(benchmark::kMillisecond)->Iterations(3);

}  // namespace

BENCHMARK_MAIN();
