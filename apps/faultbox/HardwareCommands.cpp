// `faultbox activate` and `faultbox shell`: drive a bench with a document's
// patterns. Both connect the system (which resets the hardware), switch
// patterns with the model's own operations and never end with a relay
// switched: on Ctrl-C, SIGTERM, end of input or a failure the activated
// pattern is deactivated, or the hardware reset, before the program exits.
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <charconv>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "Cli.h"
#include "SimHardware.h"
#include "config/QFCAbstractHardwareInfo.h"
#include "config/QFCAbstractPin.h"
#include "config/QFCECU.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternPins.h"
#include "platform/ByteTrace.h"
#include "platform/CanAccess.h"
#include "systems/QFCFaultboxDoc.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"

namespace faultbox::cli {
namespace {

using sim::Hardware;
using sim::kHardwareConfig;
using sim::kHardwareSim;
using sim::PrepareHardware;

constexpr int kMsgUnknownCommand = 930;
constexpr int kMsgCommandUsage = 931;
constexpr int kMsgStillSwitched = 933;
constexpr int kMsgNotSaved = 934;
constexpr int kMsgResetFailed = 944;

void Say(const std::string& line) {
  std::fflush(stderr);
  std::printf("%s\n", line.c_str());
  std::fflush(stdout);
}

// ---------------------------------------------------------------------------
// Ctrl-C and SIGTERM: the handler only notes the signal and wakes the waits
// through a pipe; the switching back happens on the main path.

std::atomic<bool> gInterrupted{false};
int gWakeRead = -1;
int gWakeWrite = -1;

extern "C" void OnTerminationSignal(int) {
  gInterrupted = true;
  const int saved = errno;
  const char byte = 1;
  [[maybe_unused]] const ssize_t ignored = ::write(gWakeWrite, &byte, 1);
  errno = saved;
}

class SignalWatch {
 public:
  SignalWatch() {
    int fds[2];
    if (::pipe2(fds, O_CLOEXEC | O_NONBLOCK) == 0) {
      gWakeRead = fds[0];
      gWakeWrite = fds[1];
    }
    gInterrupted = false;
    struct sigaction action {};
    action.sa_handler = OnTerminationSignal;
    sigemptyset(&action.sa_mask);
    ::sigaction(SIGINT, &action, &oldInt_);
    ::sigaction(SIGTERM, &action, &oldTerm_);
  }
  ~SignalWatch() {
    ::sigaction(SIGINT, &oldInt_, nullptr);
    ::sigaction(SIGTERM, &oldTerm_, nullptr);
    ::close(gWakeRead);
    ::close(gWakeWrite);
    gWakeRead = gWakeWrite = -1;
  }
  SignalWatch(const SignalWatch&) = delete;
  SignalWatch& operator=(const SignalWatch&) = delete;

  static bool Interrupted() { return gInterrupted; }

  // Waits `seconds` (forever when negative); false when a signal ended the wait.
  static bool Sleep(double seconds) {
    using Clock = std::chrono::steady_clock;
    const auto end = Clock::now() + std::chrono::duration_cast<Clock::duration>(
                                        std::chrono::duration<double>(seconds < 0 ? 0 : seconds));
    while (!Interrupted()) {
      int timeout = -1;
      if (seconds >= 0) {
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - Clock::now()).count();
        if (left <= 0) return true;
        timeout = static_cast<int>(std::min<long long>(left, 60'000));
      }
      pollfd wake{gWakeRead, POLLIN, 0};
      ::poll(&wake, 1, timeout);
    }
    return false;
  }

  // Waits until `fd` can be read; false when a signal came first.
  static bool WaitReadable(int fd) {
    while (!Interrupted()) {
      pollfd fds[2] = {{fd, POLLIN, 0}, {gWakeRead, POLLIN, 0}};
      if (::poll(fds, 2, -1) > 0 && fds[0].revents != 0) return true;
    }
    return false;
  }

 private:
  struct sigaction oldInt_ {};
  struct sigaction oldTerm_ {};
};

// ---------------------------------------------------------------------------
// A document connected to its hardware.

struct HardwareOptions {
  std::string doc;
  std::string hardware;  // "sim", "config", or "" for the default
  std::string trace;
};

std::string PinText(const QFCAbstractFailurePatternPin& pin) {
  return pin.GetEcuName() + " " + pin.GetPinName();
}

std::string PinListText(const std::vector<QFCAbstractFailurePatternPin*>& pins) {
  std::string out;
  for (const QFCAbstractFailurePatternPin* pin : pins) out += (out.empty() ? "" : ", ") + PinText(*pin);
  return out;
}

// One line per pin an activation left out, with the reason.
void SayLeftOut(const std::vector<QFCAbstractFailurePatternPin*>& pins) {
  for (const QFCAbstractFailurePatternPin* pin : pins) {
    const std::string reason = pin->GetNotReadyReason();
    Say("  " + PinText(*pin) + ": " + (reason.empty() ? "see the messages" : reason));
  }
}

class Session {
 public:
  explicit Session(HardwareOptions options) : options_(std::move(options)) {}
  ~Session() {
    // The system goes before the simulated bench that its port or channel leads to.
    doc_.reset();
    hardware_.reset();
  }
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;

