// The simulated KR60 bench: frame decoding of the FIU, LOAD and RSIM
// modules, their answers and relay states, and a model of the bus's timing,
// on one thread per bench.
#include "kr60/KR60Simulator.h"

#include <algorithm>
#include <set>
#include <thread>

#include "config/QFCFSHelper.h"
#include "config/kr60/QFCKR60HardwareInfo.h"
#include "config/kr60/QFCKR60Pin.h"
#include "platform/ResultCodes.h"

namespace faultbox::sim {
namespace {

// Identifier: offset in bits 28..18, direction in 17..16 (00 request, 01
// answer), type code in 15..12 (LOAD 1, FIU 2, RSIM 3), address in 11..0.
constexpr int kOffsetShift = 18;
constexpr std::uint32_t kOffsetBits = 0x7FF;
constexpr int kDirectionShift = 16;
constexpr std::uint32_t kDirectionMask = 0x3u << kDirectionShift;
constexpr std::uint32_t kDirectionAnswer = 0x1u << kDirectionShift;
constexpr std::uint32_t kDirectionWrong = 0x2u << kDirectionShift;
constexpr int kTypeShift = 12;
constexpr std::uint32_t kAddressBits = 0xFFF;

// Data bytes of the requests.
constexpr std::uint8_t kRequest = 0x82;
constexpr std::uint8_t kResetRequest = 0x81;
constexpr std::uint8_t kRelayCommand = 0x04;
constexpr std::uint8_t kCommitCommand = 0x05;
constexpr std::uint8_t kResetCommand = 0x01;
constexpr std::uint8_t kLowHalf = 0xFE;
constexpr std::uint8_t kHighHalf = 0xFD;
// Answers: the request's byte 0 with its top bits 01, byte 2 the verdict.
constexpr std::uint8_t kAnswerMark = 0x40;
constexpr std::uint8_t kWrongMark = 0x80;
constexpr std::uint8_t kAccepted = 0x01;
constexpr std::uint8_t kRefused = 0x14;

constexpr std::uint64_t kLowMask = 0x00000000FFFFFFFFull;

enum class Command { kRelayLow, kRelayHigh, kCommit, kReset, kUnknown };

std::optional<KR60ModuleType> TypeOfCode(std::uint32_t code) {
  switch (code) {
    case 1:
      return KR60ModuleType::kLOAD;
    case 2:
      return KR60ModuleType::kFIU;
    case 3:
      return KR60ModuleType::kRSIM;
    default:
      return std::nullopt;
  }
}

// Only 8-byte frames of the known forms mean anything to a module; the RSIM
// module has no high half. Byte 7 and the commit's filler bytes are not
// looked at.
Command Classify(const CanFrameRecord& frame, KR60ModuleType type) {
  if (frame.length != 8) return Command::kUnknown;
  const std::uint8_t* d = frame.data;
  if (d[0] == kResetRequest && d[1] == kResetCommand) return Command::kReset;
  if (d[0] != kRequest) return Command::kUnknown;
  if (d[1] == kCommitCommand && d[2] == 0x00) return Command::kCommit;
  if (d[1] != kRelayCommand) return Command::kUnknown;
  if (d[2] == kLowHalf) return Command::kRelayLow;
  if (d[2] == kHighHalf && type != KR60ModuleType::kRSIM) return Command::kRelayHigh;
  return Command::kUnknown;
}

std::uint64_t HalfOf(const CanFrameRecord& frame) {
  return (std::uint64_t{frame.data[3]} << 24) | (std::uint64_t{frame.data[4]} << 16) |
         (std::uint64_t{frame.data[5]} << 8) | frame.data[6];
}

bool Fail(std::string* error, const std::string& text) {
  if (error != nullptr) *error = text;
  return false;
}

bool NotFitted(std::string_view text) {
  return text.empty() || text == "-" || text == "#" || QFCFSHelper::EqualNoCase(text, "none");
}

// The address of "FIULoadAddress" or "RSIMLoadAddress", none when the bench
// has no such module; false for a value that names no module.
bool ReadLoadModule(const std::string& key, const std::string& value, const std::string& file,
                    std::optional<std::uint32_t>& address, std::string* error) {
  const std::string_view text = QFCFSHelper::Trim(value);
  if (NotFitted(text)) return true;
  std::uint32_t cabinet = 0, rack = 0, slot = 0;
  if (!QFCFSHelper::ParseModuleAddress(text, cabinet, rack, slot, false))
    return Fail(error, "pin file " + file + ": " + key + " " + value + " is not cabinet_rack_slot");
  address = QFCFSHelper::ModuleAddress(cabinet, rack, slot);
  // Address 0 on the bus means every module of the type.
  if (*address == 0) return Fail(error, "pin file " + file + ": " + key + " " + value + " gives address 0");
  return true;
}

void AddLoadModules(const QFCKR60HardwareInfo& info, std::set<KR60ModuleId>& modules) {
  for (int e = 0; e < info.GetEcuCount(); ++e) {
    const QFCECU* ecu = info.GetEcu(e);
    for (int p = 0; p < ecu->GetPinCount(); ++p) {
      const auto* pin = dynamic_cast<const QFCKR60Pin*>(ecu->GetPin(p));
      // A pin without a usable load module is refused by the host, never sent.
      if (pin != nullptr && pin->GetModuleAddress() != 0)
        modules.insert({KR60ModuleType::kLOAD, pin->GetModuleAddress()});
    }
  }
}

bool ReadPinFile(const KR60SimulatorOptions& options, std::optional<std::uint32_t>& offset,
                 std::set<KR60ModuleId>& modules, std::string* error) {
  const std::string& file = options.pinFile;
  QFCKR60HardwareInfo info(file, options.ecuVersion, nullptr);
  std::int32_t platform = 0;
  HRESULT hr = info.DetectBoardType(platform);
  if (hr != FAULTBOX_OK)
    return Fail(error, "cannot read the board type of pin file " + file + ": " + ResultCodeText(hr));
  if (platform != fptKR60Platform) return Fail(error, "pin file " + file + " is not for a KR60 bench");
  hr = info.LoadPinFile(false);
  if (hr != FAULTBOX_OK) return Fail(error, "cannot load pin file " + file + ": " + ResultCodeText(hr));

  std::string value;
  if (info.GetFormatValue("OffsetLoadAddress", value) != FAULTBOX_OK) value.clear();
  const std::string_view text = QFCFSHelper::Trim(value);
  std::uint32_t number = 0;
  if (!offset) {
    if (NotFitted(text) || !QFCFSHelper::StringToNumber(text, number, 16))
      return Fail(error, "pin file " + file + " gives no OffsetLoadAddress (\"" + value + "\")");
    // The host sends only the offset's low 11 bits, whatever the pin file
    // says; the bench answers under those.
    offset = number & kOffsetBits;
  }
  std::optional<std::uint32_t> fiu, rsim;
  if (!ReadLoadModule("FIULoadAddress", info.GetFIULoadModule(), file, fiu, error) ||
      !ReadLoadModule("RSIMLoadAddress", info.GetRSIMLoadModule(), file, rsim, error))
    return false;
  if (fiu) modules.insert({KR60ModuleType::kFIU, *fiu});
  if (rsim) modules.insert({KR60ModuleType::kRSIM, *rsim});
  AddLoadModules(info, modules);
  for (const std::string& name : info.GetAdditionalFiles()) {
    const std::string path = info.ResolveAdditionalFile(name);
    QFCKR60HardwareInfo extra(path, options.ecuVersion, nullptr);
    hr = extra.LoadPinFile(true);
    if (hr != FAULTBOX_OK)
      return Fail(error, "cannot load additional pin file " + path + ": " + ResultCodeText(hr));
    AddLoadModules(extra, modules);
  }
  return true;
}

// The stuffed part of a frame, start of frame to CRC, one bool per bit.
void PushBits(std::vector<bool>& bits, std::uint32_t value, int count) {
  for (int i = count - 1; i >= 0; --i) bits.push_back(((value >> i) & 1u) != 0);
}

}  // namespace

const char* KR60ModuleTypeName(KR60ModuleType type) {
  switch (type) {
    case KR60ModuleType::kFIU:
      return "FIU";
    case KR60ModuleType::kLOAD:
      return "LOAD";
    case KR60ModuleType::kRSIM:
      return "RSIM";
  }
  return "?";
}

// ---------------------------------------------------------------------------
// Start and stop

KR60Simulator::KR60Simulator(const KR60SimulatorOptions& options, std::uint32_t offset,
                             const std::vector<KR60ModuleId>& modules)
    : target_(options.target),
      offset_(offset & kOffsetBits),
      timing_(options.timing),
      onEvent_(options.onEvent) {
  for (const KR60ModuleId& id : modules) {
    Module& m = modules_[id];
    auto own = options.moduleFaults.find(id);
    m.fault = own == options.moduleFaults.end() ? options.fault : own->second;
  }
}

std::unique_ptr<KR60Simulator> KR60Simulator::Start(const KR60SimulatorOptions& options, std::string* error) {
  std::optional<std::uint32_t> offset = options.offset;
  std::set<KR60ModuleId> modules;
  if (!options.pinFile.empty() && !ReadPinFile(options, offset, modules, error)) return nullptr;
  for (const KR60ModuleId& id : options.modules) {
    if (id.address == 0 || id.address > kAddressBits) {
      Fail(error, std::string(KR60ModuleTypeName(id.type)) + " module address " + std::to_string(id.address) +
                      " is outside 1 to 0xFFF");
      return nullptr;
    }
    modules.insert(id);
  }
  if (!offset) {
    Fail(error, "no offset: give a pin file or the offset of the modules");
    return nullptr;
  }
  if (*offset > kOffsetBits) {
    Fail(error, "offset " + std::to_string(*offset) + " does not fit into 11 bits");
    return nullptr;
  }
  for (const auto& [id, fault] : options.moduleFaults) {
    if (modules.count(id) == 0) {
      Fail(error, std::string("a fault for ") + KR60ModuleTypeName(id.type) + " module " +
                      std::to_string(id.address) + ", which the bench does not have");
      return nullptr;
    }
  }
  std::unique_ptr<KR60Simulator> sim(
      new KR60Simulator(options, *offset, std::vector<KR60ModuleId>(modules.begin(), modules.end())));
  if (!sim->Open(error)) return nullptr;
  return sim;
}

bool KR60Simulator::Open(std::string* error) {
  if (CanAccess::RegisterInterfaceTarget(target_, &handle_) != CanResult::kOk) {
    handle_ = 0;
    return Fail(error, CanAccess::LastErrorText());
  }
  // Mode 0: the host's system, not the bench, sets the bus timing.
  std::uint32_t initAccess = 0;
  // Not the host's receive event names: those must stay free for the systems.
  event_ = NamedEvent::CreateFirstFree("KR60_SIMULATOR_RECEIVE_%i");
  if (!event_ || CanAccess::ExcludeFromTrace(handle_) != CanResult::kOk ||
      CanAccess::InitInterface(handle_, 0, 0, &initAccess) != CanResult::kOk ||
      CanAccess::SetEventNotification(handle_, event_, 1) != CanResult::kOk ||
      CanAccess::ActivateChannel(handle_) != CanResult::kOk) {
    const std::string text = event_ ? CanAccess::LastErrorText() : "no receive event";
    Close();
    return Fail(error, text);
  }
  if (!StartThread([this] { Run(); }, error)) {
    Close();
    return false;
  }
  return true;
}

void KR60Simulator::Close() {
  if (handle_ != 0) {
    CanAccess::DeactivateChannel(handle_);
    CanAccess::UnRegisterInterface(handle_);
    handle_ = 0;
  }
  event_.reset();
}

KR60Simulator::~KR60Simulator() {
  Stop();
}

void KR60Simulator::Stop() {
  StopThread([this] {
    {
      std::lock_guard<std::mutex> lock(mutex_);
      stopping_ = true;
    }
    event_->Set();
  });
  Close();
}

// ---------------------------------------------------------------------------
// The thread

void KR60Simulator::Run() {
  for (;;) {
    ReadBus();
    std::vector<CanFrameRecord> out;
    std::vector<KR60Event> events;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      if (stopping_) return;
      Schedule(Clock::now());
      const Clock::time_point now = Clock::now();
      while (!sending_.empty() && sending_.front().due <= now) {
        out.push_back(sending_.front().frame);
        sending_.pop_front();
      }
      events.swap(events_);
    }
    std::uint64_t sent = 0;
    std::vector<CanFrameRecord> sentFrames;
    for (CanFrameRecord& frame : out) {
      // A lost hub or interface loses the answer, as a torn bus would.
      if (CanAccess::TransmitMessage(handle_, frame) == CanResult::kOk) {
        ++sent;
        sentFrames.push_back(frame);
      }
    }
    std::optional<Clock::time_point> next;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      for (const CanFrameRecord& frame : sentFrames) Note(sent_, frame);
      // Published together once the answers are out, so that a waiter who
      // sees a count also finds the answers of the frames counted.
      counters_.answers += sent;
      counters_.frames += tally_.frames;
      counters_.requests += tally_.requests;
      counters_.relayFrames += tally_.relayFrames;
      counters_.commits += tally_.commits;
      counters_.resets += tally_.resets;
      counters_.refused += tally_.refused;
      counters_.ignored += tally_.ignored;
      tally_ = {};
      next = NextDue();
    }
    NotifyCountersChanged();
    for (const KR60Event& event : events) onEvent_(event);

