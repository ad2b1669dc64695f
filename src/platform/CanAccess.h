// The CAN access layer: the channel operations the CAN transfer interface
// calls, the drivers behind them (kernel CAN, an in-process bus, a TCP bus
// shared between processes, and any driver registered later), the named
// receive events, the channel table of the settings and the frame trace.
//
// How a caller uses it:
//   std::uint32_t instance;  CanAccess::Create(&instance);
//   CanHandle h;             CanAccess::RegisterInterface(deviceType, board, channel, &h);
//   std::uint32_t access;    CanAccess::InitInterface(h, 2, 0x8000, &access);
//   if (access == 1) CanAccess::SetBusTimingRegister(h, 0x47, 0x14);
//   else { CanBaudrateInfo b; CanAccess::GetCurrentBaudrate(h, &b); /* b.bitRate */ }
//   CanAccess::SetAcceptance(h, 0xFFFF, 0xFFFF, 0, 0);
//   auto event = NamedEvent::CreateFirstFree(kCanReceiveEventFormat);
//   CanAccess::SetEventNotification(h, event, 1);
//   CanAccess::ActivateChannel(h);
//   CanAccess::TransmitMessage(h, frame);
//   if (event->Wait(std::chrono::milliseconds(30)) == NamedEvent::WaitResult::kSignalled) {
//     std::vector<CanFrameRecord> frames(4096); std::uint32_t n = 4096;
//     CanAccess::ReadReceiveQueue(h, frames.data(), &n);
//   }
//   CanAccess::DeactivateChannel(h); CanAccess::UnRegisterInterface(h); CanAccess::Release(instance);
//
// Every operation returns CanResult::kOk or an error; LastErrorText() then
// tells what failed in words. All operations may be called from any thread.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

namespace faultbox {

struct QFTCANInterfaceSettings;  // the 532-byte channel description record

// ---------------------------------------------------------------- results

enum class CanResult : std::int32_t {
  kOk = 0,
  kInvalidHandle = 1,     // unknown library instance or channel handle
  kInvalidParameter = 2,  // null pointer or a value out of range
  kNoChannel = 3,         // no such channel, driver or interface (also: kernel without CAN)
  kNotActive = 4,         // transmit on a channel that is not on the bus
  kNoInitAccess = 5,      // bus timing set by a handle without init access
  kNotSupported = 6,      // the driver cannot do this (remote frames over TCP, ...)
  kBusError = 7,          // the frame could not be handed to the bus, or the bus is lost
};

// A short fixed text per result ("no channel").
const char* CanResultText(CanResult result);

// ---------------------------------------------------------------- records

// The frame record of TransmitMessage and ReadReceiveQueue (32 bytes).
enum CanFrameType : std::uint32_t {
  kCanFrameUnclassified = 0,
  kCanFrameData = 1,
  kCanFrameRemote = 2,
  kCanFrameError = 3,
  kCanFrameBusStatus = 4,
};
constexpr std::uint16_t kCanFlagExtended = 2;  // `flags` of a frame with a 29-bit identifier
constexpr std::uint32_t kCanMaxExtendedId = 0x1FFFFFFF;
constexpr std::uint32_t kCanMaxStandardId = 0x7FF;

struct CanFrameRecord {
  // Microseconds since the epoch when the layer took the frame off the bus or
  // handed it to the bus; what the caller puts here is not used.
  std::uint64_t timeStamp = 0;
  std::uint32_t frameType = kCanFrameUnclassified;
  std::uint16_t flags = 0;  // kCanFlagExtended, or 0 for an 11-bit identifier
  std::uint16_t reserved0 = 0;
  std::uint32_t identifier = 0;
  std::uint8_t length = 0;  // data length 0..8
  std::uint8_t data[8] = {};
  std::uint8_t options = 0;  // transmit options of the caller; not interpreted
  std::uint8_t reserved1[2] = {};

