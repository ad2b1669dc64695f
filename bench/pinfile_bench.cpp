// Load time of a large KR60 pin file against a plain read-and-split of the
// same bytes: the loader must stay linear in the number of pin lines, also
// when all pins belong to one ECU.
#include <benchmark/benchmark.h>

#include <stdlib.h>

#include <chrono>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <string_view>

#include "config/kr60/QFCKR60HardwareInfo.h"

namespace {

namespace fs = std::filesystem;

// The generated files live in a folder of their own, removed at exit.
struct TempFolder {
  fs::path path;
  TempFolder() {
    std::string pattern = (fs::temp_directory_path() / "faultbox-bench-XXXXXX").string();
    if (mkdtemp(pattern.data()) != nullptr) path = pattern;
  }
  ~TempFolder() {
    std::error_code ec;
    if (!path.empty()) fs::remove_all(path, ec);
  }
};

// A KR60 pin file with `pins` pin lines in one ECU, written once per size.
std::string PinFile(int pins) {
  static TempFolder folder;
  const fs::path path = folder.path / ("kr60-" + std::to_string(pins) + ".csv");
  if (fs::exists(path)) return path.string();
  std::ostringstream out;
  const char* eol = "\r\n";
  out << "/Comment;" << eol << "generated for the load benchmark;" << eol << "/CommentEnd;" << eol;
  out << "/Format;" << eol;
  for (const char* line :
       {"BoardType;KR60", "AdditionalFiles;none", "FaultClassFile;none", "Potential0;UBATT", "Potential1;GND",
        "Potential2;U5V", "Potential3;none", "Potential4;none", "OffsetCANAddress;none",
        "OffsetLoadAddress;10", "OffsetPowerSwitchAddress;none", "FIULoadAddress;0_15_1",
        "RSIMLoadAddress;0_15_2", "FIUCANAddress;none", "RSIMCANAddress(1);none", "RSIMCANAddress(2);none"}) {
    out << line << eol;
  }
  out << "/FormatEnd;" << eol << "/Signallist;" << eol << ";" << eol;
  out << "pin_name(1);ecu_name(1);faults_ecu(1);load_channels_required;load_module_id;load_module_channel;"
         "signal;"
         "comment"
      << eol;
  out << ";" << eol << ";" << eol << ";" << eol;
  for (int i = 0; i < pins; ++i) {
    out << "P" << i << ";ECM;1,2,3,7;2;" << (i / 4096) % 10 << "_" << (i / 256) % 16 << "_" << (i / 16) % 16
        << ";" << i % 5 << "," << i % 5 + 5 << ";SIGNAL_" << i << ";-" << eol;
  }
  out << "/SignallistEnd;" << eol;
  std::ofstream(path, std::ios::binary) << out.str();
  return path.string();
}

// The floor: read the file and split every line into its fields.
std::size_t ReadAndSplit(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  std::string data((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  std::size_t fields = 0;
  std::string_view rest(data);
  std::vector<std::string_view> split;
  while (!rest.empty()) {
    std::size_t end = rest.find("\r\n");
    std::string_view line = rest.substr(0, end);
    rest.remove_prefix(end == std::string_view::npos ? rest.size() : end + 2);
    split.clear();
    for (std::size_t pos = 0;;) {
      std::size_t sep = line.find(';', pos);
      split.push_back(line.substr(pos, sep == std::string_view::npos ? std::string_view::npos : sep - pos));
      if (sep == std::string_view::npos) break;
      pos = sep + 1;
    }
    fields += split.size();
  }
  return fields;
}

double Seconds(auto&& work, int rounds) {
  const auto start = std::chrono::steady_clock::now();
  for (int i = 0; i < rounds; ++i) work();
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count() / rounds;
}

void BM_LoadPinFile(benchmark::State& state) {
  const int pins = static_cast<int>(state.range(0));
  const std::string path = PinFile(pins);
  for (auto _ : state) {
    faultbox::QFCKR60HardwareInfo info(path, 1, nullptr);
    if (info.LoadPinFile(false) != faultbox::FAULTBOX_OK ||
        info.GetPinCount() != static_cast<std::size_t>(pins)) {
      state.SkipWithError("load failed");
      break;
    }
  }
  // The floor measured in the same process, for the ratio.
  const double plain = Seconds([&] { benchmark::DoNotOptimize(ReadAndSplit(path)); }, 5);
  const double load = Seconds(
      [&] {
        faultbox::QFCKR60HardwareInfo info(path, 1, nullptr);
        benchmark::DoNotOptimize(info.LoadPinFile(false));
      },
      3);
  state.counters["pins"] = pins;
  state.counters["load_ms"] = load * 1e3;
  state.counters["plain_ms"] = plain * 1e3;
  state.counters["ratio"] = load / plain;
}
BENCHMARK(BM_LoadPinFile)->Arg(10000)->Arg(100000)->Unit(benchmark::kMillisecond);

void BM_ReadAndSplit(benchmark::State& state) {
  const std::string path = PinFile(static_cast<int>(state.range(0)));
  for (auto _ : state) benchmark::DoNotOptimize(ReadAndSplit(path));
}
BENCHMARK(BM_ReadAndSplit)->Arg(10000)->Arg(100000)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
