// The CAN access layer's channel operations, its driver table and the named
// events. What every driver shares lives here: handles, the receive queue,
// the acceptance filter, init access and the bus timing of buses without a
// controller of their own, event notification and the trace.
#include "platform/CanAccess.h"

#include <algorithm>
#include <cstring>
#include <deque>
#include <map>
#include <set>

#include "platform/InterfaceSettings.h"
#include "platform/Text.h"
#include "platform/can/CanDrivers.h"

namespace faultbox {

namespace {

constexpr std::uint32_t kDefaultQueueSize = 0x8000;
constexpr std::uint32_t kMaxQueueSize = 1u << 20;
constexpr std::uint32_t kAskInitAccess = 2;

thread_local std::string tLastError;

CanResult Fail(const char* operation, CanResult result, const std::string& text) {
  tLastError = std::string(operation) + ": " + text;
  return result;
}

// ---- drivers

struct DriverTable {
  std::mutex mutex;
  std::map<std::string, std::shared_ptr<CanDriver>> drivers;
};

DriverTable& Drivers() {
  static DriverTable* table = [] {
    auto* t = new DriverTable;
    t->drivers["socketcan"] = MakeSocketCanDriver();
    t->drivers["virtual"] = MakeVirtualBusDriver();
    t->drivers["tcp"] = MakeTcpBusDriver();
    return t;
  }();
  return *table;
}

// ---- channels

class Channel final : public CanFrameSink {
 public:
  void Deliver(const CanFrameRecord& frame) override {
    CanFrameRecord f = frame;
    std::shared_ptr<NamedEvent> event;
    std::string traceName;
    bool traced = true;
    {
      std::lock_guard lock(mutex);
      if (!active || !Accepts(f)) return;
      f.timeStamp = CanTimeStampNow();
      if (queue.size() >= capacity) {
        ++lost;
        return;
      }
      queue.push_back(f);
      event = this->event;
      traceName = this->traceName;
      traced = this->traced;
    }
    if (traced) CanFrameTrace::Write(f, traceName);
    if (event) event->Set();
  }

  bool Accepts(const CanFrameRecord& f) const {
    if (f.frameType != kCanFrameData && f.frameType != kCanFrameRemote) return true;
    if (f.IsExtended()) return (f.identifier & extendedMask) == (extendedCode & extendedMask);
    return (f.identifier & standardMask) == (standardCode & standardMask);
  }