  bool IsExtended() const { return (flags & kCanFlagExtended) != 0; }
};
static_assert(std::is_trivially_copyable_v<CanFrameRecord> && sizeof(CanFrameRecord) == 32);
static_assert(offsetof(CanFrameRecord, frameType) == 8 && offsetof(CanFrameRecord, flags) == 12 &&
              offsetof(CanFrameRecord, identifier) == 16 && offsetof(CanFrameRecord, length) == 20 &&
              offsetof(CanFrameRecord, data) == 21 && offsetof(CanFrameRecord, options) == 29);

// The 12-byte answer of GetCurrentBaudrate.
struct CanBaudrateInfo {
  std::uint32_t bitRate = 0;  // bit/s; 0 when the interface has none configured
  std::uint8_t busTiming0 = 0;
  std::uint8_t busTiming1 = 0;
  std::uint8_t reserved[6] = {};
};
static_assert(sizeof(CanBaudrateInfo) == 12 && offsetof(CanBaudrateInfo, busTiming0) == 4 &&
              offsetof(CanBaudrateInfo, busTiming1) == 5);

// The bit rate two SJA1000-style bus timing registers give with the 16 MHz
// controller clock the KR60 benches were built for: 0x47, 0x14 give 125000.
std::uint32_t CanBitRateFromBusTiming(std::uint8_t busTiming0, std::uint8_t busTiming1);

// ---------------------------------------------------------------- named events

// The name pattern of the receive events; %i is 0, 1, 2, ...
constexpr const char* kCanReceiveEventFormat = "FS_CAN_RECEIVE_EVENT_%i";

// An auto-reset event known by name in this process. The name is taken while
// any reference to the event lives and free again afterwards. Set() wakes one
// waiter at once, or the next one to wait if none is waiting.
class NamedEvent {
 public:
  enum class WaitResult { kSignalled, kTimedOut };

  // Creates an unsignalled event under the first name of `format` (which
  // holds "%i" once) for which no event exists: "..._0", then "..._1", ...
  static std::shared_ptr<NamedEvent> CreateFirstFree(std::string_view format = kCanReceiveEventFormat);
  // Creates an unsignalled event named `name`; nullptr when one of that name exists.
  static std::shared_ptr<NamedEvent> Create(const std::string& name);
  // The event of that name, or nullptr when none exists.
  static std::shared_ptr<NamedEvent> Open(const std::string& name);

  ~NamedEvent();
  NamedEvent(const NamedEvent&) = delete;
  NamedEvent& operator=(const NamedEvent&) = delete;

  const std::string& Name() const { return name_; }
  void Set();
  void Reset();
  // Returns at once when signalled (and takes the signal), else waits up to `timeout`.
  WaitResult Wait(std::chrono::milliseconds timeout);

