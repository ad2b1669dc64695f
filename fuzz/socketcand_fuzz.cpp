// Drives the socketcand text protocol reader over arbitrary bytes, cut into
// reads of varying size as a socket delivers them. Every frame or send
// element it accepts must survive being written and read again unchanged.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

#include "platform/can/SocketcandProtocol.h"

namespace {

using namespace faultbox;

bool Same(const CanFrameRecord& a, const CanFrameRecord& b) {
  return a.identifier == b.identifier && a.flags == b.flags && a.length == b.length &&
         std::memcmp(a.data, b.data, a.length) == 0;
}

void Check(const SocketcandElement& element) {
  CanFrameRecord frame, again;
  std::string error;
  SocketcandParser reparse;
  SocketcandElement written;
  if (ParseSocketcandFrame(element, &frame, &error)) {
    reparse.Feed(FormatSocketcandFrame(frame));
    if (reparse.Next(&written, &error) != SocketcandParser::Status::kElement ||
        !ParseSocketcandFrame(written, &again, &error) || !Same(frame, again) ||
        frame.timeStamp != again.timeStamp)
      std::abort();
  }
  if (ParseSocketcandSend(element, &frame, &error)) {
    reparse.Feed(FormatSocketcandSend(frame));
    if (reparse.Next(&written, &error) != SocketcandParser::Status::kElement ||
        !ParseSocketcandSend(written, &again, &error) || !Same(frame, again))
      std::abort();
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  // The first byte sets the size of each read (1 to 64 bytes).
  const std::size_t step = (data[0] % 64) + 1;
  const char* text = reinterpret_cast<const char*>(data + 1);
  const std::size_t length = size - 1;
  SocketcandParser parser;
  SocketcandElement element;
  std::string error;
  for (std::size_t at = 0; at < length; at += step) {
    parser.Feed(std::string_view(text + at, std::min(step, length - at)));
    for (;;) {
      const auto status = parser.Next(&element, &error);
      if (status == SocketcandParser::Status::kNeedMore) break;
      if (status == SocketcandParser::Status::kElement) Check(element);
    }
    // Nothing may pile up beyond one element's worth of bytes and one read.
    if (parser.Pending() > SocketcandParser::kMaxElementLength + 2 + step) std::abort();
  }
  return 0;
}
