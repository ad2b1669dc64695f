// The frame trace of every CAN channel in candump's log form.
#pragma once

#include <string>
#include <string_view>

#include "platform/can/CanFrame.h"

namespace faultbox {

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

}  // namespace faultbox
