// The socketcand raw-mode text protocol that the TCP bus and its hub speak:
// elements "< word word ... >" on a byte stream. Reading is lenient about
// what peers write differently (upper or lower case hex, data bytes with or
// without spaces, identifiers of 1 to 8 digits) and strict about what cannot
// be a frame: such input gives an error text, never a made-up frame.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "platform/CanAccess.h"

namespace faultbox {

// One element: its words, the command first ("frame", "send", "ok", ...).
struct SocketcandElement {
  std::vector<std::string> words;
  bool Is(std::string_view command) const;  // the command, without regard to case
};

// Cuts a byte stream into elements, whatever the pieces it arrives in.
class SocketcandParser {
 public:
  // An element longer than this is refused; the parser then looks for the next '<'.
  static constexpr std::size_t kMaxElementLength = 1024;

  enum class Status { kElement, kError, kNeedMore };

  void Feed(std::string_view bytes);
  // The next complete element; kError (with a text) for bytes that form none:
  // text outside the brackets, '<' inside an element, an element too long or
  // empty. Call until kNeedMore.
  Status Next(SocketcandElement* element, std::string* error);
  // Bytes held for an element not yet complete.
  std::size_t Pending() const { return buffer_.size() - pos_; }

 private:
  std::string buffer_;
  std::size_t pos_ = 0;
  bool skipping_ = false;   // inside an element already refused as too long
  bool inGarbage_ = false;  // inside stray text already refused
};

// "< frame ID secs.usecs DATA >" (the time stamp may be missing). The record
// gets the identifier, its width (up to 3 digits: 11-bit when it fits), the
// data and the time stamp.
bool ParseSocketcandFrame(const SocketcandElement& element, CanFrameRecord* frame, std::string* error);
// "< send ID LEN BYTES >"; the bytes must number LEN.
bool ParseSocketcandSend(const SocketcandElement& element, CanFrameRecord* frame, std::string* error);

// "< send 00402003 8 82 04 FE FF FF FF FC FF >"
std::string FormatSocketcandSend(const CanFrameRecord& frame);
// "< frame 00402003 1700000000.123456 8204FEFFFFFFFCFF >", stamped with the record's time stamp.
std::string FormatSocketcandFrame(const CanFrameRecord& frame);
// "< error TEXT >" with '<' and '>' in the text replaced.
std::string FormatSocketcandError(std::string_view text);

// A bus name both sides accept: 1 to 64 printable characters without blanks, '<' or '>'.
bool IsValidSocketcandBusName(std::string_view name);

}  // namespace faultbox