 private:
  explicit NamedEvent(std::string name) : name_(std::move(name)) {}
  std::string name_;
  std::mutex mutex_;
  std::condition_variable cv_;
  bool signalled_ = false;
};

// ---------------------------------------------------------------- drivers

// Where a driver hands the frames it takes off its bus. Called from any
// thread: a driver's reader thread, or, on an in-process bus, the thread of
// the handle that transmits. Must not call back into the channel delivering.
class CanFrameSink {
 public:
  virtual ~CanFrameSink() = default;
  virtual void Deliver(const CanFrameRecord& frame) = 0;
};

// One opened interface of a driver: one participant on its bus. Every other
// participant on the same bus receives what it transmits; it never receives
// its own frames. Destroying it stops every delivery before it returns.
class CanDriverChannel {
 public:
  virtual ~CanDriverChannel() = default;
  // The frame's identifier, length and type have been checked by the layer.
  virtual CanResult Transmit(const CanFrameRecord& frame, std::string* error) = 0;
  // True when a controller outside the layer decides the bit rate (a kernel
  // CAN interface the administrator set up with `ip link`): nobody gets init
  // access and the bit rate is read from the controller. False for buses
  // without timing of their own, whose timing the layer keeps per bus.
  virtual bool HasControllerTiming() const { return false; }
  virtual CanResult ReadControllerBitRate(std::uint32_t* bitRate, std::string* error);
  // The interface name in trace lines (no spaces).
  virtual std::string TraceName() const = 0;
};

class CanDriver {
 public:
  virtual ~CanDriver() = default;
  // Interfaces the driver finds on its own (the kernel's CAN interfaces); buses
  // that come into being when opened are not listed.
  virtual std::vector<std::string> ListInterfaces() { return {}; }
  // Whether `interfaceName` names something this driver can open now, as far
  // as can be told without opening it.
  virtual bool IsAvailable(const std::string& interfaceName) = 0;
  // Opens one participant. On failure returns nullptr with the result and a
  // text in `result` and `error`.
  virtual std::unique_ptr<CanDriverChannel> Open(const std::string& interfaceName,
                                                 std::shared_ptr<CanFrameSink> sink, CanResult* result,
                                                 std::string* error) = 0;
};

// ---------------------------------------------------------------- channel table

// A driver and its interface, written "driver:interface": "socketcan:can0",
// "virtual:bench1", "tcp:127.0.0.1:29536/bench1".
struct CanChannelTarget {
  std::string driver;
  std::string interfaceName;
  std::string Text() const { return driver + ":" + interfaceName; }
  bool operator==(const CanChannelTarget&) const = default;
};
// Splits at the first ':'; false when either side is empty or holds blanks.
bool ParseCanChannelTarget(std::string_view text, CanChannelTarget* target);

// The channel a system's interface settings name. -1 in a table key means any.
struct CanChannelKey {
  std::int32_t deviceType = -1;
  std::int32_t board = -1;
  std::int32_t channel = -1;
  bool operator==(const CanChannelKey&) const = default;
};

struct CanChannelEntry {
  CanChannelKey key;
  CanChannelTarget target;
};

// The table that maps channels to drivers: the settings section kSection,
// one line per channel, "type,board,channel=driver:interface", for example
//   1,1,1=socketcan:can0
//   fdtCAN_IF_LINKBOX_USB,1,2=tcp:127.0.0.1:29536/bench1
//   *,*,*=virtual:bench1
// The type is a number or a device type name; '*' matches anything. The most
// specific entry wins (fewest '*'), then the earlier one. A channel no entry
// names falls back to the kernel: board 1, channel n is socketcan can<n-1>.
// Entries of the process override are looked at first and win when one matches.
class CanChannelTable {
 public:
  static constexpr const char* kSection = "Components\\Faultbox.Component\\Hardware\\CAN";

  static bool ParseKey(std::string_view text, CanChannelKey* key);
  // The entries of the settings, in file order; each line that is not an
  // entry adds a text naming it to `problems`.
  static std::vector<CanChannelEntry> Read(std::vector<std::string>* problems = nullptr);
  // Entries consulted before the settings, for this process only (used to put
  // every channel on simulated hardware). An empty list removes them.
  static void SetOverride(std::vector<CanChannelEntry> entries);
  // The override's entries, then those of the settings.
  static std::vector<CanChannelEntry> Entries();
  // The target of a channel: override, settings, then the kernel rule.
  static std::optional<CanChannelTarget> Lookup(std::uint32_t deviceType, std::uint8_t board,
                                                std::uint8_t channel);
};

// ---------------------------------------------------------------- frame trace

// Every frame a channel transmits or takes in, written in candump's log form
// "(secs.usecs) iface ID#DATA". On when the environment variable kEnvironment
// names a file ("-" for standard error), else when the setting kSetting of the
// hardware section does; an empty value or "0" is off. The choice is read
// again whenever a channel is registered.
class CanFrameTrace {
 public:
  static constexpr const char* kEnvironment = "FAULTBOX_CAN_TRACE";
  static constexpr const char* kSetting = "CanTrace";

