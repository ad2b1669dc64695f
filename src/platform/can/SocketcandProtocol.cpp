// Reading and writing the socketcand raw-mode text protocol.
#include "platform/can/SocketcandProtocol.h"

#include <cinttypes>
#include <cstdio>

#include "platform/Text.h"

namespace faultbox {

namespace {

int HexValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

bool IsDecimal(std::string_view text) {
  if (text.empty()) return false;
  for (char c : text)
    if (c < '0' || c > '9') return false;
  return true;
}

bool ParseIdentifier(const std::string& word, CanFrameRecord* frame, std::string* error) {
  if (word.empty() || word.size() > 8) {
    *error = "identifier \"" + word + "\" is not 1 to 8 hex digits";
    return false;
  }
  std::uint32_t value = 0;
  for (char c : word) {
    const int v = HexValue(c);
    if (v < 0) {
      *error = "identifier \"" + word + "\" is not hexadecimal";
      return false;
    }
    value = value * 16 + static_cast<std::uint32_t>(v);
  }
  if (value > kCanMaxExtendedId) {
    *error = "identifier \"" + word + "\" exceeds 29 bits";
    return false;
  }
  frame->identifier = value;
  // Peers write 11-bit identifiers with 3 digits and 29-bit ones with 8.
  frame->flags = (word.size() <= 3 && value <= kCanMaxStandardId) ? 0 : kCanFlagExtended;
  return true;
}

// Data bytes from words[first..]: a word of one or two digits is one byte,
// longer words are runs of two-digit bytes, so "82 04", "8204" and "8 4" all read.
bool ParseData(const std::vector<std::string>& words, std::size_t first, CanFrameRecord* frame,
               std::string* error) {
  std::size_t n = 0;
  for (std::size_t i = first; i < words.size(); ++i) {
    const std::string& w = words[i];
    for (char c : w)
      if (HexValue(c) < 0) {
        *error = "data \"" + w + "\" is not hexadecimal";
        return false;
      }
    if (w.size() > 2 && w.size() % 2 != 0) {
      *error = "data \"" + w + "\" has an odd number of hex digits";
      return false;
    }
    const std::size_t bytes = w.size() <= 2 ? 1 : w.size() / 2;
    if (n + bytes > 8) {
      *error = "more than 8 data bytes";
      return false;
    }
    if (w.size() <= 2) {
      frame->data[n++] =
          static_cast<std::uint8_t>(w.size() == 1 ? HexValue(w[0]) : HexValue(w[0]) * 16 + HexValue(w[1]));
    } else {
      for (std::size_t k = 0; k < w.size(); k += 2)
        frame->data[n++] = static_cast<std::uint8_t>(HexValue(w[k]) * 16 + HexValue(w[k + 1]));
    }
  }
  frame->length = static_cast<std::uint8_t>(n);
  return true;
}

bool ParseTimeStamp(std::string_view word, std::uint64_t* stamp, std::string* error) {
  const std::size_t dot = word.find('.');
  const std::string_view secs = word.substr(0, dot);
  const std::string_view frac = word.substr(dot + 1);
  // 12 digits of seconds keep the product far from overflow.
  if (!IsDecimal(secs) || secs.size() > 12 || !IsDecimal(frac) || frac.size() > 9) {
    *error = "time stamp \"" + std::string(word) + "\" is not secs.usecs";
    return false;
  }
  std::uint64_t s = 0, us = 0;
  for (char c : secs) s = s * 10 + static_cast<std::uint64_t>(c - '0');
  for (std::size_t i = 0; i < 6; ++i)
    us = us * 10 + (i < frac.size() ? static_cast<std::uint64_t>(frac[i] - '0') : 0);
  *stamp = s * 1000000u + us;
  return true;
}

void AppendIdentifier(std::string& out, const CanFrameRecord& frame) {
  char buf[16];
  std::snprintf(buf, sizeof buf, frame.IsExtended() ? "%08" PRIX32 : "%03" PRIX32, frame.identifier);
  out += buf;
}

std::uint8_t DataLength(const CanFrameRecord& frame) {
  return frame.length > 8 ? 8 : frame.length;
}

}  // namespace

bool SocketcandElement::Is(std::string_view command) const {
  return !words.empty() && EqualsNoCase(words[0], command);
}

void SocketcandParser::Feed(std::string_view bytes) {
  if (pos_ > 0) {
    buffer_.erase(0, pos_);
    pos_ = 0;
  }
  buffer_.append(bytes);
}

SocketcandParser::Status SocketcandParser::Next(SocketcandElement* element, std::string* error) {
  while (pos_ < buffer_.size()) {
    if (skipping_) {
      // The rest of an element already refused: up to its '>' or a fresh '<'.
      const std::size_t stop = buffer_.find_first_of("<>", pos_);
      if (stop == std::string::npos) {
        pos_ = buffer_.size();
        return Status::kNeedMore;
      }
      skipping_ = false;
      pos_ = buffer_[stop] == '>' ? stop + 1 : stop;
      continue;
    }
    const char c = buffer_[pos_];
    if (c != '<' && (IsBlank(c) || inGarbage_)) {
      ++pos_;
      continue;
    }
    if (c != '<') {
      // One error for a run of stray text, however many reads it spans.
      inGarbage_ = true;
      *error = "text outside an element";
      return Status::kError;
    }
    inGarbage_ = false;
    const std::size_t close = buffer_.find_first_of("<>", pos_ + 1);
    if (close == std::string::npos) {
      if (buffer_.size() - pos_ - 1 > kMaxElementLength) {
        pos_ = buffer_.size();
        skipping_ = true;
        *error = "element too long";
        return Status::kError;
      }
      return Status::kNeedMore;
    }
    if (buffer_[close] == '<') {
      pos_ = close;
      *error = "'<' inside an element";
      return Status::kError;
    }
    const std::size_t start = pos_ + 1;
    pos_ = close + 1;
    if (close - start > kMaxElementLength) {
      *error = "element too long";
      return Status::kError;
    }
    element->words.clear();
    std::size_t i = start;
    while (i < close) {
      while (i < close && IsBlank(buffer_[i])) ++i;
      std::size_t j = i;
      while (j < close && !IsBlank(buffer_[j])) ++j;
      if (j > i) element->words.emplace_back(buffer_, i, j - i);
      i = j;
    }
    if (element->words.empty()) {
      *error = "empty element";
      return Status::kError;
    }
    return Status::kElement;
  }
  return Status::kNeedMore;
}

bool ParseSocketcandFrame(const SocketcandElement& element, CanFrameRecord* frame, std::string* error) {
  const auto& w = element.words;
  if (!element.Is("frame") || w.size() < 2) {
    *error = "not a frame element";
    return false;
  }
  CanFrameRecord f;
  f.frameType = kCanFrameData;
  if (!ParseIdentifier(w[1], &f, error)) return false;
  std::size_t dataStart = 2;
  if (w.size() > 2 && w[2].find('.') != std::string::npos) {
    if (!ParseTimeStamp(w[2], &f.timeStamp, error)) return false;
    dataStart = 3;
  }
  if (!ParseData(w, dataStart, &f, error)) return false;
  *frame = f;
  return true;
}

bool ParseSocketcandSend(const SocketcandElement& element, CanFrameRecord* frame, std::string* error) {
  const auto& w = element.words;
  if (!element.Is("send") || w.size() < 3) {
    *error = "not a send element";
    return false;
  }
  CanFrameRecord f;
  f.frameType = kCanFrameData;
  if (!ParseIdentifier(w[1], &f, error)) return false;
  if (!IsDecimal(w[2]) || w[2].size() > 2 || std::stoi(w[2]) > 8) {
    *error = "length \"" + w[2] + "\" is not 0 to 8";
    return false;
  }
  const int length = std::stoi(w[2]);
  if (!ParseData(w, 3, &f, error)) return false;
  if (f.length != length) {
    *error = "length " + w[2] + " but " + std::to_string(f.length) + " data bytes";
    return false;
  }
  *frame = f;
  return true;
}

std::string FormatSocketcandSend(const CanFrameRecord& frame) {
  std::string out = "< send ";
  AppendIdentifier(out, frame);
  const std::uint8_t n = DataLength(frame);
  out += ' ';
  out += std::to_string(n);
  char buf[4];
  for (std::uint8_t i = 0; i < n; ++i) {
    std::snprintf(buf, sizeof buf, " %02X", frame.data[i]);
    out += buf;
  }
  out += " >";
  return out;
}

std::string FormatSocketcandFrame(const CanFrameRecord& frame) {
  std::string out = "< frame ";
  AppendIdentifier(out, frame);
  char buf[48];
  std::snprintf(buf, sizeof buf, " %" PRIu64 ".%06" PRIu64, frame.timeStamp / 1000000u,
                frame.timeStamp % 1000000u);
  out += buf;
  const std::uint8_t n = DataLength(frame);
  if (n > 0) out += ' ';
  for (std::uint8_t i = 0; i < n; ++i) {
    std::snprintf(buf, sizeof buf, "%02X", frame.data[i]);
    out += buf;
  }
  out += " >";
  return out;
}

std::string FormatSocketcandError(std::string_view text) {
  std::string out = "< error ";
  for (char c : text) out += (c == '<' || c == '>') ? '\'' : (IsBlank(c) ? ' ' : c);
  out += " >";
  return out;
}

bool IsValidSocketcandBusName(std::string_view name) {
  if (name.empty() || name.size() > 64) return false;
  for (char c : name)
    if (static_cast<unsigned char>(c) <= 0x20 || static_cast<unsigned char>(c) >= 0x7F || c == '<' ||
        c == '>')
      return false;
  return true;
}

}  // namespace faultbox
