// The hardware of a session: the settings' tables as they are, or a
// simulated bench of the system's own, built from its pin files, that the
// system is tied to.
#include "SimHardware.h"

#include <sys/stat.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <map>
#include <set>

#include "config/QFCAbstractHardwareInfo.h"
#include "config/QFCAbstractPin.h"
#include "config/QFCECU.h"
#include "platform/QFCReporter.h"
#include "kr40/KR40Simulator.h"
#include "kr60/KR60Simulator.h"
#include "platform/CanAccess.h"
#include "platform/SerialPort.h"
#include "platform/Settings.h"
#include "systems/QFCSystem.h"

namespace faultbox::sim {
namespace {

constexpr int kMsgSimulatorFailed = 932;
constexpr int kMsgHardwareMissing = 940;
constexpr int kMsgSimulatedBench = 941;
// The simulated serial bench needs microseconds per byte; this bound only
// matters when it has stopped.
constexpr std::chrono::milliseconds kSettleLimit{5000};

std::string HexAddress(std::uint32_t value, int digits) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%0*X", digits, value);
  return text;
}

// "relay 3" or "relays 3, 5, 7".
std::string RelayList(const std::vector<std::string>& relays) {
  std::string out = relays.size() == 1 ? "relay " : "relays ";
  for (std::size_t i = 0; i < relays.size(); ++i) out += (i == 0 ? "" : ", ") + relays[i];
  return out;
}

std::vector<std::string> AllOffUnlessAny(std::vector<std::string> lines) {
  if (lines.empty()) lines.push_back("all relays off");
  return lines;
}

// ---- the settings' hardware

class ConfiguredHardware final : public Hardware {
 public:
  explicit ConfiguredHardware(const QFCSystem& system) {
    if (system.GetPlatformType() == fptKR60Platform) {
      const QFTCANInterfaceSettings& can = system.GetCANSettings();
      const auto target = CanChannelTable::Lookup(can.deviceType, can.firstParameter, can.secondParameter);
      const std::string channel = "device type " + std::to_string(can.deviceType) + ", board " +
                                  std::to_string(can.firstParameter) + ", channel " +
                                  std::to_string(can.secondParameter);
      description_ = "hardware: CAN channel " + (target ? target->Text() : std::string("(none)")) + " (" +
                     channel + ", from the settings " + Settings::Path() + ")";
      if (!target) {
        missing_ = "The CAN channel of " + channel;
        why_ = "the channel table of the settings names no interface for it";
      } else if (const auto driver = CanAccess::FindDriver(target->driver); !driver) {
        missing_ = "The CAN interface " + target->Text();
        why_ = "there is no CAN driver \"" + target->driver + "\"";
      } else if (!driver->IsAvailable(target->interfaceName)) {
        missing_ = "The CAN interface " + target->Text();
        why_ = target->driver == "socketcan" ? "the kernel has no CAN interface " + target->interfaceName
                                             : "the driver does not know it";
      }
    } else {
      const std::string port = system.GetSerialSettings().portName;
      const std::string device = SerialPort::DevicePath(port);
      description_ = "hardware: serial port " + port + " at " + (device.empty() ? "(no device)" : device) +
                     " (from the settings " + Settings::Path() + ")";
      struct stat info {};
      const bool exists = !device.empty() && ::stat(device.c_str(), &info) == 0;
      if (device.empty()) {
        missing_ = "The serial port " + port;
        why_ = "the port table of the settings names no device for it";
      } else if (!exists || !S_ISCHR(info.st_mode)) {
        missing_ = "The serial port " + port + " at " + device;
        why_ = exists ? "it is no serial device" : "there is no such device";
      }
    }
  }
  std::string Description() const override { return description_; }
  bool CheckPresent() const override {
    if (missing_.empty()) return true;
    TheReporter().ReportError(kMsgHardwareMissing, missing_, why_);
    return false;
  }

