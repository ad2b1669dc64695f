// The CAN access driver "sim": each of its channels is a participant on the
// in-process bus of a simulated KR60 bench, which it starts on first use.
#include <sys/stat.h>

#include <mutex>

#include "kr60/KR60Simulator.h"
#include "platform/can/SocketcandProtocol.h"

namespace faultbox::sim {
namespace {

constexpr std::size_t kMaxBenchName = 60;

struct Bench {
  KR60SimulatorOptions options;
  std::string bus;  // the in-process bus the bench and its channels share
  std::shared_ptr<KR60Simulator> running;
};

struct Benches {
  std::mutex mutex;
  std::map<std::string, Bench> byName;
  int unnamed = 0;
};

// Never destroyed: the driver table of the layer, which holds the driver,
// outlives every other static object too.
Benches& TheBenches() {
  static Benches* benches = new Benches;
  return *benches;
}

bool IsRegularFile(const std::string& path) {
  struct stat s {};
  return ::stat(path.c_str(), &s) == 0 && S_ISREG(s.st_mode);
}

bool IsBenchName(const std::string& name) {
  return name.size() <= kMaxBenchName && IsValidSocketcandBusName(name);
}

// The bus of the bench behind `name`, started if it does not run; "" with
// the reason when there is no such bench or it cannot start.
std::string EnsureBench(const std::string& name, CanResult* result, std::string* error) {
  Benches& benches = TheBenches();
  std::lock_guard<std::mutex> lock(benches.mutex);
  auto it = benches.byName.find(name);
  if (it == benches.byName.end()) {
    if (!IsRegularFile(name)) {
      *result = CanResult::kNoChannel;
      *error = "no simulated bench \"" + name + "\" (define one, or name a KR60 pin file)";
      return {};
    }
    Bench bench;
    bench.options.pinFile = name;
    // A path is rarely a bus name; the bus gets a name of its own.
    bench.bus = "kr60sim-" + std::to_string(++benches.unnamed);
    it = benches.byName.emplace(name, std::move(bench)).first;
  }
  Bench& bench = it->second;
  if (!bench.running) {
    KR60SimulatorOptions options = bench.options;
    options.target = "virtual:" + bench.bus;
    std::unique_ptr<KR60Simulator> started = KR60Simulator::Start(options, error);
    if (!started) {
      *result = CanResult::kNoChannel;
      return {};
    }
    bench.running = std::move(started);
  }
  return bench.bus;
}

class SimDriver final : public CanDriver {
 public:
  bool IsAvailable(const std::string& interfaceName) override {
    Benches& benches = TheBenches();
    {
      std::lock_guard<std::mutex> lock(benches.mutex);
      if (benches.byName.count(interfaceName) != 0) return true;
    }
    return IsRegularFile(interfaceName);
  }

  std::unique_ptr<CanDriverChannel> Open(const std::string& interfaceName, std::shared_ptr<CanFrameSink> sink,
                                         CanResult* result, std::string* error) override {
    const std::string bus = EnsureBench(interfaceName, result, error);
    if (bus.empty()) return nullptr;
    std::shared_ptr<CanDriver> virtualBus = CanAccess::FindDriver("virtual");
    if (!virtualBus) {
      *result = CanResult::kNoChannel;
      *error = "no in-process bus driver";
      return nullptr;
    }
    return virtualBus->Open(bus, std::move(sink), result, error);
  }
};

std::shared_ptr<KR60Simulator> TakeRunning(const std::string& name, bool forget) {
  Benches& benches = TheBenches();
  std::lock_guard<std::mutex> lock(benches.mutex);
  auto it = benches.byName.find(name);
  if (it == benches.byName.end()) return nullptr;
  std::shared_ptr<KR60Simulator> running = std::move(it->second.running);
  if (forget) benches.byName.erase(it);
  return running;
}

}  // namespace

bool RegisterKR60SimDriver() {
  static const std::shared_ptr<CanDriver> driver = std::make_shared<SimDriver>();
  // Registered again after an unregistration; another driver of the name is left alone.
  const std::shared_ptr<CanDriver> present = CanAccess::FindDriver("sim");
  if (present) return present == driver;
  return CanAccess::RegisterDriver("sim", driver) || CanAccess::FindDriver("sim") == driver;
}

bool DefineKR60SimBench(const std::string& name, const KR60SimulatorOptions& options) {
  if (!IsBenchName(name)) return false;
  std::shared_ptr<KR60Simulator> old = TakeRunning(name, true);
  // Stopped outside the lock: its thread may be handing out an event.
  if (old) old->Stop();
  Benches& benches = TheBenches();
  std::lock_guard<std::mutex> lock(benches.mutex);
  Bench bench;
  bench.options = options;
  bench.bus = "sim." + name;
  benches.byName[name] = std::move(bench);
  return true;
}

std::shared_ptr<KR60Simulator> FindKR60SimBench(const std::string& name) {
  Benches& benches = TheBenches();
  std::lock_guard<std::mutex> lock(benches.mutex);
  auto it = benches.byName.find(name);
  return it == benches.byName.end() ? nullptr : it->second.running;
}

void RemoveKR60SimBench(const std::string& name) {
  std::shared_ptr<KR60Simulator> old = TakeRunning(name, true);
  if (old) old->Stop();
}

void RemoveAllKR60SimBenches() {
  std::vector<std::shared_ptr<KR60Simulator>> old;
  {
    Benches& benches = TheBenches();
    std::lock_guard<std::mutex> lock(benches.mutex);
    for (auto& [name, bench] : benches.byName)
      if (bench.running) old.push_back(std::move(bench.running));
    benches.byName.clear();
  }
  for (auto& sim : old) sim->Stop();
}

}  // namespace faultbox::sim
