// The simulated KR40/KR80 bench: byte decoding of both protocols, checksum
// answers, relay states and the line's timing, on one thread per bench.
#include "kr40/KR40Simulator.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>

#include "config/kr40/QFCKR40HardwareInfo.h"
#include "config/kr40/QFCKR40Pin.h"
#include "platform/ResultCodes.h"
#include "platform/PseudoTerminal.h"

namespace faultbox::sim {
namespace {

// Protocol A
constexpr std::uint8_t kAReset = 0x49;
constexpr std::uint8_t kAExecute = 0x51;
constexpr std::uint8_t kASelect = 0x40;
constexpr std::uint8_t kAStateMask = 0xE0;  // 0x60..0x7F: a state in the low five bits
constexpr std::uint8_t kAState = 0x60;
// Protocol B
constexpr std::uint8_t kBReset = 0x9E;
constexpr std::uint8_t kBExecute = 0x9F;
constexpr std::uint32_t kBRelayOffset = 14;

constexpr std::uint32_t kMaxAddress = 127;
constexpr std::uint32_t kFirstRelay = 1;
constexpr std::uint32_t kLastRelay = 10;

bool Fail(std::string* error, const std::string& text) {
  if (error != nullptr) *error = text;
  return false;
}

std::string SystemError(const char* call) {
  return std::string(call) + ": " + std::strerror(errno);
}

// The modules of a KR40-family pin file, or false with the reason.
bool ReadPinFileModules(const KR40SimulatorOptions& options, std::set<std::uint32_t>& modules,
                        std::string* error) {
  QFCKR40HardwareInfo info(options.pinFile, options.ecuVersion, nullptr);
  std::int32_t platform = 0;
  HRESULT hr = info.DetectBoardType(platform);
  if (hr != FAULTBOX_OK) {
    return Fail(error,
                "cannot read the board type of pin file " + options.pinFile + ": " + ResultCodeText(hr));
  }
  if (platform != fptKR40Platform) {
    return Fail(error, "pin file " + options.pinFile + " is not for a KR40 or KR80 bench");
  }
  std::string board;
  if (info.GetFormatValue("BoardType", board) != FAULTBOX_OK) board.clear();
  if (ProtocolForBoardType(board) != options.protocol) {
    // The host picks the protocol from the board type: a bench speaking the
    // other one would only ever see garbage.
    return Fail(error, "pin file " + options.pinFile + " has board type " + board +
                           ", which speaks protocol " + (options.protocol == KR40Protocol::kA ? "B" : "A") +
                           ", not the simulated one");
  }
  // Only the format key BoardType matters here: the simulator needs the
  // modules, not the failure class file the host would use.
  hr = info.LoadPinFile(true);
  if (hr != FAULTBOX_OK) {
    return Fail(error, "cannot load pin file " + options.pinFile + ": " + ResultCodeText(hr));
  }
  for (int e = 0; e < info.GetEcuCount(); ++e) {
    const QFCECU* ecu = info.GetEcu(e);
    for (int p = 0; p < ecu->GetPinCount(); ++p) {
      const auto* pin = dynamic_cast<const QFCKR40Pin*>(ecu->GetPin(p));
      std::uint32_t id = 0;
      if (pin != nullptr && pin->GetFiuModuleId(id) == QFCAbstractPin::kPresent) modules.insert(id);
    }
  }
  return true;
}

std::uint32_t BStateOf(std::uint8_t code) {
  switch (code) {
    case 0xA0:
      return 1;
    case 0xC0:
      return 2;
    case 0xE0:
      return 3;
    default:
      return 0;  // 0x80: deactivation
  }
}

}  // namespace

KR40Protocol ProtocolForBoardType(std::string_view boardType) {
  return boardType == "KR80" || boardType == "KR080" ? KR40Protocol::kB : KR40Protocol::kA;
}

KR40Simulator::KR40Simulator(const KR40SimulatorOptions& options, std::unique_ptr<PseudoTerminal> pty)
    : protocol_(options.protocol),
      timing_(options.timing),
      onEvent_(options.onEvent),
      pty_(std::move(pty)),
      modules_(options.modules),
      fault_(options.fault) {}

std::unique_ptr<KR40Simulator> KR40Simulator::Start(const KR40SimulatorOptions& options, std::string* error) {
  for (std::uint32_t m : options.modules) {
    if (m > kMaxAddress) {
      Fail(error, "module address " + std::to_string(m) + " is outside 0 to 127");
      return nullptr;
    }
  }
  std::set<std::uint32_t> fromPinFile;
  if (!options.pinFile.empty() && !ReadPinFileModules(options, fromPinFile, error)) return nullptr;

  std::unique_ptr<PseudoTerminal> pty = PseudoTerminal::Open(error);
  if (!pty) return nullptr;
  std::unique_ptr<KR40Simulator> sim(new KR40Simulator(options, std::move(pty)));
  sim->modules_.insert(fromPinFile.begin(), fromPinFile.end());
  sim->allModules_ = options.pinFile.empty() && options.modules.empty();
  if (!sim->Open(error)) return nullptr;
  return sim;
}

bool KR40Simulator::Open(std::string* error) {
  const int master = pty_->MasterFd();
  const int flags = ::fcntl(master, F_GETFL);
  if (flags < 0 || ::fcntl(master, F_SETFL, flags | O_NONBLOCK) != 0)
    return Fail(error, SystemError("fcntl"));
  // With no slave descriptor open the master reports a hang-up on every
  // poll; holding one keeps the bench quiet between two users of the port.
  slaveFd_ = ::open(pty_->SlavePath().c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC);
  if (slaveFd_ < 0) return Fail(error, SystemError("open slave"));
  termios tio{};
  if (::tcgetattr(slaveFd_, &tio) == 0) {
    ::cfmakeraw(&tio);
    ::tcsetattr(slaveFd_, TCSANOW, &tio);
  }
  wakeFd_ = ::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
  if (wakeFd_ < 0) return Fail(error, SystemError("eventfd"));
  return StartThread([this] { Run(); }, error);
}

KR40Simulator::~KR40Simulator() {
  Stop();
  if (wakeFd_ >= 0) ::close(wakeFd_);
  if (slaveFd_ >= 0) ::close(slaveFd_);
}

void KR40Simulator::Stop() {
  StopThread([this] {
    const std::uint64_t one = 1;
    // An eventfd write fails only when the counter would overflow; the thread
    // wakes either way because the counter is non-zero.
    [[maybe_unused]] ssize_t written = ::write(wakeFd_, &one, sizeof one);
  });
}

const std::string& KR40Simulator::PortPath() const {
  return pty_->SlavePath();
}

// ---------------------------------------------------------------------------
// The thread

void KR40Simulator::Run() {
  bool masterBroken = false;
  for (;;) {
    const Clock::time_point now = Clock::now();
    pollfd fds[2] = {{wakeFd_, POLLIN, 0}, {pty_->MasterFd(), POLLIN, 0}};
    std::optional<std::chrono::nanoseconds> wait = NextWait(now);
    // A master that keeps failing is looked at again now and then instead of
    // spinning on it.
    if (masterBroken && (!wait || *wait > std::chrono::milliseconds(10)))
      wait = std::chrono::milliseconds(10);
    timespec limit{};
    if (wait) {
      limit.tv_sec = static_cast<time_t>(wait->count() / 1'000'000'000);
      limit.tv_nsec = static_cast<long>(wait->count() % 1'000'000'000);
    }
    // ppoll rather than poll: the line's byte time is not a whole number of
    // milliseconds.
    const int ready = ::ppoll(fds, masterBroken ? 1 : 2, wait ? &limit : nullptr, nullptr);
    if (ready < 0 && errno != EINTR) break;
    if (ready > 0 && (fds[0].revents & POLLIN) != 0) break;
    masterBroken = false;
    if (ready > 0 && fds[1].revents != 0) {
      std::uint8_t buffer[4096];
      const ssize_t n = ::read(pty_->MasterFd(), buffer, sizeof buffer);
      if (n > 0) {
        const Clock::time_point arrived = Clock::now();
        for (ssize_t i = 0; i < n; ++i) {
          Clock::time_point due = arrived;
          if (timing_) {
            due = std::max(arrived, lineFreeIn_) + kByteTime;
            lineFreeIn_ = due;
          }
          input_.push_back({due, buffer[i]});
        }
      } else if (n == 0 || (errno != EAGAIN && errno != EINTR)) {
        masterBroken = true;
      }
    }
    Process(Clock::now());
  }
}

std::optional<std::chrono::nanoseconds> KR40Simulator::NextWait(Clock::time_point now) const {
  std::optional<Clock::time_point> next;
  if (!input_.empty()) next = input_.front().due;
  if (!output_.empty() && (!next || output_.front().due < *next)) next = output_.front().due;
  if (!next) return std::nullopt;
  return std::max<std::chrono::nanoseconds>(*next - now, std::chrono::nanoseconds(0));
}

// Answers due now leave before the new counts are published, so that a
// test that waited for its bytes finds every immediate answer on the port.
void KR40Simulator::Process(Clock::time_point now) {
  std::vector<KR40Event> events;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    const std::uint64_t answers = counters_.answers;
    bool any = false;
    while (!input_.empty() && input_.front().due <= now) {
      const auto [due, byte] = input_.front();
      input_.pop_front();
      any = true;
      ++counters_.bytesProcessed;
      received_.push_back(byte);
      if (received_.size() > kLogLimit) received_.pop_front();
      if (protocol_ == KR40Protocol::kA) {
        DecodeA(byte, due);
      } else {
        DecodeB(byte);
      }
    }
    FlushAnswers(now);
    if (!any && counters_.answers == answers) return;
    events.swap(events_);
  }
  NotifyCountersChanged();
  if (onEvent_) {
    for (const KR40Event& e : events) onEvent_(e);
  }
}

void KR40Simulator::FlushAnswers(Clock::time_point now) {
  while (!output_.empty() && output_.front().due <= now) {
    const std::uint8_t byte = output_.front().byte;
    output_.pop_front();
    // A full input queue on the port side means nobody reads it: the answer
    // is lost as it would be on an unplugged line.
    if (::write(pty_->MasterFd(), &byte, 1) != 1) continue;
    ++counters_.answers;
    sent_.push_back(byte);
    if (sent_.size() > kLogLimit) sent_.erase(sent_.begin(), sent_.begin() + kLogLimit / 2);
  }
}

// ---------------------------------------------------------------------------
// Decoding

// Protocol A. Module selection is 0x40 and the address with bit 7 set; a
// relay is a state byte 0x60 | s followed by 0x80 | r. The module answers
// after its address byte and after each relay byte with the sum of the
// bytes since the previous such point, so a host that forgets its bytes
// after every wait (answered or not) always agrees with the bench. A reset
// byte starts a fresh sum that includes it; an execute ends the sequence.
void KR40Simulator::DecodeA(std::uint8_t byte, Clock::time_point received) {
  if (byte == kAReset) {
    Reset();
    sum_ = byte;
    return;
  }
  sum_ += byte;
  if (byte == kAExecute) {
    Execute();
    sum_ = 0;
    return;
  }
  if (byte == kASelect) {
    expect_ = Expect::kAddress;
    return;
  }
  if ((byte & kAStateMask) == kAState) {
    if (!selected_) {
      ++counters_.ignoredBytes;
      return;
    }
    pendingState_ = byte & 0x1F;
    expect_ = Expect::kRelay;
    return;
  }
  if ((byte & 0x80) != 0 && expect_ == Expect::kAddress) {
    Select(byte & 0x7F);
    AnswerPoint(received);
    return;
  }
  if ((byte & 0x80) != 0 && expect_ == Expect::kRelay) {
    Stage(byte & 0x7F, pendingState_);
    expect_ = Expect::kAny;
    AnswerPoint(received);
    return;
  }
  ++counters_.ignoredBytes;
}

// Protocol B. A byte below 0x80 selects a module; a relay byte carries
// r + 14 in its low five bits and the state in the top three: 0x80 off,
// 0xA0/0xC0/0xE0 states 1/2/3. Nothing is answered.
void KR40Simulator::DecodeB(std::uint8_t byte) {
  if (byte == kBReset) {
    Reset();
    return;
  }
  if (byte == kBExecute) {
    Execute();
    return;
  }
  if ((byte & 0x80) == 0) {
    Select(byte);
    return;
  }
  const std::uint32_t low = byte & 0x1F;
  if (!selected_ || low < kFirstRelay + kBRelayOffset || low > kLastRelay + kBRelayOffset) {
    ++counters_.ignoredBytes;
    return;
  }
  Stage(low - kBRelayOffset, BStateOf(byte & 0xE0));
}

void KR40Simulator::Select(std::uint32_t address) {
  selected_ = address;
  expect_ = Expect::kAny;
}

// A relay change waits for the execute byte, so that all relays of one
// activation switch together, as the hardware's latches do. An absent module
// hears nothing; a relay number outside 1 to 10 is acknowledged but switches
// nothing.
void KR40Simulator::Stage(std::uint32_t relay, std::uint32_t state) {
  if (!selected_ || !Present(*selected_)) return;
  if (relay < kFirstRelay || relay > kLastRelay) {
    ++counters_.ignoredBytes;
    return;
  }
  staged_[*selected_][relay] = state;
}

void KR40Simulator::Execute() {
  for (const auto& [module, relays] : staged_) {
    for (const auto& [relay, state] : relays) {
      if (state == 0) {
        auto it = relays_.find(module);
        if (it == relays_.end()) continue;
        it->second.erase(relay);
        if (it->second.empty()) relays_.erase(it);
      } else {
        relays_[module][relay] = state;
      }
    }
  }
  staged_.clear();
  selected_.reset();
  expect_ = Expect::kAny;
  ++counters_.executes;
  if (onEvent_) events_.push_back({KR40Event::Kind::kExecute, counters_.executes, relays_});
}

// Every relay of every module falls off at once, and changes not yet
// executed are forgotten.
void KR40Simulator::Reset() {
  relays_.clear();
  staged_.clear();
  selected_.reset();
  expect_ = Expect::kAny;
  ++counters_.resets;
  if (onEvent_) events_.push_back({KR40Event::Kind::kReset, counters_.resets, relays_});
}

void KR40Simulator::AnswerPoint(Clock::time_point received) {
  const auto sum = static_cast<std::uint8_t>(sum_ & 0xFF);
  sum_ = 0;
  if (!selected_ || !Present(*selected_)) return;
  const bool faulty = answersSinceFault_++ >= fault_.afterAnswers;
  const KR40FaultMode mode = faulty ? fault_.mode : KR40FaultMode::kNone;
  if (mode == KR40FaultMode::kSilent) return;
  const std::uint8_t answer = mode == KR40FaultMode::kWrongChecksum ? static_cast<std::uint8_t>(~sum) : sum;
  Clock::time_point due = received;
  if (mode == KR40FaultMode::kLate) due += fault_.lateBy;
  if (timing_) {
    due = std::max(due, lineFreeOut_) + kByteTime;
    lineFreeOut_ = due;
  }
  // The line sends in order: an answer never overtakes an earlier, later one.
  if (!output_.empty()) due = std::max(due, output_.back().due);
  output_.push_back({due, answer});
}

bool KR40Simulator::Present(std::uint32_t address) const {
  return allModules_ || modules_.count(address) != 0;
}

// ---------------------------------------------------------------------------
// Accessors

bool KR40Simulator::HasModule(std::uint32_t address) const {
  std::lock_guard<std::mutex> lock(mutex_);
  return Present(address);
}

KR40RelayStates KR40Simulator::RelayStates() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return relays_;
}

std::uint32_t KR40Simulator::RelayState(std::uint32_t module, std::uint32_t relay) const {
  std::lock_guard<std::mutex> lock(mutex_);
  const auto m = relays_.find(module);
  if (m == relays_.end()) return 0;
  const auto r = m->second.find(relay);
  return r == m->second.end() ? 0 : r->second;
}

std::vector<std::uint8_t> KR40Simulator::ReceivedBytes() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return {received_.begin(), received_.end()};
}

std::vector<std::uint8_t> KR40Simulator::SentBytes() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return sent_;
}

void KR40Simulator::SetFaultMode(const KR40Fault& fault) {
  std::lock_guard<std::mutex> lock(mutex_);
  fault_ = fault;
  answersSinceFault_ = 0;
}

bool KR40Simulator::WaitForProcessed(std::size_t bytes, std::chrono::milliseconds limit) const {
  return WaitFor(&KR40Counters::bytesProcessed, bytes, limit);
}

bool KR40Simulator::WaitForExecutes(std::size_t count, std::chrono::milliseconds limit) const {
  return WaitFor(&KR40Counters::executes, count, limit);
}

}  // namespace faultbox::sim
