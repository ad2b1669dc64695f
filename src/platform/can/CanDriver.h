// The interface every CAN driver implements: a driver opens participants on
// its buses, and each participant hands what it receives to a sink.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "platform/can/CanFrame.h"

namespace faultbox {

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
  virtual CanResult ReadControllerBitRate(std::uint32_t* bitRate, std::string* error) {
    *bitRate = 0;
    *error = "the bus has no controller timing";
    return CanResult::kNotSupported;
  }
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

}  // namespace faultbox