  bool Load() {
    doc_ = OpenDocument(admin_, options_.doc);
    if (doc_) system_ = doc_->GetSystem();
    return doc_ != nullptr;
  }
  // Readies the trace and the hardware; says which hardware it is on the
  // first output line.
  bool Prepare() {
    if (!options_.trace.empty() && !StartTrace()) return false;
    hardware_ = PrepareHardware(options_.hardware, *system_);
    if (!hardware_) return false;
    Say(hardware_->Description());
    return hardware_->CheckPresent();
  }

  QFCFaultboxDoc& Doc() { return *doc_; }
  QFCSystem& System() { return *system_; }
  Hardware& Bench() { return *hardware_; }

  HRESULT Connect() {
    if (system_->IsConnected()) {
      Say("already connected");
      return FAULTBOX_OK;
    }
    hardware_->BeginOperation();
    const HRESULT result = system_->SetConnection(true, true);
    hardware_->Settle(false);
    if (!Succeeded(result)) {
      Say("not connected: " + ResultCodeText(result));
      return result;
    }
    Say("connected; " + Answered("the reset"));
    // Switching on a bench whose reset failed would add to relays that may
    // still be on from before.
    if (const HRESULT reset = system_->GetLastResetResult(); !Succeeded(reset)) {
      Say("the hardware reset failed: " + ResultCodeText(reset));
      TheReporter().ReportError(kMsgResetFailed, system_->GetName());
      return reset;
    }
    return result;
  }

  HRESULT Disconnect() {
    const HRESULT result = system_->SetConnection(false, true);
    Say(Succeeded(result) ? std::string("disconnected") : "still connected: " + ResultCodeText(result));
    return result;
  }

  HRESULT Reset() {
    hardware_->BeginOperation();
    const HRESULT result = system_->ResetHardware();
    hardware_->Settle(false);
    Say(Succeeded(result) ? "hardware reset; " + Answered("it")
                          : "the hardware reset failed: " + ResultCodeText(result));
    if (!Succeeded(result)) TheReporter().ReportError(kMsgResetFailed, system_->GetName());
    return result;
  }

  // Activates the pattern's pins named, or all of them.
  HRESULT Activate(const std::string& name, const std::vector<PinName>& names) {
    QFCAbstractFailurePattern* pattern = FindPattern(*doc_, name);
    if (pattern == nullptr) return E_FAULTBOX_INVALID_PARAMETER;
    std::vector<QFCAbstractFailurePatternPin*> wanted;
    if (!names.empty()) {
      if (!FindPatternPins(*pattern, names, wanted)) return E_FAULTBOX_INVALID_PARAMETER;
    } else {
      for (const auto& pin : pattern->GetPins()->GetList()) wanted.push_back(pin.get());
    }
    // Only the pins asked for take part; pins activated before stay on.
    for (const auto& pin : pattern->GetPins()->GetList()) pin->SetSelected(false);
    for (QFCAbstractFailurePatternPin* pin : wanted) pin->SetSelected(true);

    std::set<const QFCAbstractFailurePatternPin*> wasOn;
    for (const QFCAbstractFailurePatternPin* pin : wanted)
      if (pin->IsActivated()) wasOn.insert(pin);
    hardware_->BeginOperation();
    HRESULT result = pattern->ActivatePattern(true);
    std::vector<QFCAbstractFailurePatternPin*> on, out;
    bool switched = false;  // only pins that went on now were sent
    for (QFCAbstractFailurePatternPin* pin : wanted) {
      (pin->IsActivated() ? on : out).push_back(pin);
      switched = switched || (pin->IsActivated() && wasOn.count(pin) == 0);
    }
    hardware_->Settle(Succeeded(result) && switched);
    // The model leaves out pins that are not ready and succeeds with the
    // rest; with none left it fails and sends nothing.
    if (result == E_FAULTBOX_ACTIVATE_FAILURE_PATTERN && on.empty() && !out.empty()) {
      Say(name + " was not activated: no pin is ready");
      SayLeftOut(out);
    } else if (Succeeded(result)) {
      Say("activated " + name + ": " + PinListText(on));
      if (!out.empty()) Say("left out:");
      SayLeftOut(out);
    } else {
      Say(name + " was not activated: " + ResultCodeText(result));
    }
    ShowRelays(Succeeded(result) ? "after activation" : "now");
    return result;
  }

