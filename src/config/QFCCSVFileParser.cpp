// Pin file lines and tags. Lines end only at CR LF so that a pin file written
// on Windows reads the same here; everything else is a byte of the line.
#include "config/QFCCSVFileParser.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <new>

#include "config/QFCFSHelper.h"
#include "platform/QFCReporter.h"
#include "platform/FileHelper.h"

namespace faultbox {
namespace {

// Replaces every non-overlapping `first second` pair (one of them the quote)
// by ";", scanning left to right as a plain text replacement would.
void DropQuote(std::string_view text, char first, char second, std::string& out) {
  out.clear();
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == first && i + 1 < text.size() && text[i + 1] == second) {
      out.push_back(';');
      ++i;
    } else {
      out.push_back(text[i]);
    }
  }
}

}  // namespace

bool QFCCSVFileParser::IsStartTag(std::string_view tag) {
  return tag == "/Comment" || tag == "/Format" || tag == "/Signallist";
}

bool QFCCSVFileParser::HoldsTag(std::string_view line, std::string_view tag) {
  line = QFCFSHelper::Trim(line);
  const std::size_t p = line.find(tag);
  if (p == std::string_view::npos || tag.empty()) return false;
  const std::size_t after = p + tag.size();
  if (p == 0) {
    // Only a blank or tab counts as white space after a leading tag: a lone
    // LF is a byte inside the line, so an LF-only file does not turn into
    // lines here (its one long line holds no tag).
    return after == line.size() || line[after] == ';' || line[after] == ' ' || line[after] == '\t';
  }
  return line[p - 1] == ';' && after < line.size() && line[after] == ';';
}

std::int32_t QFCCSVFileParser::TagColumnOf(std::string_view line, std::string_view tag) {
  std::int32_t column = -1;
  std::int32_t index = 0;
  for (std::string_view field : QFCFSHelper::Split(QFCFSHelper::Trim(line), ';')) {
    if (field == tag) column = index;
    ++index;
  }
  return column;
}

bool QFCCSVFileParser::Open(const std::string& path) {
  Close();
  path_ = path;
  title_ = QFCFileHelper::FileName(path);
  extension_ = path.size() >= 3 ? path.substr(path.size() - 3) : path;
  if (path.empty()) return false;
  if (path.size() < 3 || QFCFSHelper::ToUpper(extension_) != "CSV") {
    TheReporter().ReportInternal(72);
    return false;
  }
  // Non-blocking so that a FIFO or device named *.csv cannot hang the open.
  const int fd = ::open(QFCFileHelper::ToNative(path).c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  struct stat st {};
  if (fd < 0 || ::fstat(fd, &st) != 0 || !S_ISREG(st.st_mode)) {
    if (fd >= 0) ::close(fd);
    TheReporter().ReportInternal(46, path);
    return false;
  }
  if (st.st_size == 0) {
    ::close(fd);
    TheReporter().ReportInternal(73, path);
    return false;
  }
  if (st.st_size > kMaxFileSize) {
    ::close(fd);
    TheReporter().ReportInternalFault(187);
    return false;
  }
  try {
    data_.resize(static_cast<std::size_t>(st.st_size));
  } catch (const std::bad_alloc&) {
    ::close(fd);
    data_ = std::string();
    TheReporter().ReportInternalFault(186);
    return false;
  }
  std::size_t got = 0;
  while (got < data_.size()) {
    const ssize_t n = ::read(fd, data_.data() + got, data_.size() - got);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) {
      ::close(fd);
      data_ = std::string();
      TheReporter().ReportInternalFault(187);
      return false;
    }
    if (n == 0) break;  // the file shrank since fstat: take what is there
    got += static_cast<std::size_t>(n);
  }
  ::close(fd);
  data_.resize(got);
  if (data_.empty()) {
    TheReporter().ReportInternal(73, path);
    return false;
  }
  open_ = true;
  endPosition_ = static_cast<std::int32_t>(data_.size());
  currentPosition_ = 0;
  filePosition_ = 0;
  return true;
}

void QFCCSVFileParser::Close() {
  open_ = false;
  data_ = std::string();
  filePosition_ = 0;
  currentPosition_ = 0;
  endPosition_ = 0;
  tagColumn_ = -1;
}

std::string_view QFCCSVFileParser::RawLineAt(std::size_t position, std::size_t& next) const {
  const std::size_t end = data_.size();
  std::size_t search = position;
  while (search < end) {
    const void* hit = std::memchr(data_.data() + search, '\n', end - search);
    if (hit == nullptr) break;
    const std::size_t lf = static_cast<std::size_t>(static_cast<const char*>(hit) - data_.data());
    if (lf > position && data_[lf - 1] == '\r') {
      next = lf + 1;
      return std::string_view(data_).substr(position, lf - 1 - position);
    }
    search = lf + 1;
  }
  next = end;
  return position < end ? std::string_view(data_).substr(position) : std::string_view();
}

bool QFCCSVFileParser::ReadLine(std::string& line) {
  if (!open_) return false;
  std::size_t next = 0;
  line.assign(RawLineAt(filePosition_, next));
  filePosition_ = next;
  return true;
}

std::int32_t QFCCSVFileParser::FindTag(std::string_view tag, std::int32_t start) {
  if (!open_ || start < 0 || start >= endPosition_) return -1;
  currentPosition_ = start;
  filePosition_ = static_cast<std::size_t>(start);
  for (;;) {
    if (currentPosition_ >= endPosition_) {
      TheReporter().ReportInternal(76, std::string(tag));
      return -1;
    }
    std::size_t next = 0;
    const std::string_view line = RawLineAt(static_cast<std::size_t>(currentPosition_), next);
    filePosition_ = next;
    if (HoldsTag(line, tag)) {
      if (IsStartTag(tag)) tagColumn_ = TagColumnOf(line, tag);
      return currentPosition_;
    }
    currentPosition_ = static_cast<std::int32_t>(next);
  }
}

bool QFCCSVFileParser::ReadLineAt(std::string& line, std::int32_t position, std::int32_t& next,
                                  bool blankNewlines) {
  if (!open_ || position < 0 || position >= endPosition_) return false;
  std::size_t following = 0;
  const std::string_view raw = RawLineAt(static_cast<std::size_t>(position), following);
  // The line's own storage is reused from call to call.
  std::string& pass = scratch_;
  DropQuote(raw, ';', '"', pass);
  DropQuote(pass, '"', ';', line);
  if (blankNewlines) {
    for (char& c : line) {
      if (c == '\n') c = ' ';
    }
  }
  filePosition_ = following;
  next = static_cast<std::int32_t>(following);
  return true;
}

}  // namespace faultbox