    // The receive event wakes the thread for new frames and for Stop();
    // it only has millisecond waits, so the last stretch to a due frame is slept.
    if (!next) {
      event_->Wait(std::chrono::hours(1));
      continue;
    }
    const Clock::duration left = *next - Clock::now();
    if (left > std::chrono::milliseconds(2)) {
      event_->Wait(std::chrono::duration_cast<std::chrono::milliseconds>(left) -
                   std::chrono::milliseconds(1));
    } else if (left > Clock::duration::zero()) {
      std::this_thread::sleep_until(*next);
    }
  }
}

void KR60Simulator::ReadBus() {
  CanFrameRecord buffer[256];
  for (;;) {
    auto count = static_cast<std::uint32_t>(std::size(buffer));
    if (CanAccess::ReadReceiveQueue(handle_, buffer, &count) != CanResult::kOk || count == 0) return;
    // The layer stamps a frame when it takes it off the bus; the model lets
    // it start there, on the steady clock.
    const Clock::time_point now = Clock::now();
    const auto stampNow = static_cast<std::uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(
                                                         std::chrono::system_clock::now().time_since_epoch())
                                                         .count());
    std::lock_guard<std::mutex> lock(mutex_);
    for (std::uint32_t i = 0; i < count; ++i) {
      const std::uint64_t age = stampNow > buffer[i].timeStamp ? stampNow - buffer[i].timeStamp : 0;
      Clock::time_point arrived = now - std::chrono::microseconds(age);
      if (!arriving_.empty()) arrived = std::max(arrived, arriving_.back().due);
      arriving_.push_back({arrived, sequence_++, buffer[i]});
    }
  }
}

