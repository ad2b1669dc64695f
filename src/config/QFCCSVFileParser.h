// The line reader of pin files: CR LF lines of ";"-separated fields, the
// tagged blocks (/Comment, /Format, /Signallist and their end tags) and the
// column in which a block's start tag stands.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace faultbox {

class QFCCSVFileParser {
 public:
  QFCCSVFileParser() = default;
  QFCCSVFileParser(const QFCCSVFileParser&) = delete;
  QFCCSVFileParser& operator=(const QFCCSVFileParser&) = delete;

  // Largest file accepted: positions are signed 32-bit offsets.
  static constexpr std::int64_t kMaxFileSize = 0x7FFFFFFF;

  // Opens the file for reading (closing any open one first). Checked in
  // this order, each failure leaving the parser closed: empty path (silent),
  // name not ending in "csv" (72), cannot open (46), empty (73), read error
  // or too large (35, place 187). The file is read whole, so a later change of
  // the file on disk does not tear a load in half.
  bool Open(const std::string& path);
  void Close();

  // The line at the current file position without its CR LF, and moves on.
  // False only when no file is open.
  bool ReadLine(std::string& line);
  // Position of the first line at or after `start` that holds `tag` as a whole
  // field, or -1 (message 76 when the end is reached). For a start tag it sets
  // the tag column.
  std::int32_t FindTag(std::string_view tag, std::int32_t start);
  // The line starting at `position`, with a double quote removed where it
  // touches a ";" and, when asked, each lone LF turned into a blank; `next` is
  // where the following line starts. False at or after the end, or when closed.
  bool ReadLineAt(std::string& line, std::int32_t position, std::int32_t& next, bool blankNewlines);

  // -1 when the last start tag's line holds no field equal to the tag: such a
  // block has no readable fields.
  std::int32_t GetTagColumn() const { return tagColumn_; }
  const std::string& GetTitle() const { return title_; }
  const std::string& GetPath() const { return path_; }
  bool IsOpen() const { return open_; }
  std::int32_t GetEndPosition() const { return endPosition_; }

  // The whole-field rule on one line (already known to hold `tag` somewhere):
  // exposed for tests and for the documentation's examples.
  static bool HoldsTag(std::string_view line, std::string_view tag);
  // 0-based index of the last ";"-field of the trimmed line equal to `tag`, or -1.
  static std::int32_t TagColumnOf(std::string_view line, std::string_view tag);
  static bool IsStartTag(std::string_view tag);

 private:
  // The raw line at `position` (without CR LF) and the start of the next one.
  std::string_view RawLineAt(std::size_t position, std::size_t& next) const;

  std::string title_;
  std::int32_t tagColumn_ = -1;
  std::string extension_;
  std::string path_;
  bool open_ = false;
  std::string data_;  // the file's bytes while open
  std::string scratch_;
  std::size_t filePosition_ = 0;
  std::int32_t currentPosition_ = 0;
  std::int32_t endPosition_ = 0;
};

}  // namespace faultbox
