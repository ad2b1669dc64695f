// The hardware that `faultbox activate`, `faultbox shell` and scripts drive: the
// bench the settings' channel and port tables name, or the built-in
// simulated bench for the document's pin files, which the command starts
// and points the system at for as long as it runs.
#pragma once

#include <memory>
#include <string>
#include <vector>

namespace faultbox {
class QFCSystem;
}

namespace faultbox::sim {

// The values of --hardware; "" lets the settings decide.
constexpr const char* kHardwareSim = "sim";
constexpr const char* kHardwareConfig = "config";

class Hardware {
 public:
  virtual ~Hardware() = default;

  // One line that says which hardware the command drives.
  virtual std::string Description() const = 0;
  virtual bool IsSimulated() const { return false; }
  // Brackets an operation that may switch relays. A simulated serial bench
  // decodes the bytes on its own thread; Settle returns once it has acted on
  // what the operation sent (an execute when `executed`, else a reset when
  // one may have gone out), so that the relays shown afterwards are the
  // ones the operation left. Waits are bounded.
  virtual void BeginOperation() {}
  virtual void Settle(bool executed) { (void)executed; }
  // The relays of the simulated bench that are on, one line per module, or
  // the single line "all relays off"; empty for real hardware.
  virtual std::vector<std::string> RelayLines() const { return {}; }
};

// True when the settings name a CAN channel or a serial port: then the
// settings' hardware is the default, else the simulator.
bool SettingsNameHardware();

// The hardware for `choice` ("sim", "config" or "" for the default) and the
// system's platform. With the simulator, the system's CAN channels or serial
// port lead to it until the object goes away. nullptr (message 932
// reported) when the simulated bench cannot start.
std::unique_ptr<Hardware> PrepareHardware(const std::string& choice, QFCSystem& system);

}  // namespace faultbox::sim