// Every frame, the host's and the modules' answers, takes the bus in turn: the
// next one is whichever can start first; between frames that could start at
// the same moment the lower identifier wins, as in arbitration. A frame is
// decoded once its last bit has passed, and its answers queue for the bus
// from then on. Nothing is decided before its start time has come: a frame
// arriving in the meantime may still win. Without timing every frame takes
// no time and only late answers wait.
void KR60Simulator::Schedule(Clock::time_point now) {
  for (;;) {
    for (;;) {
      std::optional<Clock::time_point> hostStart, answerStart;
      if (!arriving_.empty()) hostStart = std::max(arriving_.front().due, busFree_);
      std::vector<Timed>::iterator answer = answering_.end();
      if (!answering_.empty()) {
        Clock::time_point ready = answering_.front().due;
        for (const Timed& t : answering_) ready = std::min(ready, t.due);
        answerStart = std::max(ready, busFree_);
        // Without timing the bus is never busy and answers leave in the
        // order they were made (those of one broadcast by address already).
        auto before = [this](const Timed& a, const Timed& b) {
          if (!timing_) return a.due != b.due ? a.due < b.due : a.sequence < b.sequence;
          return a.frame.identifier != b.frame.identifier ? a.frame.identifier < b.frame.identifier
                                                          : a.sequence < b.sequence;
        };
        for (auto it = answering_.begin(); it != answering_.end(); ++it) {
          if (it->due > *answerStart) continue;
          if (answer == answering_.end() || before(*it, *answer)) answer = it;
        }
      }
      bool takeHost;
      if (hostStart && answerStart) {
        takeHost =
            *hostStart < *answerStart ||
            (*hostStart == *answerStart && arriving_.front().frame.identifier <= answer->frame.identifier);
      } else if (hostStart) {
        takeHost = true;
      } else if (answerStart) {
        takeHost = false;
      } else {
        break;
      }
      const Clock::time_point start = takeHost ? *hostStart : *answerStart;
      if (start > now) break;
      Timed won = takeHost ? arriving_.front() : *answer;
      if (takeHost)
        arriving_.pop_front();
      else
        answering_.erase(answer);
      if (timing_) {
        won.due = start + FrameTime(won.frame);
        busFree_ = won.due;
      } else {
        won.due = start;
      }
      (takeHost ? decoding_ : sending_).push_back(won);
    }
    if (decoding_.empty() || decoding_.front().due > now) return;
    while (!decoding_.empty() && decoding_.front().due <= now) {
      const Timed t = decoding_.front();
      decoding_.pop_front();
      Process(t.frame, t.due);
    }
  }
}

