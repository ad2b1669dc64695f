// The hardware that `faultbox activate`, `faultbox shell` and scripts drive: the
// bench the settings' channel and port tables name, or, only when asked for,
// a built-in simulated bench for the document's pin files, which the command
// starts and ties the system to for as long as the system lives.
#pragma once

#include <memory>
#include <string>
#include <vector>

namespace faultbox {
class QFCSystem;
}

namespace faultbox::sim {

// The values of --hardware; "" is the settings' hardware.
constexpr const char* kHardwareSim = "sim";
constexpr const char* kHardwareConfig = "config";

class Hardware {
 public:
  virtual ~Hardware() = default;

  // One line that says which hardware the command drives.
  virtual std::string Description() const = 0;
  virtual bool IsSimulated() const { return false; }
  // Whether the hardware can be reached at all, looked at without opening
  // it; false with message 940 naming what is missing. Nothing is switched.
  virtual bool CheckPresent() const { return true; }
  // Says (warning 941) that `system`, just connected, switches no real relay
  // when the hardware is a simulated bench.
  virtual void NoteConnected(const QFCSystem& system) const { (void)system; }
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

// The hardware for `choice` ("sim", or "config" and "" for the settings'
// tables, with their defaults for what they do not name) and the system's
// platform. The simulator is a bench of the system's own, which the system
// is tied to (QFCSystem::SetHardwareRoute) and which must outlive it.
// nullptr (message 932 reported) when the simulated bench cannot start.
std::unique_ptr<Hardware> PrepareHardware(const std::string& choice, QFCSystem& system);

}  // namespace faultbox::sim