  // One log line without its line end: 8 hex digits for 29-bit identifiers,
  // 3 for 11-bit ones, "R" for remote frames.
  static std::string FormatLine(const CanFrameRecord& frame, std::string_view interfaceName);
  static void Configure();
  static bool IsOn();
  // Writes the line of a frame taken in. While a send is under way its line
  // waits until the sent frame's line is written, so that an answer never
  // stands before its request (a receiving thread may see the answer before
  // the sending one returns).
  static void Write(const CanFrameRecord& frame, std::string_view interfaceName);
  // Around a transmission: EndSend writes the frame's line when it was sent,
  // then the lines of the frames taken in meanwhile.
  static void BeginSend();
  static void EndSend(const CanFrameRecord& frame, std::string_view interfaceName, bool sent);
};

// ---------------------------------------------------------------- operations

using CanHandle = std::uint32_t;

namespace CanAccess {

// The text of this thread's latest failed operation ("RegisterInterface:
// no CAN interface can0"), or "".
std::string LastErrorText();

// Makes `driver` available under `name` ("sim"); false when the name is taken.
bool RegisterDriver(const std::string& name, std::shared_ptr<CanDriver> driver);
// Channels already open on the driver stay open.
void UnregisterDriver(const std::string& name);
std::shared_ptr<CanDriver> FindDriver(const std::string& name);

CanResult Create(std::uint32_t* instance);
CanResult Release(std::uint32_t instance);

// With `channels` null: the number of channels available in `*count`. Else
// fills up to `*count` records (name "driver:interface", device type, board,
// channel) and sets `*count` to the number filled.
CanResult GetAvailableChannels(std::uint32_t* count, QFTCANInterfaceSettings* channels);

// Opens the channel the channel table names for (device type, board, channel).
CanResult RegisterInterface(std::uint32_t deviceType, std::uint8_t board, std::uint8_t channel,
                            CanHandle* handle);
// Opens a channel on a target given directly ("virtual:bench1"), past the
// table: for simulators and tools that join a bus themselves.
CanResult RegisterInterfaceTarget(const std::string& target, CanHandle* handle);

// `mode` 2 asks for init access: granted (1 in `*initAccess`) to the first
// handle of this process on a bus without controller timing, never on one
// with it. `queueSize` is the receive queue's room in frames (0: 0x8000);
// frames beyond it are lost.
CanResult InitInterface(CanHandle handle, std::uint32_t mode, std::uint32_t queueSize,
                        std::uint32_t* initAccess);
// Needs init access; each register 0..0xFF.
CanResult SetBusTimingRegister(CanHandle handle, std::uint32_t busTiming0, std::uint32_t busTiming1);
// Buses without controller timing run at 125000 bit/s (0x47, 0x14) until a
// handle with init access sets other registers.
CanResult GetCurrentBaudrate(CanHandle handle, CanBaudrateInfo* info);
// A frame is taken in when (identifier AND mask) equals (code AND mask), with
// the first pair for 11-bit and the second for 29-bit identifiers. Until set,
// every frame is taken in.
CanResult SetAcceptance(CanHandle handle, std::uint32_t standardCode, std::uint32_t standardMask,
                        std::uint32_t extendedCode, std::uint32_t extendedMask);
// `mode` 1 sets `event` whenever a frame is queued; 0 stops that.
CanResult SetEventNotification(CanHandle handle, std::shared_ptr<NamedEvent> event, std::int32_t mode);
// Frames are queued only while the channel is active.
CanResult ActivateChannel(CanHandle handle);
// Keeps the channel's frames out of the frame trace: a simulated bench in the
// same process sees every frame the host sees, and would write each twice.
CanResult ExcludeFromTrace(CanHandle handle);
CanResult TransmitMessage(CanHandle handle, const CanFrameRecord& frame);
// `*count`: in the room of `frames`, out the number read, oldest first.
CanResult ReadReceiveQueue(CanHandle handle, CanFrameRecord* frames, std::uint32_t* count);
CanResult FlushReceiveQueue(CanHandle handle);
CanResult DeactivateChannel(CanHandle handle);
// Closes the channel; the handle is unknown afterwards.
CanResult UnRegisterInterface(CanHandle handle);

}  // namespace CanAccess

}  // namespace faultbox