  // Deactivates the pattern, or the activated one when `name` is empty.
  HRESULT Deactivate(const std::string& name) {
    QFCAbstractFailurePattern* pattern = nullptr;
    if (!name.empty()) {
      pattern = FindPattern(*doc_, name);
      if (pattern == nullptr) return E_FAULTBOX_INVALID_PARAMETER;
    } else if (!system_->HasActivatedPattern(pattern)) {
      Say("no pattern is activated");
      return FAULTBOX_OK;
    }
    const bool wasOn = pattern->IsAnyPinActivated();
    hardware_->BeginOperation();
    const HRESULT result = pattern->ActivatePattern(false);
    hardware_->Settle(Succeeded(result) && wasOn);
    if (Succeeded(result))
      Say("deactivated " + pattern->GetName());
    else
      Say(pattern->GetName() + " was not deactivated: " + ResultCodeText(result));
    ShowRelays(Succeeded(result) ? "after deactivation" : "now");
    return result;
  }

  // Leaves no relay switched and the system disconnected: the activated
  // pattern is deactivated, or, when that fails, the hardware reset.
  HRESULT SwitchOffAndDisconnect() {
    HRESULT result = FAULTBOX_OK;
    QFCAbstractFailurePattern* active = nullptr;
    if (system_->HasActivatedPattern(active)) {
      result = Deactivate(active->GetName());
      if (system_->HasActivatedPattern(active) && system_->IsConnected()) {
        Say("resetting the hardware instead");
        Reset();
      }
      if (system_->HasActivatedPattern(active)) {
        TheReporter().ReportError(kMsgStillSwitched, active->GetName(), system_->GetName());
        return Succeeded(result) ? E_FAULTBOX : result;
      }
    }
    if (system_->IsConnected()) {
      const HRESULT disconnected = Disconnect();
      if (Succeeded(result)) result = disconnected;
    }
    return result;
  }

  void ShowRelays(const std::string& when) {
    if (!hardware_->IsSimulated()) return;
    const std::vector<std::string> lines = hardware_->RelayLines();
    if (lines.size() == 1) {
      Say("relays " + when + ": " + lines.front());
      return;
    }
    Say("relays " + when + ":");
    for (const std::string& line : lines) Say("  " + line);
  }

 private:
  bool StartTrace() {
    // The file must be writable before the hardware is touched.
    std::FILE* probe = std::fopen(options_.trace.c_str(), "ae");
    if (probe == nullptr) {
      TheReporter().ReportError(kMsgCannotWriteFile, options_.trace, std::strerror(errno));
      return false;
    }
    std::fclose(probe);
    // The option wins over the settings and the environment, for this process only.
    const char* variable = system_->GetPlatformType() == fptKR60Platform ? CanFrameTrace::kEnvironment
                                                                         : ByteTrace::kEnvironmentVariable;
    ::setenv(variable, options_.trace.c_str(), 1);
    return true;
  }

