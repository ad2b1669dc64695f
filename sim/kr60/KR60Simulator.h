// A simulated KR60 bench on a CAN bus: FIU, LOAD and RSIM modules that decode
// the frames of the bus, answer them as the real modules do and keep their
// relay states, so that tests and engineers without hardware can drive the
// real CAN transfer code against it. It joins the bus through the CAN access
// layer: an in-process bus, the TCP bus of the hub, or a kernel interface.
#pragma once

#include <chrono>
#include <compare>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "SimulatorThread.h"
#include "platform/CanAccess.h"

namespace faultbox::sim {

// The module types as messages and relay state records number them; the
// identifier codes them differently (LOAD 1, FIU 2, RSIM 3).
enum class KR60ModuleType : std::uint32_t { kFIU = 1, kLOAD = 2, kRSIM = 3 };

const char* KR60ModuleTypeName(KR60ModuleType type);  // "FIU", "LOAD", "RSIM"

struct KR60ModuleId {
  KR60ModuleType type = KR60ModuleType::kFIU;
  std::uint32_t address = 0;  // 1..0xFFF; 0 on the bus addresses every module of the type
  auto operator<=>(const KR60ModuleId&) const = default;
};

enum class KR60FaultMode {
  kNone,
  kSilent,           // the module acts on every frame but never answers (a broken transmitter)
  kRefuse,           // the module refuses every frame (byte 2 = 0x14) and acts on none
  kLate,             // every answer leaves `lateBy` after the frame that asked for it
  kWrongIdentifier,  // answers carry direction bits 10 instead of 01
  kWrongContent,     // answers carry byte 0 = 0x8x instead of 0x4x
};

struct KR60Fault {
  KR60FaultMode mode = KR60FaultMode::kNone;
  std::chrono::milliseconds lateBy{200};
  // Answers a module still gives correctly before the fault sets in, counted
  // from the moment the fault is set: lets a test break a transfer at its
  // second or third frame rather than at the first.
  std::uint64_t afterAnswers = 0;
};

struct KR60Counters {
  std::uint64_t frames = 0;    // frames taken off the bus and decoded, whoever they were for
  std::uint64_t requests = 0;  // frames that reached at least one module of the bench
  std::uint64_t relayFrames = 0;
  std::uint64_t commits = 0;
  std::uint64_t resets = 0;
  std::uint64_t answers = 0;  // answer frames put on the bus
  std::uint64_t refused = 0;  // answers with byte 2 = 0x14 (unknown command or the refusing fault)
  std::uint64_t ignored = 0;  // frames for no module of this bench (other offset, answers, 11-bit, ...)
};

// A module took a commit (the loaded vector takes effect) or a reset
// (everything off); `before` and `after` are its relays in effect.
struct KR60Event {
  enum class Kind { kCommit, kReset };
  Kind kind = Kind::kCommit;
  KR60ModuleId module;
  std::uint64_t before = 0;
  std::uint64_t after = 0;
};

struct KR60SimulatorOptions {
  // A KR60 pin file: the FIU module at "FIULoadAddress", the RSIM module at
  // "RSIMLoadAddress" (each unless "none"), one LOAD module per load module
  // address of the pins (additional pin files included), all under
  // "OffsetLoadAddress".
  std::string pinFile;
  std::int32_t ecuVersion = 1;
  // The offset the modules listen under (low 11 bits); taken from the pin
  // file when not given. Required without a pin file.
  std::optional<std::uint32_t> offset;
  // Further modules, or the only ones without a pin file.
  std::vector<KR60ModuleId> modules;
  // The channel to sit on, "driver:interface": "virtual:bench1",
  // "tcp:127.0.0.1:29536/bench1", "socketcan:vcan0".
  std::string target = "virtual:kr60";
  KR60Fault fault;                                 // of every module
  std::map<KR60ModuleId, KR60Fault> moduleFaults;  // overrides `fault` for these modules
  // Frames take their time on a 125000 bit/s bus (exact length with stuff
  // bits), the bus carries one frame at a time, and simultaneous answers go
  // out in the order of their identifiers, as arbitration has it. Without
  // it the modules answer at once.
  bool timing = false;
  // Called on the simulator thread after every commit and reset, module by
  // module, without any lock held; it must not call Stop().
  std::function<void(const KR60Event&)> onEvent;
};

class KR60Simulator : public SimulatorThread<KR60Counters> {
 public:
  // In a relay vector a bit of 0 is a relay that is on, 1 one that is off.
  static constexpr std::uint64_t kAllOff = ~std::uint64_t{0};
  static constexpr std::uint32_t kBitRate = 125000;
  // Frames kept by ReceivedFrames() and SentFrames(); older ones are dropped.
  static constexpr std::size_t kLogLimit = 1 << 16;

  // Reads the pin file, joins the bus and starts the thread; nullptr with
  // `error` set when any of that fails.
  static std::unique_ptr<KR60Simulator> Start(const KR60SimulatorOptions& options,
                                              std::string* error = nullptr);
  ~KR60Simulator();

  // Leaves the bus; answers not yet sent are dropped. Safe to call twice.
  void Stop();

  const std::string& Target() const { return target_; }
  std::uint32_t Offset() const { return offset_; }
  std::vector<KR60ModuleId> Modules() const;
  bool HasModule(KR60ModuleId id) const;

