// The hardware of scripts: one prepared hardware per opened system, kept
// until the system is gone.
#include "ScriptHardware.h"

#include <memory>
#include <utility>

#include "SimHardware.h"
#include "automation/QFCAutomationCall.h"
#include "automation/QFCFaultInjectionImpl.h"
#include "automation/QFCSystemImpl.h"

namespace faultbox::python {

namespace {

namespace bench = faultbox::sim;

struct SystemBench {
  // Detached once the system is gone; the bench then goes too.
  std::shared_ptr<QFCSystemImpl> wrapper;
  const QFCSystem* system;
  std::unique_ptr<bench::Hardware> hardware;
};

// "" until a script chooses: the settings decide, as on the command line.
std::string g_choice;
std::vector<SystemBench> g_benches;

void DropBenchesOfClosedSystems() {
  std::erase_if(g_benches, [](const SystemBench& entry) { return !entry.wrapper->IsAttached(); });
}

bench::Hardware* HardwareOf(const QFCSystem* system) {
  for (const SystemBench& entry : g_benches)
    if (entry.system == system && entry.wrapper->IsAttached()) return entry.hardware.get();
  return nullptr;
}

HRESULT Select(const std::string& choice) {
  if (choice != bench::kHardwareSim && choice != bench::kHardwareConfig)
    return RaiseError(E_FAULTBOX_INVALID_PARAMETER, "The hardware is \"sim\" or \"config\", not \"" + choice + "\".");
  g_choice = choice;
  return FAULTBOX_OK;
}

void Prepare(QFCSystem& system) {
  // A closed system's simulated bench may hold the name or port a new one needs.
  DropBenchesOfClosedSystems();
  // Without hardware (message 932 reported) the system still opens; its
  // connect then finds nothing to talk to.
  std::unique_ptr<bench::Hardware> hardware = bench::PrepareHardware(g_choice, system);
  if (hardware) g_benches.push_back({QFCSystemImpl::Of(system), &system, std::move(hardware)});
}

}  // namespace

void InstallScriptHardware() {
  QFCFaultInjectionImpl::SetScriptHardware({Select, Prepare});
}

void ReleaseScriptHardware() {
  QFCFaultInjectionImpl::SetScriptHardware({});
  g_benches.clear();
}

std::vector<std::string> SimulatedRelays(const QFCSystem& system) {
  bench::Hardware* hardware = HardwareOf(&system);
  return hardware ? hardware->RelayLines() : std::vector<std::string>{};
}

BenchOperation::BenchOperation(const QFCSystem* system) : system_(system) {
  if (bench::Hardware* hardware = HardwareOf(system_)) hardware->BeginOperation();
}

void BenchOperation::Done(bool executed) {
  if (bench::Hardware* hardware = HardwareOf(system_)) hardware->Settle(executed);
}

}  // namespace faultbox::python