  // "4 modules answered the reset: 0x011, 0x012, ..." and the pins that are
  // unavailable because their module stayed silent.
  std::string Answered(const std::string& what) const {
    const auto& modules = system_->GetRespondingModules();
    const int digits = system_->GetPlatformType() == fptKR60Platform ? 3 : 2;
    std::string line =
        std::to_string(modules.size()) + (modules.size() == 1 ? " module" : " modules") + " answered " + what;
    std::string list;
    std::size_t listed = 0;
    for (std::uint16_t address : modules) {
      if (listed++ == kListedModules) {
        list += " and " + std::to_string(modules.size() - kListedModules) + " more";
        break;
      }
      char text[16];
      std::snprintf(text, sizeof text, "0x%0*X", digits, address);
      list += (list.empty() ? "" : ", ") + std::string(text);
    }
    if (!list.empty()) line += ": " + list;
    int unavailable = 0;
    for (const QFCECU* ecu : system_->GetECUs())
      for (int i = 0; i < ecu->GetPinCount(); ++i)
        if (!ecu->GetPin(i)->IsPresent()) ++unavailable;
    if (unavailable > 0)
      line += "; " + std::to_string(unavailable) + (unavailable == 1 ? " pin is" : " pins are") +
              " unavailable (module silent)";
    return line;
  }

  // A KR80 board answers nothing, so every address counts: the line stays short.
  static constexpr std::size_t kListedModules = 12;

  HardwareOptions options_;
  QFCSystemAdmin admin_;
  std::unique_ptr<QFCFaultboxDoc> doc_;
  QFCSystem* system_ = nullptr;
  std::unique_ptr<Hardware> hardware_;
};

// ---------------------------------------------------------------------------
// faultbox activate

struct ActivateOptions {
  HardwareOptions hardware;
  std::string pattern;
  std::vector<PinName> pins;
  std::optional<double> hold;  // none: until Ctrl-C
};

std::string SecondsText(double seconds) {
  char text[32];
  std::snprintf(text, sizeof text, "%g", seconds);
  return text;
}

HRESULT RunActivate(const ActivateOptions& o) {
  SignalWatch signals;
  Session session(o.hardware);
  if (!session.Load()) return E_FAULTBOX_CANN_NOT_OPEN_FILE;
  // A misspelt name is refused before any hardware is touched.
  QFCAbstractFailurePattern* pattern = FindPattern(session.Doc(), o.pattern);
  std::vector<QFCAbstractFailurePatternPin*> pins;
  if (pattern == nullptr || !FindPatternPins(*pattern, o.pins, pins)) return E_FAULTBOX_INVALID_PARAMETER;
  if (!session.Prepare()) return E_FAULTBOX;

  HRESULT result = session.Connect();
  if (Succeeded(result) && !SignalWatch::Interrupted()) {
    result = session.Activate(o.pattern, o.pins);
    if (Succeeded(result) && !SignalWatch::Interrupted()) {
      if (!o.hold)
        Say("holding until Ctrl-C");
      else
        Say("holding for " + SecondsText(*o.hold) + " s (Ctrl-C ends it early)");
      SignalWatch::Sleep(o.hold ? *o.hold : -1.0);
    }
  }
  // Ctrl-C during the hold is the way to end it; before that it breaks the run.
  const bool brokenOff = SignalWatch::Interrupted() && !(Succeeded(result) && pattern->IsAnyPinActivated());
  if (SignalWatch::Interrupted()) Say("interrupted: switching the hardware back");
  const HRESULT off = session.SwitchOffAndDisconnect();
  if (Succeeded(result)) result = off;
  if (brokenOff && Succeeded(result)) result = E_FAULTBOX;
  return result;
}

// ---------------------------------------------------------------------------
// faultbox shell

// Splits a line into words: blanks separate, "..." and '...' quote, a
// backslash outside single quotes takes the next character as it is.
// nullopt for an unclosed quote.
std::optional<std::vector<std::string>> SplitWords(const std::string& line) {
  std::vector<std::string> words;
  std::string word;
  bool inWord = false;
  char quote = 0;
  for (std::size_t i = 0; i < line.size(); ++i) {
    const char c = line[i];
    if (quote == '\'') {
      if (c == '\'')
        quote = 0;
      else
        word += c;
    } else if (c == '\\' && i + 1 < line.size()) {
      word += line[++i];
      inWord = true;
    } else if (quote == '"') {
      if (c == '"')
        quote = 0;
      else
        word += c;
    } else if (c == '"' || c == '\'') {
      quote = c;
      inWord = true;
    } else if (c == ' ' || c == '\t' || c == '\r') {
      if (inWord) words.push_back(std::move(word));
      word.clear();
      inWord = false;
    } else {
      word += c;
      inWord = true;
    }
  }
  if (quote != 0) return std::nullopt;
  if (inWord) words.push_back(std::move(word));
  return words;
}

bool ParseInt(const std::string& text, int& value) {
  const char* end = text.data() + text.size();
  const auto [at, error] = std::from_chars(text.data(), end, value);
  return error == std::errc() && at == end;
}

bool ParseSeconds(const std::string& text, double& value) {
  if (text.empty()) return false;
  char* end = nullptr;
  value = std::strtod(text.c_str(), &end);
  return end == text.c_str() + text.size() && std::isfinite(value) && value >= 0;
}

// A shell command's words after the command name: "--pin ECU PIN" pairs
// taken out, the rest in order.
struct Words {
  std::vector<std::string> plain;
  std::vector<PinName> pins;
};

std::optional<Words> TakePins(const std::vector<std::string>& words) {
  Words out;
  for (std::size_t i = 1; i < words.size(); ++i) {
    if (words[i] != "--pin") {
      out.plain.push_back(words[i]);
      continue;
    }
    if (i + 2 >= words.size()) return std::nullopt;
    out.pins.emplace_back(words[i + 1], words[i + 2]);
    i += 2;
  }
  return out;
}

struct ShellCommand {
  const char* name;
  const char* usage;
  const char* help;
};

constexpr ShellCommand kShellCommands[] = {
    {"connect", "connect", "connect to the hardware (the hardware is reset)"},
    {"disconnect", "disconnect", "disconnect (refused while a pattern is activated)"},
    {"reset", "reset", "reset the hardware: every relay off"},
    {"activate", "activate PATTERN [--pin ECU PIN ...]", "activate a pattern, or only the pins named"},
    {"deactivate", "deactivate [PATTERN]", "deactivate the pattern (every activated pin of it)"},
    {"set-class", "set-class PATTERN --pin ECU PIN [...] ID [VECTOR]",
     "give pins a failure class and relay vector"},
    {"config", "config PATTERN --pin ECU PIN [...] ENTRY VALUE", "set a PinConfig entry (0 to 4) to 0 or 1"},
    {"status", "status", "show the connection and what is activated"},
    {"relays", "relays", "show the relays of the simulated bench that are on"},
    {"sleep", "sleep SECONDS", "wait (Ctrl-C ends the session)"},
    {"save", "save", "save the document"},
    {"quit", "quit", "end the session (as end of input does)"},
    {"help", "help", "list the commands"},
};

const ShellCommand* FindShellCommand(const std::string& name) {
  for (const ShellCommand& command : kShellCommands)
    if (name == command.name) return &command;
  return nullptr;
}

class Shell {
 public:
  explicit Shell(Session& session) : session_(session) {}

