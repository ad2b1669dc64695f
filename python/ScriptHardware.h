// The hardware of the systems scripts open: the settings' channel and port
// tables, or, when SelectHardware("sim") or FAULTBOX_HARDWARE=sim asks for
// it, a built-in simulated bench of each system's own. Every function here
// runs with the module's lock held.
#pragma once

#include <string>
#include <vector>

namespace faultbox {
class QFCSystem;
}

namespace faultbox::python {

// Puts the choice behind the root object's SelectHardware and readies the
// hardware of every system a script opens from then on.
void InstallScriptHardware();
// Ends every simulated bench. Runs after the systems are gone, since their
// channels and ports lead to the benches.
void ReleaseScriptHardware();

// The relays that are on in the simulated bench of `system`, one line per
// module, or "all relays off"; empty when the system runs on real hardware.
std::vector<std::string> SimulatedRelays(const QFCSystem& system);

// Brackets an operation that may switch relays of the system's bench: once it
// is done, a simulated bench has acted on everything the operation sent
// (`executed`: an execute or commit went out), so that the relays read next
// are the ones the operation left. An operation that connected the system to
// a simulated bench says so (warning 941).
class BenchOperation {
 public:
  explicit BenchOperation(const QFCSystem* system);
  void Done(bool executed);

 private:
  const QFCSystem* system_;
  bool wasConnected_;
};

}  // namespace faultbox::python