 private:
  std::string description_;
  std::string missing_;  // "" when everything needed is there
  std::string why_;
};

// The warning every connect to a simulated bench gives: a script that was
// meant for the bench must not pass unnoticed.
void WarnSimulated(const QFCSystem& system, const std::string& bench) {
  TheReporter().ReportWarning(kMsgSimulatedBench, system.GetName(), bench);
}

// ---- the simulated KR60 bench: the CAN driver "sim" on the system's pin file

class KR60SimHardware final : public Hardware {
 public:
  ~KR60SimHardware() override { sim::RemoveKR60SimBench(bench_); }

  bool Start(QFCSystem& system) {
    pinFile_ = system.GetPinFilePath();
    // A bus of its own for every system, so that nothing else in the process
    // meets it and closing another system never touches it.
    static std::atomic<int> benches{0};
    bench_ = "faultbox-bench-" + std::to_string(++benches);
    if (!sim::RegisterKR60SimDriver()) return Failed("the CAN driver name \"sim\" is taken");
    sim::KR60SimulatorOptions options;
    options.pinFile = pinFile_;
    options.ecuVersion = system.GetECUVersion();
    if (!sim::DefineKR60SimBench(bench_, options)) return Failed("the bench cannot be defined");
    // The bench starts when a channel first opens it; opening one here tells
    // at once when the pin file cannot make a bench.
    const std::string target = std::string("sim:") + bench_;
    CanHandle probe = 0;
    if (CanAccess::RegisterInterfaceTarget(target, &probe) != CanResult::kOk)
      return Failed(CanAccess::LastErrorText());
    CanAccess::UnRegisterInterface(probe);
    system.SetHardwareRoute(target);
    return true;
  }

  std::string Description() const override {
    return "hardware: simulated KR60 bench (built-in simulator) for " + pinFile_;
  }
  bool IsSimulated() const override { return true; }
  void NoteConnected(const QFCSystem& system) const override { WarnSimulated(system, "KR60 " + bench_); }

  std::vector<std::string> RelayLines() const override {
    std::vector<std::string> lines;
    const std::shared_ptr<sim::KR60Simulator> bench = sim::FindKR60SimBench(bench_);
    if (!bench) return {"the simulated bench is not running"};
    for (const auto& [id, vector] : bench->RelayVectors()) {
      const std::string relays = RelaysOn(id.type, vector);
      if (!relays.empty())
        lines.push_back(std::string(sim::KR60ModuleTypeName(id.type)) + " " + HexAddress(id.address, 3) +
                        ": " + relays);
    }
    return AllOffUnlessAny(std::move(lines));
  }

 private:
  bool Failed(const std::string& why) {
    TheReporter().ReportError(kMsgSimulatorFailed, pinFile_, why);
    return false;
  }

  // In the terms the failure classes use: FIU relay positions 5 to 42, LOAD
  // relays 0 to 4 per load channel, RSIM relays 0 to 31. A bit of 0 is a
  // relay that is on.
  static std::string RelaysOn(sim::KR60ModuleType type, std::uint64_t vector) {
    const auto on = [vector](int bit) { return bit >= 0 && ((vector >> bit) & 1u) == 0; };
    if (type == sim::KR60ModuleType::kLOAD) {
      std::vector<std::string> channels;
      for (std::uint32_t channel = 0; channel <= 9; ++channel) {
        std::vector<std::string> relays;
        for (std::uint32_t relay = 0; relay <= 4; ++relay)
          if (on(sim::KR60Simulator::LoadRelayBit(channel, relay))) relays.push_back(std::to_string(relay));
        if (!relays.empty())
          channels.push_back("channel " + std::to_string(channel) + " " + RelayList(relays) + " on");
      }
      std::string out;
      for (const std::string& c : channels) out += (out.empty() ? "" : "; ") + c;
      return out;
    }
    std::vector<std::string> relays;
    if (type == sim::KR60ModuleType::kFIU) {
      for (std::uint32_t position = 5; position <= 42; ++position)
        if (on(sim::KR60Simulator::FiuRelayBit(position))) relays.push_back(std::to_string(position));
    } else {
      for (int bit = 0; bit < 32; ++bit)
        if (on(bit)) relays.push_back(std::to_string(bit));
    }
    return relays.empty() ? std::string() : RelayList(relays) + " on";
  }