  // Runs one line; false when the session is to end.
  bool Execute(const std::string& line, HRESULT& result) {
    result = FAULTBOX_OK;
    const std::optional<std::vector<std::string>> words = SplitWords(line);
    if (!words) {
      result = Usage("the line", "a quote is not closed");
      return true;
    }
    if (words->empty() || (!words->front().empty() && words->front().front() == '#')) return true;
    const std::string& name = words->front();
    if (name == "quit" || name == "exit") return false;
    const ShellCommand* command = FindShellCommand(name);
    if (command == nullptr) {
      TheReporter().ReportError(kMsgUnknownCommand, name);
      result = E_FAULTBOX_INVALID_PARAMETER;
      return true;
    }
    const std::optional<Words> args = TakePins(*words);
    if (!args) {
      result = Usage(name, std::string("--pin needs an ECU and a pin; usage: ") + command->usage);
      return true;
    }
    result = Dispatch(name, *args, *command);
    return true;
  }

 private:
  HRESULT Usage(const std::string& name, const std::string& what) {
    TheReporter().ReportError(kMsgCommandUsage, name, what);
    return E_FAULTBOX_INVALID_PARAMETER;
  }
  HRESULT WrongUse(const ShellCommand& command) {
    return Usage(command.name, std::string("usage: ") + command.usage);
  }