  std::mutex mutex;
  std::shared_ptr<CanDriverChannel> driverChannel;
  std::string busKey;
  std::string traceName;
  bool traced = true;
  bool controllerTiming = false;
  bool active = false;
  std::deque<CanFrameRecord> queue;
  std::size_t capacity = kDefaultQueueSize;
  std::uint64_t lost = 0;
  std::uint32_t standardCode = 0, standardMask = 0, extendedCode = 0, extendedMask = 0;
  std::shared_ptr<NamedEvent> event;
};

// The timing of a bus without a controller of its own, shared by the
// handles of this process on it.
struct BusState {
  std::uint8_t busTiming0 = kDefaultCanBusTiming0;
  std::uint8_t busTiming1 = kDefaultCanBusTiming1;
  CanHandle initOwner = 0;
  int handles = 0;
};

struct Layer {
  std::mutex mutex;
  std::map<CanHandle, std::shared_ptr<Channel>> channels;
  std::map<std::string, BusState> buses;
  std::set<std::uint32_t> instances;
  CanHandle nextHandle = 1;
  std::uint32_t nextInstance = 1;
};

Layer& TheLayer() {
  static Layer* layer = new Layer;
  return *layer;
}

std::shared_ptr<Channel> FindChannel(CanHandle handle) {
  Layer& layer = TheLayer();
  std::lock_guard lock(layer.mutex);
  auto it = layer.channels.find(handle);
  return it == layer.channels.end() ? nullptr : it->second;
}

CanResult UnknownHandle(const char* operation, CanHandle handle) {
  return Fail(operation, CanResult::kInvalidHandle, "no channel with handle " + std::to_string(handle));
}

CanResult OpenTarget(const char* operation, const CanChannelTarget& target, CanHandle* handle) {
  CanFrameTrace::Configure();
  std::shared_ptr<CanDriver> driver = CanAccess::FindDriver(target.driver);
  if (!driver) return Fail(operation, CanResult::kNoChannel, "no CAN driver named \"" + target.driver + "\"");
  auto channel = std::make_shared<Channel>();
  channel->busKey = target.Text();
  CanResult result = CanResult::kNoChannel;
  std::string error;
  std::unique_ptr<CanDriverChannel> opened = driver->Open(target.interfaceName, channel, &result, &error);
  if (!opened) {
    if (result == CanResult::kOk) result = CanResult::kNoChannel;
    return Fail(operation, result, target.Text() + ": " + (error.empty() ? CanResultText(result) : error));
  }
  {
    std::lock_guard lock(channel->mutex);
    channel->traceName = opened->TraceName();
    channel->controllerTiming = opened->HasControllerTiming();
    channel->driverChannel = std::move(opened);
  }
  Layer& layer = TheLayer();
  std::lock_guard lock(layer.mutex);
  while (layer.nextHandle == 0 || layer.channels.count(layer.nextHandle) != 0) ++layer.nextHandle;
  *handle = layer.nextHandle++;
  layer.channels[*handle] = channel;
  ++layer.buses[channel->busKey].handles;
  return CanResult::kOk;
}

bool ValidIdentifier(const CanFrameRecord& f) {
  return f.identifier <= (f.IsExtended() ? kCanMaxExtendedId : kCanMaxStandardId);
}

}  // namespace

std::uint64_t CanTimeStampNow() {
  return static_cast<std::uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(
                                        std::chrono::system_clock::now().time_since_epoch())
                                        .count());
}

// ---------------------------------------------------------------- operations