std::optional<KR60Simulator::Clock::time_point> KR60Simulator::NextDue() const {
  std::optional<Clock::time_point> next;
  auto consider = [&](Clock::time_point t) {
    if (!next || t < *next) next = t;
  };
  if (!arriving_.empty()) consider(std::max(arriving_.front().due, busFree_));
  for (const Timed& t : answering_) consider(std::max(t.due, busFree_));
  if (!decoding_.empty()) consider(decoding_.front().due);
  if (!sending_.empty()) consider(sending_.front().due);
  return next;
}

// ---------------------------------------------------------------------------
// Decoding

// A frame for this bench has the bench's offset, direction 00 and a known
// type code; it reaches the module of its address, or with address 0 every
// module of the type. A broadcast commit is taken (and answered) only by the
// modules loaded since their last commit: the host waits for exactly those.
void KR60Simulator::Process(const CanFrameRecord& frame, Clock::time_point at) {
  ++tally_.frames;
  Note(received_, frame);
  const std::uint32_t id = frame.identifier;
  const std::optional<KR60ModuleType> type = TypeOfCode((id >> kTypeShift) & 0xF);
  if (frame.frameType != kCanFrameData || !frame.IsExtended() ||
      ((id >> kOffsetShift) & kOffsetBits) != offset_ || (id & kDirectionMask) != 0 || !type) {
    ++tally_.ignored;
    return;
  }
  const std::uint32_t address = id & kAddressBits;
  const Command command = Classify(frame, *type);
  bool reached = false;
  for (auto& [moduleId, module] : modules_) {
    if (moduleId.type != *type || (address != 0 && moduleId.address != address)) continue;
    reached = true;
    if (command == Command::kCommit && address == 0 && !module.pending) continue;
    const KR60FaultMode mode =
        module.answersSinceFault++ >= module.fault.afterAnswers ? module.fault.mode : KR60FaultMode::kNone;
    if (command == Command::kUnknown || mode == KR60FaultMode::kRefuse) {
      Answer(moduleId, module, mode, frame, kRefused, at);
      continue;
    }
    switch (command) {
      case Command::kRelayLow:
        module.staged = (module.staged & ~kLowMask) | HalfOf(frame);
        module.pending = true;
        break;
      case Command::kRelayHigh:
        module.staged = (module.staged & kLowMask) | (HalfOf(frame) << 32);
        module.pending = true;
        break;
      case Command::kCommit:
        if (onEvent_) events_.push_back({KR60Event::Kind::kCommit, moduleId, module.relays, module.staged});
        module.relays = module.staged;
        module.pending = false;
        break;
      case Command::kReset:
        // Loaded relays are forgotten along with the ones in effect.
        if (onEvent_) events_.push_back({KR60Event::Kind::kReset, moduleId, module.relays, kAllOff});
        module.relays = module.staged = kAllOff;
        module.pending = false;
        break;
      case Command::kUnknown:
        break;
    }
    Answer(moduleId, module, mode, frame, kAccepted, at);
  }
  if (!reached) {
    ++tally_.ignored;
    return;
  }
  ++tally_.requests;
  if (command == Command::kRelayLow || command == Command::kRelayHigh) ++tally_.relayFrames;
  if (command == Command::kCommit) ++tally_.commits;
  if (command == Command::kReset) ++tally_.resets;
}