  HRESULT Dispatch(const std::string& name, const Words& a, const ShellCommand& command) {
    const std::size_t n = a.plain.size();
    const bool pins = !a.pins.empty();
    if (name == "help") return Help();
    if (name == "connect" || name == "disconnect" || name == "reset" || name == "status" ||
        name == "relays" || name == "save") {
      if (n != 0 || pins) return WrongUse(command);
      if (name == "connect") return session_.Connect();
      if (name == "disconnect") return session_.Disconnect();
      if (name == "reset") return session_.Reset();
      if (name == "status") return Status();
      if (name == "relays") return Relays();
      return Save();
    }
    if (name == "activate") {
      if (n != 1) return WrongUse(command);
      return session_.Activate(a.plain[0], a.pins);
    }
    if (name == "deactivate") {
      // Deactivating switches off every activated pin of the pattern: the
      // relay commands of a module carry all its relays at once.
      if (pins) return Usage(name, "a pattern is deactivated as a whole; name no pins");
      if (n > 1) return WrongUse(command);
      return session_.Deactivate(n == 1 ? a.plain[0] : std::string());
    }
    if (name == "sleep") {
      double seconds = 0;
      if (n != 1 || pins || !ParseSeconds(a.plain[0], seconds)) return WrongUse(command);
      SignalWatch::Sleep(seconds);
      return FAULTBOX_OK;
    }
    // set-class and config: the same operations as `faultbox pattern`, on
    // the open document; `save` stores them.
    PatternOptions o;
    o.pins = a.pins;
    std::string done;
    HRESULT result = FAULTBOX_OK;
    if (name == "set-class") {
      if (!pins || n < 2 || n > 3 || !ParseInt(a.plain[1], o.classId) ||
          (n == 3 && !ParseInt(a.plain[2], o.relayVector)))
        return WrongUse(command);
      o.name = a.plain[0];
      result = SetPatternPinClass(session_.Doc(), o, done);
    } else {
      if (!pins || n != 3 || !ParseInt(a.plain[1], o.entry) || !ParseInt(a.plain[2], o.value) ||
          o.entry < 0 || o.entry > 4 || o.value < 0 || o.value > 1)
        return WrongUse(command);
      o.name = a.plain[0];
      result = ConfigurePatternPins(session_.Doc(), o, done);
    }
    if (!done.empty()) Say(done);
    if (!Succeeded(result)) Say(name + " refused: " + ResultCodeText(result));
    return result;
  }

  HRESULT Help() {
    Say("commands:");
    for (const ShellCommand& command : kShellCommands) {
      char line[160];
      std::snprintf(line, sizeof line, "  %-50s %s", command.usage, command.help);
      Say(line);
    }
    Say("Names with blanks go in quotes: activate \"Door lock\" --pin DCU_FL X1.3");
    return FAULTBOX_OK;
  }

  HRESULT Status() {
    QFCSystem& system = session_.System();
    Say("document: " + session_.Doc().GetPathName() + (system.IsModified() ? " (changed, not saved)" : ""));
    Say(system.IsConnected() ? "connected" : "not connected");
    QFCAbstractFailurePattern* active = nullptr;
    if (!system.HasActivatedPattern(active)) {
      Say("activated: nothing");
      return FAULTBOX_OK;
    }
    std::vector<QFCAbstractFailurePatternPin*> on;
    for (const auto& pin : active->GetPins()->GetList())
      if (pin->IsActivated()) on.push_back(pin.get());
    Say("activated: " + active->GetName() + ": " + PinListText(on));
    return FAULTBOX_OK;
  }

  HRESULT Relays() {
    if (!session_.Bench().IsSimulated())
      return Usage("relays", "only the simulated bench (--hardware sim) shows its relays");
    session_.ShowRelays("now");
    return FAULTBOX_OK;
  }

  HRESULT Save() {
    QFCFaultboxDoc& doc = session_.Doc();
    if (!doc.OnSaveDocument(doc.GetPathName())) {
      Say(doc.GetPathName() + " was not saved");
      return E_FAULTBOX;
    }
    Say("saved " + doc.GetPathName());
    return FAULTBOX_OK;
  }