namespace CanAccess {

std::string LastErrorText() {
  return tLastError;
}

bool RegisterDriver(const std::string& name, std::shared_ptr<CanDriver> driver) {
  if (name.empty() || !driver) return false;
  DriverTable& table = Drivers();
  std::lock_guard lock(table.mutex);
  return table.drivers.emplace(ToLower(name), std::move(driver)).second;
}

void UnregisterDriver(const std::string& name) {
  DriverTable& table = Drivers();
  std::lock_guard lock(table.mutex);
  table.drivers.erase(ToLower(name));
}

std::shared_ptr<CanDriver> FindDriver(const std::string& name) {
  DriverTable& table = Drivers();
  std::lock_guard lock(table.mutex);
  auto it = table.drivers.find(ToLower(name));
  return it == table.drivers.end() ? nullptr : it->second;
}

CanResult Create(std::uint32_t* instance) {
  if (instance == nullptr) return Fail("Create", CanResult::kInvalidParameter, "no place for the instance");
  Layer& layer = TheLayer();
  std::lock_guard lock(layer.mutex);
  while (layer.nextInstance == 0 || layer.instances.count(layer.nextInstance) != 0) ++layer.nextInstance;
  *instance = layer.nextInstance++;
  layer.instances.insert(*instance);
  return CanResult::kOk;
}

CanResult Release(std::uint32_t instance) {
  Layer& layer = TheLayer();
  std::lock_guard lock(layer.mutex);
  if (layer.instances.erase(instance) == 0)
    return Fail("Release", CanResult::kInvalidHandle, "no instance " + std::to_string(instance));
  return CanResult::kOk;
}

CanResult GetAvailableChannels(std::uint32_t* count, QFTCANInterfaceSettings* channels) {
  if (count == nullptr)
    return Fail("GetAvailableChannels", CanResult::kInvalidParameter, "no place for the count");
  // Candidates: every key the table names (a '*' standing for the default
  // channel 1, 1, 1), then the kernel's canN interfaces as board 1, channel N+1.
  std::vector<CanChannelKey> keys;
  auto addKey = [&](CanChannelKey k) {
    if (std::find(keys.begin(), keys.end(), k) == keys.end()) keys.push_back(k);
  };
  for (const CanChannelEntry& e : CanChannelTable::Entries())
    addKey({e.key.deviceType < 0 ? 1 : e.key.deviceType, e.key.board < 0 ? 1 : e.key.board,
            e.key.channel < 0 ? 1 : e.key.channel});
  if (auto socketcan = FindDriver("socketcan")) {
    for (const std::string& name : socketcan->ListInterfaces()) {
      if (name.size() < 4 || name.compare(0, 3, "can") != 0) continue;
      const std::string digits = name.substr(3);
      if (digits.size() > 3 || digits.find_first_not_of("0123456789") != std::string::npos) continue;
      const int n = std::stoi(digits) + 1;
      if (n <= 255) addKey({fdtCAN_IF_VI_CAN_CARD_X, 1, n});
    }
  }
  std::vector<QFTCANInterfaceSettings> found;
  for (const CanChannelKey& k : keys) {
    auto target =
        CanChannelTable::Lookup(static_cast<std::uint32_t>(k.deviceType), static_cast<std::uint8_t>(k.board),
                                static_cast<std::uint8_t>(k.channel));
    if (!target) continue;
    auto driver = FindDriver(target->driver);
    if (!driver || !driver->IsAvailable(target->interfaceName)) continue;
    QFTCANInterfaceSettings record;
    const std::string name = target->Text();
    std::memcpy(record.head, name.data(), std::min(name.size(), sizeof record.head - 1));
    record.deviceType = static_cast<std::uint32_t>(k.deviceType);
    record.firstParameter = static_cast<std::uint8_t>(k.board);
    record.secondParameter = static_cast<std::uint8_t>(k.channel);
    found.push_back(record);
  }
  if (channels == nullptr) {
    *count = static_cast<std::uint32_t>(found.size());
    return CanResult::kOk;
  }
  const std::uint32_t n = std::min<std::uint32_t>(*count, static_cast<std::uint32_t>(found.size()));
  std::copy(found.begin(), found.begin() + n, channels);
  *count = n;
  return CanResult::kOk;
}

CanResult RegisterInterface(std::uint32_t deviceType, std::uint8_t board, std::uint8_t channel,
                            CanHandle* handle) {
  if (handle == nullptr)
    return Fail("RegisterInterface", CanResult::kInvalidParameter, "no place for the handle");
  auto target = CanChannelTable::Lookup(deviceType, board, channel);
  if (!target)
    return Fail("RegisterInterface", CanResult::kNoChannel,
                "the channel table names no channel for device type " + std::to_string(deviceType) +
                    ", board " + std::to_string(board) + ", channel " + std::to_string(channel));
  return OpenTarget("RegisterInterface", *target, handle);
}

CanResult RegisterInterfaceTarget(const std::string& target, CanHandle* handle) {
  CanChannelTarget parsed;
  if (handle == nullptr || !ParseCanChannelTarget(target, &parsed))
    return Fail("RegisterInterfaceTarget", CanResult::kInvalidParameter,
                "\"" + target + "\" is not driver:interface");
  return OpenTarget("RegisterInterfaceTarget", parsed, handle);
}

CanResult InitInterface(CanHandle handle, std::uint32_t mode, std::uint32_t queueSize,
                        std::uint32_t* initAccess) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("InitInterface", handle);
  if (initAccess == nullptr)
    return Fail("InitInterface", CanResult::kInvalidParameter, "no place for init access");
  bool controllerTiming;
  std::string busKey;
  {
    std::lock_guard lock(ch->mutex);
    ch->capacity = queueSize == 0 ? kDefaultQueueSize : std::min(queueSize, kMaxQueueSize);
    controllerTiming = ch->controllerTiming;
    busKey = ch->busKey;
  }
  *initAccess = 0;
  if ((mode & kAskInitAccess) != 0 && !controllerTiming) {
    Layer& layer = TheLayer();
    std::lock_guard lock(layer.mutex);
    BusState& bus = layer.buses[busKey];
    if (bus.initOwner == 0 || bus.initOwner == handle) {
      bus.initOwner = handle;
      *initAccess = 1;
    }
  }
  return CanResult::kOk;
}