  // The relays in effect (committed), kAllOff for a module that never
  // switched, nullopt for a module that is not there.
  std::optional<std::uint64_t> RelayVector(KR60ModuleId id) const;
  // Loaded by relay frames, waiting for the commit.
  std::optional<std::uint64_t> StagedVector(KR60ModuleId id) const;
  std::map<KR60ModuleId, std::uint64_t> RelayVectors() const;
  // The 32 relay positions of the RSIM module in effect (only the low half
  // travels on the bus).
  std::optional<std::uint32_t> RsimState(std::uint32_t address) const;

  // The bit of load channel 0..9, relay 0..4 in a LOAD module's vector; -1
  // outside these ranges.
  static int LoadRelayBit(std::uint32_t channel, std::uint32_t relay);
  // The bit of relay position 5..42 of a failure class in the FIU vector; -1 outside.
  static int FiuRelayBit(std::uint32_t position);

  // Every frame taken off the bus (the last kLogLimit), and every answer sent.
  std::vector<CanFrameRecord> ReceivedFrames() const;
  std::vector<CanFrameRecord> SentFrames() const;

  void SetFaultMode(const KR60Fault& fault);  // every module
  void SetFaultMode(KR60FaultMode mode) { SetFaultMode(KR60Fault{mode}); }
  bool SetFaultMode(KR60ModuleId id, const KR60Fault& fault);  // false when there is no such module

  // Wait until the counters reach the given totals (counted since the
  // start); false when `limit` passed first. A frame is counted once the
  // answers it gets at once are on the bus (not the late ones, nor, with
  // timing on, those still waiting for the bus); its relays switch before.
  // WaitForResets and WaitForAnswers come with the counters.
  bool WaitForFrames(std::uint64_t count, std::chrono::milliseconds limit) const;
  bool WaitForCommits(std::uint64_t count, std::chrono::milliseconds limit) const;

  // The bits a frame occupies on the bus: start of frame to intermission,
  // stuff bits included; and the time that takes at kBitRate.
  static std::uint32_t FrameBits(const CanFrameRecord& frame);
  static std::chrono::nanoseconds FrameTime(const CanFrameRecord& frame);

 private:
  using Clock = std::chrono::steady_clock;
  struct Module {
    std::uint64_t relays = kAllOff;
    std::uint64_t staged = kAllOff;
    bool pending = false;  // loaded by relay frames since its last commit or reset
    KR60Fault fault;
    std::uint64_t answersSinceFault = 0;
  };
  // A frame and the time it is due: taken off the bus, processed, or sent.
  struct Timed {
    Clock::time_point due;
    std::uint64_t sequence;
    CanFrameRecord frame;
  };

  KR60Simulator(const KR60SimulatorOptions& options, std::uint32_t offset,
                const std::vector<KR60ModuleId>& modules);
  bool Open(std::string* error);
  void Close();
  void Run();
  void ReadBus();
  // One pass of the scheduler; with mutex_ held.
  void Schedule(Clock::time_point now);
  std::optional<Clock::time_point> NextDue() const;
  void Process(const CanFrameRecord& frame, Clock::time_point at);
  void Answer(KR60ModuleId id, const Module& module, KR60FaultMode mode, const CanFrameRecord& request,
              std::uint8_t status, Clock::time_point at);
  void Note(std::deque<CanFrameRecord>& log, const CanFrameRecord& frame);

  const std::string target_;
  const std::uint32_t offset_;
  const bool timing_;
  const std::function<void(const KR60Event&)> onEvent_;
  CanHandle handle_ = 0;
  std::shared_ptr<NamedEvent> event_;

  // Guarded by mutex_, with the counters.
  bool stopping_ = false;
  std::map<KR60ModuleId, Module> modules_;
  KR60Counters tally_;  // of the frames decoded, counted into counters_ once their answers are out
  std::uint64_t sequence_ = 0;
  // The bus model: frames the host put on the bus, waiting for the bus; frames
  // whose last bit has passed, waiting to be decoded; answers waiting for the
  // bus; answers that won it, waiting for their last bit. Without timing
  // every frame takes no time and only late answers wait.
  std::deque<Timed> arriving_;
  std::deque<Timed> decoding_;
  std::vector<Timed> answering_;
  std::deque<Timed> sending_;
  Clock::time_point busFree_{};
  std::deque<CanFrameRecord> received_;
  std::deque<CanFrameRecord> sent_;
  std::vector<KR60Event> events_;  // produced under the lock, handed out after it
};

// ---------------------------------------------------------------------------
// The CAN access driver "sim"

// Registers the driver "sim" with the CAN access layer; true when "sim" is
// this driver afterwards (false when another driver has the name). Its channels are simulated benches:
// "sim:NAME" reaches the bench defined under NAME, "sim:/path/bench.csv" a bench built from that KR60 pin
// file. A bench starts when a channel first opens it and keeps its relays
// until it is removed, as a real bench does across connections.
bool RegisterKR60SimDriver();
// Defines (or replaces, stopping the old one) the bench behind "sim:NAME"
// with everything but the target; false for a name that is not a bus name
// (1 to 60 characters without blanks, '<' or '>').
bool DefineKR60SimBench(const std::string& name, const KR60SimulatorOptions& options);
// The running bench behind "sim:NAME" (a name or a pin file path), nullptr
// when none runs.
std::shared_ptr<KR60Simulator> FindKR60SimBench(const std::string& name);
// Stops and forgets the bench behind "sim:NAME"; channels open on it stay on
// an empty bus.
void RemoveKR60SimBench(const std::string& name);
void RemoveAllKR60SimBenches();

}  // namespace faultbox::sim