  std::string pinFile_;
  std::string bench_;
};

// ---- the simulated KR40 or KR80 bench behind a pseudo-terminal

class KR40SimHardware final : public Hardware {
 public:
  ~KR40SimHardware() override {
    if (sim_) sim_->Stop();
  }

  bool Start(QFCSystem& system) {
    pinFile_ = system.GetPinFilePath();
    board_ = system.GetPinFileBoardType();
    sim::KR40SimulatorOptions options;
    options.protocol = sim::ProtocolForBoardType(board_);
    options.pinFile = pinFile_;
    options.ecuVersion = system.GetECUVersion();
    // The simulator reads the main pin file; the modules of additional pin
    // files are there too.
    for (const QFCECU* ecu : system.GetECUs())
      for (int i = 0; i < ecu->GetPinCount(); ++i)
        if (const std::uint32_t address = ecu->GetPin(i)->GetModuleAddress(); address != 0 && address < 128)
          options.modules.insert(address);
    std::string error;
    sim_ = sim::KR40Simulator::Start(options, &error);
    if (!sim_) {
      TheReporter().ReportError(kMsgSimulatorFailed, pinFile_, error);
      return false;
    }
    port_ = system.GetSerialSettings().portName;
    system.SetHardwareRoute(sim_->PortPath());
    return true;
  }

  std::string Description() const override {
    return "hardware: simulated " + board_ + " bench (built-in simulator, protocol " +
           (sim_->Protocol() == sim::KR40Protocol::kA ? "A" : "B") + ") for " + pinFile_ + ", port " + port_ +
           " at " + sim_->PortPath();
  }
  bool IsSimulated() const override { return true; }
  void NoteConnected(const QFCSystem& system) const override {
    WarnSimulated(system, board_ + " at " + sim_->PortPath());
  }

  void BeginOperation() override { before_ = sim_->Counters(); }
  void Settle(bool executed) override {
    if (executed) {
      sim_->WaitForExecutes(before_.executes + 1, kSettleLimit);
      return;
    }
    // Without an execute the relays change only by a reset: the one after a
    // failed transfer, which comes only when the bench was sent something.
    if (sim_->Counters().bytesProcessed > before_.bytesProcessed && sim_->Counters().resets == before_.resets)
      sim_->WaitForResets(before_.resets + 1, kSettleLimit);
  }

  std::vector<std::string> RelayLines() const override {
    std::vector<std::string> lines;
    for (const auto& [module, relays] : sim_->RelayStates()) {
      std::vector<std::string> on;
      for (const auto& [relay, state] : relays)
        on.push_back(std::to_string(relay) + " (state " + std::to_string(state) + ")");
      if (!on.empty()) lines.push_back("FIU " + HexAddress(module, 2) + ": " + RelayList(on) + " on");
    }
    return AllOffUnlessAny(std::move(lines));
  }

 private:
  std::unique_ptr<sim::KR40Simulator> sim_;
  sim::KR40Counters before_;
  std::string pinFile_;
  std::string board_;
  std::string port_;
};

}  // namespace

std::unique_ptr<Hardware> PrepareHardware(const std::string& choice, QFCSystem& system) {
  if (choice != kHardwareSim) return std::make_unique<ConfiguredHardware>(system);
  if (system.GetPlatformType() == fptKR60Platform) {
    auto hardware = std::make_unique<KR60SimHardware>();
    if (!hardware->Start(system)) return nullptr;
    return hardware;
  }
  auto hardware = std::make_unique<KR40SimHardware>();
  if (!hardware->Start(system)) return nullptr;
  return hardware;
}

}  // namespace faultbox::sim