CanResult SetBusTimingRegister(CanHandle handle, std::uint32_t busTiming0, std::uint32_t busTiming1) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("SetBusTimingRegister", handle);
  if (busTiming0 > 0xFF || busTiming1 > 0xFF)
    return Fail("SetBusTimingRegister", CanResult::kInvalidParameter, "a bus timing register exceeds 8 bits");
  std::string busKey;
  {
    std::lock_guard lock(ch->mutex);
    if (ch->controllerTiming)
      return Fail("SetBusTimingRegister", CanResult::kNoInitAccess,
                  ch->busKey + ": the bit rate of a kernel CAN interface is set with ip link");
    busKey = ch->busKey;
  }
  Layer& layer = TheLayer();
  std::lock_guard lock(layer.mutex);
  BusState& bus = layer.buses[busKey];
  if (bus.initOwner != handle)
    return Fail("SetBusTimingRegister", CanResult::kNoInitAccess,
                busKey + ": another handle has init access");
  bus.busTiming0 = static_cast<std::uint8_t>(busTiming0);
  bus.busTiming1 = static_cast<std::uint8_t>(busTiming1);
  return CanResult::kOk;
}

CanResult GetCurrentBaudrate(CanHandle handle, CanBaudrateInfo* info) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("GetCurrentBaudrate", handle);
  if (info == nullptr) return Fail("GetCurrentBaudrate", CanResult::kInvalidParameter, "no buffer");
  std::shared_ptr<CanDriverChannel> driverChannel;
  std::string busKey;
  {
    std::lock_guard lock(ch->mutex);
    if (ch->controllerTiming) driverChannel = ch->driverChannel;
    busKey = ch->busKey;
  }
  *info = CanBaudrateInfo{};
  if (driverChannel) {
    std::string error;
    const CanResult r = driverChannel->ReadControllerBitRate(&info->bitRate, &error);
    if (r != CanResult::kOk) return Fail("GetCurrentBaudrate", r, busKey + ": " + error);
    return CanResult::kOk;
  }
  Layer& layer = TheLayer();
  std::lock_guard lock(layer.mutex);
  const BusState& bus = layer.buses[busKey];
  info->busTiming0 = bus.busTiming0;
  info->busTiming1 = bus.busTiming1;
  info->bitRate = CanBitRateFromBusTiming(bus.busTiming0, bus.busTiming1);
  return CanResult::kOk;
}

CanResult SetAcceptance(CanHandle handle, std::uint32_t standardCode, std::uint32_t standardMask,
                        std::uint32_t extendedCode, std::uint32_t extendedMask) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("SetAcceptance", handle);
  std::lock_guard lock(ch->mutex);
  ch->standardCode = standardCode;
  ch->standardMask = standardMask;
  ch->extendedCode = extendedCode;
  ch->extendedMask = extendedMask;
  return CanResult::kOk;
}

CanResult SetEventNotification(CanHandle handle, std::shared_ptr<NamedEvent> event, std::int32_t mode) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("SetEventNotification", handle);
  if ((mode != 0 && mode != 1) || (mode == 1 && !event))
    return Fail("SetEventNotification", CanResult::kInvalidParameter, "mode 1 with an event, or mode 0");
  std::lock_guard lock(ch->mutex);
  ch->event = mode == 1 ? std::move(event) : nullptr;
  return CanResult::kOk;
}

CanResult ActivateChannel(CanHandle handle) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("ActivateChannel", handle);
  std::lock_guard lock(ch->mutex);
  ch->active = true;
  return CanResult::kOk;
}

CanResult ExcludeFromTrace(CanHandle handle) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("ExcludeFromTrace", handle);
  std::lock_guard lock(ch->mutex);
  ch->traced = false;
  return CanResult::kOk;
}

