// The hardware of scripts: one prepared hardware per opened system, kept
// until the system is gone.
#include "ScriptHardware.h"

#include <cstdlib>
#include <memory>
#include <utility>

#include "SimHardware.h"
#include "automation/QFCAutomationCall.h"
#include "automation/QFCFaultInjectionImpl.h"
#include "automation/QFCSystemImpl.h"
#include "systems/QFCSystem.h"

namespace faultbox::python {

namespace {

namespace bench = faultbox::sim;

struct SystemBench {
  // Detached once the system is gone; the bench then goes too.
  std::shared_ptr<QFCSystemImpl> wrapper;
  const QFCSystem* system;
  std::unique_ptr<bench::Hardware> hardware;
};

// The variable that chooses the hardware of scripts that do not choose
// themselves, for a whole test run.
constexpr const char* kHardwareVariable = "FAULTBOX_HARDWARE";

// "" or "config": the settings' hardware, as on the command line; "sim" only
// when a script or the variable asks for it.
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

bool IsChoice(const std::string& choice) {
  return choice == bench::kHardwareSim || choice == bench::kHardwareConfig;
}

HRESULT Select(const std::string& choice) {
  if (!IsChoice(choice))
    return RaiseError(E_FAULTBOX_INVALID_PARAMETER,
                      "The hardware is \"sim\" or \"config\", not \"" + choice + "\".");
  g_choice = choice;
  return FAULTBOX_OK;
}

HRESULT Prepare(QFCSystem& system) {
  if (!g_choice.empty() && !IsChoice(g_choice))
    return RaiseError(E_FAULTBOX_INVALID_PARAMETER, std::string("The environment variable ") +
                                                        kHardwareVariable + " is \"" + g_choice +
                                                        "\"; write sim or config.");
  // The benches of closed systems go with them.
  DropBenchesOfClosedSystems();
  // A simulated bench that cannot start (message 932) fails the open: the
  // system would otherwise reach the settings' hardware.
  std::unique_ptr<bench::Hardware> hardware = bench::PrepareHardware(g_choice, system);
  if (!hardware)
    return RaiseError(E_FAULTBOX, "The simulated bench for " + system.GetPinFilePath() + " cannot start.");
  g_benches.push_back({QFCSystemImpl::Of(system), &system, std::move(hardware)});
  return FAULTBOX_OK;
}

}  // namespace

void InstallScriptHardware() {
  const char* chosen = std::getenv(kHardwareVariable);
  g_choice = chosen ? chosen : "";
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

BenchOperation::BenchOperation(const QFCSystem* system)
    : system_(system), wasConnected_(system != nullptr && system->IsConnected()) {
  if (bench::Hardware* hardware = HardwareOf(system_)) hardware->BeginOperation();
}

void BenchOperation::Done(bool executed) {
  bench::Hardware* hardware = HardwareOf(system_);
  if (hardware == nullptr) return;
  hardware->Settle(executed);
  if (!wasConnected_ && system_->IsConnected()) hardware->NoteConnected(*system_);
}

}  // namespace faultbox::python
