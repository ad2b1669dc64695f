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

#include <cstdint>
#include <memory>
#include <string>

#include "platform/InterfaceSettings.h"
#include "platform/can/CanDriver.h"
#include "platform/can/CanFrame.h"
#include "platform/can/ChannelTable.h"
#include "platform/can/FrameTrace.h"
#include "platform/can/NamedEvent.h"

namespace faultbox {

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