  Session& session_;
};

// Lines of standard input, read so that Ctrl-C ends a wait for input too.
class LineReader {
 public:
  // nullopt at end of input or on a signal.
  std::optional<std::string> Next() {
    for (;;) {
      if (const std::size_t end = buffer_.find('\n'); end != std::string::npos) {
        std::string line = buffer_.substr(0, end);
        buffer_.erase(0, end + 1);
        return line;
      }
      if (eof_) {
        if (buffer_.empty()) return std::nullopt;
        return std::exchange(buffer_, std::string());
      }
      if (!SignalWatch::WaitReadable(STDIN_FILENO)) return std::nullopt;
      char chunk[4096];
      const ssize_t got = ::read(STDIN_FILENO, chunk, sizeof chunk);
      if (got < 0 && (errno == EINTR || errno == EAGAIN)) continue;
      if (got <= 0)
        eof_ = true;
      else
        buffer_.append(chunk, static_cast<std::size_t>(got));
    }
  }

 private:
  std::string buffer_;
  bool eof_ = false;
};

HRESULT RunShell(const HardwareOptions& o) {
  SignalWatch signals;
  Session session(o);
  if (!session.Load()) return E_FAULTBOX_CANN_NOT_OPEN_FILE;
  if (!session.Prepare()) return E_FAULTBOX;
  const bool terminal = ::isatty(STDIN_FILENO) != 0;
  if (terminal) Say("Type help for the commands, quit or Ctrl-D to end.");
  Shell shell(session);
  LineReader reader;
  bool failed = false;
  for (;;) {
    if (terminal) {
      std::printf("faultbox> ");
      std::fflush(stdout);
    }
    const std::optional<std::string> line = reader.Next();
    if (!line) break;
    // Without a terminal nobody saw the command typed: the output tells it.
    if (!terminal && !line->empty()) Say("> " + *line);
    HRESULT result = FAULTBOX_OK;
    const bool goOn = shell.Execute(*line, result);
    if (!Succeeded(result)) failed = true;
    if (!goOn || SignalWatch::Interrupted()) break;
  }
  if (terminal && !SignalWatch::Interrupted()) Say("");
  if (SignalWatch::Interrupted()) {
    Say("interrupted: switching the hardware back");
    failed = true;
  }
  if (!Succeeded(session.SwitchOffAndDisconnect())) failed = true;
  if (session.System().IsModified()) TheReporter().ReportWarning(kMsgNotSaved, session.Doc().GetPathName());
  return failed ? E_FAULTBOX : FAULTBOX_OK;
}

void AddHardwareOptions(CLI::App* command, HardwareOptions& o) {
  command->add_option("DOC", o.doc, "The document")->required();
  command
      ->add_option("--hardware", o.hardware,
                   "config (the default): the CAN channel and serial port tables of the settings, where a "
                   "channel or port they do not name is can<n-1> or /dev/ttyS<n-1>; sim: a built-in "
                   "simulated bench for the document's pin files, used only when asked for")
      ->check(CLI::IsMember({kHardwareSim, kHardwareConfig}));
  command->add_option("--trace", o.trace,
                      "Append every CAN frame (candump log form) or serial byte sent and received to FILE");
}

}  // namespace

void RegisterHardwareCommands(CLI::App& app, Context& ctx) {
  auto activated = std::make_shared<ActivateOptions>();
  auto* activate = app.add_subcommand(
      "activate",
      "Connect, reset, activate a pattern (or some of its pins), hold, deactivate and disconnect");
  AddHardwareOptions(activate, activated->hardware);
  activate->add_option("PATTERN", activated->pattern, "The pattern's name")->required();
  AddPinOption(activate, activated->pins, "Activate only this pin of the pattern (repeatable)");
  auto hold = std::make_shared<double>(0.0);
  CLI::Option* holdOption =
      activate
          ->add_option("--hold", *hold,
                       "Seconds to keep the pattern activated; 0 deactivates at once. Default: until Ctrl-C")
          ->check(CLI::NonNegativeNumber);
  activate->callback([&ctx, activated, hold, holdOption] {
    if (holdOption->count() > 0) activated->hold = *hold;
    ctx.result = RunActivate(*activated);
  });

  auto shelled = std::make_shared<HardwareOptions>();
  auto* shell = app.add_subcommand(
      "shell", "A session that keeps the hardware switched between commands read from standard input");
  AddHardwareOptions(shell, *shelled);
  shell->callback([&ctx, shelled] { ctx.result = RunShell(*shelled); });
}

}  // namespace faultbox::cli
