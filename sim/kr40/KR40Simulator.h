// A simulated KR40/KR80 relay bench behind a pseudo-terminal: a thread on the
// master side decodes the byte protocols of the serial line, answers the
// checksums that protocol A expects and keeps the relay state of every module,
// so that tests and engineers without hardware can drive the real serial port
// code against it.
#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "SimulatorThread.h"

namespace faultbox {
class PseudoTerminal;
}

namespace faultbox::sim {

// A: single-byte commands with checksum answers (board types other than KR80).
// B: no answers at all (board types "KR80" and "KR080").
enum class KR40Protocol { kA, kB };

// The protocol a bench of this board type speaks.
KR40Protocol ProtocolForBoardType(std::string_view boardType);

enum class KR40FaultMode {
  kNone,
  kSilent,         // no module answers; the bytes are still decoded and switch relays (a broken answer line)
  kWrongChecksum,  // every answer is the complement of the right one
  kLate,           // every answer leaves `lateBy` after the byte that asked for it
};

struct KR40Fault {
  KR40FaultMode mode = KR40FaultMode::kNone;
  std::chrono::milliseconds lateBy{200};
  // Answers that are still given correctly before the fault sets in, counted
  // from the moment the fault is set: lets a test break a transfer at its
  // second or third answer rather than at the first.
  std::uint64_t afterAnswers = 0;
};

// Module address -> relay number (1..10) -> state. Only switched relays are
// listed: a relay in state 0 is off and absent from the map.
using KR40RelayStates = std::map<std::uint32_t, std::map<std::uint32_t, std::uint32_t>>;

struct KR40Event {
  enum class Kind { kExecute, kReset };
  Kind kind = Kind::kExecute;
  std::uint64_t number = 0;  // 1 for the first execute (or reset) since the start
  KR40RelayStates states;    // after the execute or reset took effect
};

struct KR40Counters {
  std::uint64_t bytesProcessed = 0;  // decoded bytes, whatever they meant
  std::uint64_t executes = 0;
  std::uint64_t resets = 0;
  std::uint64_t answers = 0;       // answer bytes written to the line
  std::uint64_t ignoredBytes = 0;  // bytes that fit nowhere in the protocol
};

struct KR40SimulatorOptions {
  KR40Protocol protocol = KR40Protocol::kA;
  // A KR40-family pin file: only the modules its pins name are present.
  // Empty: see `modules`.
  std::string pinFile;
  std::int32_t ecuVersion = 1;
  // Further present modules (0..127). With neither a pin file nor modules
  // given, every address is present.
  std::set<std::uint32_t> modules;
  KR40Fault fault;
  // The line at 9600 bit/s, 10 bits per byte: each byte is taken in about
  // 1.04 ms after the previous one and each answer needs as long again.
  bool timing = false;
  // Called on the simulator thread after every execute and reset, without
  // any lock held; it must not call Stop().
  std::function<void(const KR40Event&)> onEvent;
};

class KR40Simulator : public SimulatorThread<KR40Counters> {
 public:
  // One byte on a 9600 bit/s 8N1 line: start bit, 8 data bits, stop bit.
  static constexpr std::chrono::nanoseconds kByteTime{10'000'000'000LL / 9600};
  // Bytes kept by ReceivedBytes(); older ones are dropped.
  static constexpr std::size_t kLogLimit = 1 << 20;

  // Opens the pseudo-terminal, reads the pin file and starts the thread.
  // nullptr with `error` set when any of that fails.
  static std::unique_ptr<KR40Simulator> Start(const KR40SimulatorOptions& options,
                                              std::string* error = nullptr);
  ~KR40Simulator();

  // Ends the thread; answers still waiting to be sent are dropped. Safe to
  // call twice.
  void Stop();

  // The device path a serial port opens to reach the bench (/dev/pts/N).
  const std::string& PortPath() const;
  KR40Protocol Protocol() const { return protocol_; }
  // Whether a module of this address is present (answers and switches).
  bool HasModule(std::uint32_t address) const;

  KR40RelayStates RelayStates() const;
  // The state of one relay, 0 when off.
  std::uint32_t RelayState(std::uint32_t module, std::uint32_t relay) const;
  // Every byte decoded so far (the last kLogLimit), and every answer sent.
  std::vector<std::uint8_t> ReceivedBytes() const;
  std::vector<std::uint8_t> SentBytes() const;

  void SetFaultMode(const KR40Fault& fault);
  void SetFaultMode(KR40FaultMode mode) { SetFaultMode(KR40Fault{mode}); }

  // Wait until the counters reach the given totals (counted since the
  // start); false when `limit` passed first. WaitForResets and
  // WaitForAnswers come with the counters.
  bool WaitForProcessed(std::size_t bytes, std::chrono::milliseconds limit) const;
  bool WaitForExecutes(std::size_t count, std::chrono::milliseconds limit) const;

 private:
  using Clock = std::chrono::steady_clock;
  struct Timed {
    Clock::time_point due;
    std::uint8_t byte;
  };
  enum class Expect { kAny, kAddress, kRelay };

  KR40Simulator(const KR40SimulatorOptions& options, std::unique_ptr<PseudoTerminal> pty);
  bool Open(std::string* error);
  void Run();
  void Process(Clock::time_point now);
  // With mutex_ held.
  void FlushAnswers(Clock::time_point now);
  // Until the next byte is due on the line or the next answer is due to
  // leave; none when nothing waits.
  std::optional<std::chrono::nanoseconds> NextWait(Clock::time_point now) const;

  // Decoding: called with mutex_ held; the events they produce are handed
  // out once the lock is released.
  void DecodeA(std::uint8_t byte, Clock::time_point received);
  void DecodeB(std::uint8_t byte);
  void Select(std::uint32_t address);
  void Stage(std::uint32_t relay, std::uint32_t state);
  void Execute();
  void Reset();
  void AnswerPoint(Clock::time_point received);
  bool Present(std::uint32_t address) const;

  const KR40Protocol protocol_;
  const bool timing_;
  const std::function<void(const KR40Event&)> onEvent_;
  std::unique_ptr<PseudoTerminal> pty_;
  int slaveFd_ = -1;  // held open so that the master never sees a hang-up between users
  int wakeFd_ = -1;

  // Owned by the simulator thread.
  std::deque<Timed> input_;   // bytes read, waiting for their time on the line
  std::deque<Timed> output_;  // answers waiting to be written
  Clock::time_point lineFreeIn_{};
  Clock::time_point lineFreeOut_{};

  // Guarded by mutex_, with the counters.
  std::set<std::uint32_t> modules_;
  bool allModules_ = false;
  KR40Fault fault_;
  std::uint64_t answersSinceFault_ = 0;
  KR40RelayStates relays_;
  KR40RelayStates staged_;  // switched at the next execute
  Expect expect_ = Expect::kAny;
  std::optional<std::uint32_t> selected_;
  std::uint32_t pendingState_ = 0;
  std::uint32_t sum_ = 0;  // bytes since the last answer point
  std::deque<std::uint8_t> received_;
  std::vector<std::uint8_t> sent_;
  std::vector<KR40Event> events_;  // produced under the lock, handed out after it
};

}  // namespace faultbox::sim