CanResult TransmitMessage(CanHandle handle, const CanFrameRecord& frame) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("TransmitMessage", handle);
  if (frame.frameType != kCanFrameData && frame.frameType != kCanFrameRemote)
    return Fail("TransmitMessage", CanResult::kInvalidParameter, "only data and remote frames can be sent");
  if (frame.length > 8)
    return Fail("TransmitMessage", CanResult::kInvalidParameter, "more than 8 data bytes");
  if (!ValidIdentifier(frame))
    return Fail("TransmitMessage", CanResult::kInvalidParameter,
                "identifier " + std::to_string(frame.identifier) + " is out of range");
  std::shared_ptr<CanDriverChannel> driverChannel;
  std::string traceName, busKey;
  bool traced = true;
  {
    std::lock_guard lock(ch->mutex);
    if (!ch->active)
      return Fail("TransmitMessage", CanResult::kNotActive, ch->busKey + ": the channel is not active");
    driverChannel = ch->driverChannel;
    traceName = ch->traceName;
    traced = ch->traced;
    busKey = ch->busKey;
  }
  if (!driverChannel) return UnknownHandle("TransmitMessage", handle);
  CanFrameRecord f = frame;
  f.timeStamp = CanTimeStampNow();
  std::string error;
  if (traced) CanFrameTrace::BeginSend();
  const CanResult r = driverChannel->Transmit(f, &error);
  if (traced) CanFrameTrace::EndSend(f, traceName, r == CanResult::kOk);
  if (r != CanResult::kOk) return Fail("TransmitMessage", r, busKey + ": " + error);
  return CanResult::kOk;
}

CanResult ReadReceiveQueue(CanHandle handle, CanFrameRecord* frames, std::uint32_t* count) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("ReadReceiveQueue", handle);
  if (count == nullptr || (frames == nullptr && *count > 0))
    return Fail("ReadReceiveQueue", CanResult::kInvalidParameter, "no buffer or count");
  std::lock_guard lock(ch->mutex);
  const std::uint32_t n = static_cast<std::uint32_t>(std::min<std::size_t>(*count, ch->queue.size()));
  std::copy(ch->queue.begin(), ch->queue.begin() + n, frames);
  ch->queue.erase(ch->queue.begin(), ch->queue.begin() + n);
  *count = n;
  return CanResult::kOk;
}

CanResult FlushReceiveQueue(CanHandle handle) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("FlushReceiveQueue", handle);
  std::lock_guard lock(ch->mutex);
  ch->queue.clear();
  return CanResult::kOk;
}

CanResult DeactivateChannel(CanHandle handle) {
  auto ch = FindChannel(handle);
  if (!ch) return UnknownHandle("DeactivateChannel", handle);
  std::lock_guard lock(ch->mutex);
  ch->active = false;
  return CanResult::kOk;
}

CanResult UnRegisterInterface(CanHandle handle) {
  std::shared_ptr<Channel> ch;
  {
    Layer& layer = TheLayer();
    std::lock_guard lock(layer.mutex);
    auto it = layer.channels.find(handle);
    if (it == layer.channels.end()) return UnknownHandle("UnRegisterInterface", handle);
    ch = it->second;
    layer.channels.erase(it);
    auto bus = layer.buses.find(ch->busKey);
    if (bus != layer.buses.end()) {
      if (bus->second.initOwner == handle) bus->second.initOwner = 0;
      // The timing is forgotten with the bus's last handle, as a bus nobody
      // holds is set up anew by the next one.
      if (--bus->second.handles <= 0) layer.buses.erase(bus);
    }
  }
  std::shared_ptr<CanDriverChannel> driverChannel;
  {
    std::lock_guard lock(ch->mutex);
    ch->active = false;
    ch->event.reset();
    ch->queue.clear();
    driverChannel = std::move(ch->driverChannel);
  }
  // Closed outside every lock: a driver's reader thread may be delivering.
  driverChannel.reset();
  return CanResult::kOk;
}

}  // namespace CanAccess

}  // namespace faultbox