// The answer carries the module's own address, also to a broadcast, so that
// the host can tell who answered.
void KR60Simulator::Answer(KR60ModuleId id, const Module& module, KR60FaultMode mode,
                           const CanFrameRecord& request, std::uint8_t status, Clock::time_point at) {
  if (status == kRefused) ++tally_.refused;
  if (mode == KR60FaultMode::kSilent) return;
  CanFrameRecord answer;
  answer.frameType = kCanFrameData;
  answer.flags = kCanFlagExtended;
  answer.identifier = (request.identifier & ~(kDirectionMask | kAddressBits)) | id.address |
                      (mode == KR60FaultMode::kWrongIdentifier ? kDirectionWrong : kDirectionAnswer);
  answer.length = 8;
  const std::uint8_t mark = mode == KR60FaultMode::kWrongContent ? kWrongMark : kAnswerMark;
  answer.data[0] = static_cast<std::uint8_t>(mark | (request.data[0] & 0x3F));
  answer.data[1] = request.data[1];
  answer.data[2] = status;
  answer.data[3] = request.data[2];  // the low or high half answered, for whoever reads a trace
  const Clock::time_point ready = mode == KR60FaultMode::kLate ? at + module.fault.lateBy : at;
  answering_.push_back({ready, sequence_++, answer});
}

void KR60Simulator::Note(std::deque<CanFrameRecord>& log, const CanFrameRecord& frame) {
  log.push_back(frame);
  if (log.size() > kLogLimit) log.pop_front();
}

// ---------------------------------------------------------------------------
// The bus

std::uint32_t KR60Simulator::FrameBits(const CanFrameRecord& frame) {
  if (frame.frameType != kCanFrameData && frame.frameType != kCanFrameRemote) return 0;
  const bool remote = frame.frameType == kCanFrameRemote;
  const std::uint32_t length = std::min<std::uint32_t>(frame.length, 8);
  std::vector<bool> bits;
  bits.push_back(false);  // start of frame
  if (frame.IsExtended()) {
    PushBits(bits, (frame.identifier >> 18) & 0x7FF, 11);
    bits.push_back(true);  // substitute remote request
    bits.push_back(true);  // identifier extension
    PushBits(bits, frame.identifier & 0x3FFFF, 18);
    bits.push_back(remote);
    PushBits(bits, 0, 2);  // r1, r0
  } else {
    PushBits(bits, frame.identifier & 0x7FF, 11);
    bits.push_back(remote);
    PushBits(bits, 0, 2);  // identifier extension, r0
  }
  PushBits(bits, length, 4);
  if (!remote)
    for (std::uint32_t i = 0; i < length; ++i) PushBits(bits, frame.data[i], 8);
  std::uint32_t crc = 0;
  for (bool bit : bits) {
    const bool next = bit != (((crc >> 14) & 1u) != 0);
    crc = (crc << 1) & 0x7FFF;
    if (next) crc ^= 0x4599;
  }
  PushBits(bits, crc, 15);
  // After five equal bits the sender inserts one of the other value, which
  // counts towards the next run.
  std::uint32_t stuffed = 0;
  int run = 0;
  bool last = false;
  for (std::size_t i = 0; i < bits.size(); ++i) {
    if (i > 0 && bits[i] == last) {
      ++run;
    } else {
      run = 1;
      last = bits[i];
    }
    if (run == 5) {
      ++stuffed;
      last = !last;
      run = 1;
    }
  }
  // CRC delimiter, acknowledge slot and delimiter, end of frame, intermission.
  constexpr std::uint32_t kTail = 1 + 2 + 7 + 3;
  return static_cast<std::uint32_t>(bits.size()) + stuffed + kTail;
}

std::chrono::nanoseconds KR60Simulator::FrameTime(const CanFrameRecord& frame) {
  return std::chrono::nanoseconds(std::uint64_t{FrameBits(frame)} * 1'000'000'000ull / kBitRate);
}

// ---------------------------------------------------------------------------
// Accessors

std::vector<KR60ModuleId> KR60Simulator::Modules() const {
  std::lock_guard<std::mutex> lock(mutex_);
  std::vector<KR60ModuleId> out;
  for (const auto& [id, module] : modules_) out.push_back(id);
  return out;
}

bool KR60Simulator::HasModule(KR60ModuleId id) const {
  std::lock_guard<std::mutex> lock(mutex_);
  return modules_.count(id) != 0;
}

std::optional<std::uint64_t> KR60Simulator::RelayVector(KR60ModuleId id) const {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = modules_.find(id);
  if (it == modules_.end()) return std::nullopt;
  return it->second.relays;
}

std::optional<std::uint64_t> KR60Simulator::StagedVector(KR60ModuleId id) const {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = modules_.find(id);
  if (it == modules_.end()) return std::nullopt;
  return it->second.staged;
}

std::map<KR60ModuleId, std::uint64_t> KR60Simulator::RelayVectors() const {
  std::lock_guard<std::mutex> lock(mutex_);
  std::map<KR60ModuleId, std::uint64_t> out;
  for (const auto& [id, module] : modules_) out[id] = module.relays;
  return out;
}

std::optional<std::uint32_t> KR60Simulator::RsimState(std::uint32_t address) const {
  const std::optional<std::uint64_t> vector = RelayVector({KR60ModuleType::kRSIM, address});
  if (!vector) return std::nullopt;
  return static_cast<std::uint32_t>(*vector & kLowMask);
}

int KR60Simulator::LoadRelayBit(std::uint32_t channel, std::uint32_t relay) {
  if (relay > 4 || channel > 9) return -1;
  // Channels 6 to 9 start at the high half, leaving bits 30 and 31 unused.
  return channel < 6 ? static_cast<int>(5 * channel + relay)
                     : static_cast<int>(32 + 5 * (channel - 6) + relay);
}

int KR60Simulator::FiuRelayBit(std::uint32_t position) {
  return position < 5 || position > 42 ? -1 : static_cast<int>(position - 5);
}

std::vector<CanFrameRecord> KR60Simulator::ReceivedFrames() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return {received_.begin(), received_.end()};
}

std::vector<CanFrameRecord> KR60Simulator::SentFrames() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return {sent_.begin(), sent_.end()};
}

void KR60Simulator::SetFaultMode(const KR60Fault& fault) {
  std::lock_guard<std::mutex> lock(mutex_);
  for (auto& [id, module] : modules_) {
    module.fault = fault;
    module.answersSinceFault = 0;
  }
}

bool KR60Simulator::SetFaultMode(KR60ModuleId id, const KR60Fault& fault) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = modules_.find(id);
  if (it == modules_.end()) return false;
  it->second.fault = fault;
  it->second.answersSinceFault = 0;
  return true;
}

bool KR60Simulator::WaitForFrames(std::uint64_t count, std::chrono::milliseconds limit) const {
  return WaitFor(&KR60Counters::frames, count, limit);
}

bool KR60Simulator::WaitForCommits(std::uint64_t count, std::chrono::milliseconds limit) const {
  return WaitFor(&KR60Counters::commits, count, limit);
}

}  // namespace faultbox::sim
