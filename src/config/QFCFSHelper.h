// Text helpers shared by pins, hardware descriptions and dialogs: numbers in
// the pin file's restricted forms, module addresses, and case-insensitive
// handling of text lists.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace faultbox {

class QFCFSHelper {
 public:
  // Converts a trimmed text in base 10 or 16 (other bases fail). A text that
  // holds a refused character fails: letters (base 10) or letters other than
  // the upper-case digits A-F (base 16, where a leading "0x" is dropped first),
  // blanks, quotes and the punctuation that pin files use as markers. The
  // conversion stops at the first other character; an empty text gives 0. A
  // number that does not fit 32 bits fails instead of wrapping.
  static bool StringToNumber(std::string_view text, std::uint32_t& value, int base);
  // The looser form of dialogs: fewer refused characters, any case of hex
  // digits, but a result of 0 from a text that names a non-zero digit fails
  // (nothing was converted). A negative number fails.
  static bool StringToNumberStrict(std::string_view text, std::uint32_t& value, int base);

  // Reads "cabinet_rack_slot" (decimal; cabinet 0-9, rack 0-15, slot 0-15; a
  // missing part is 0). Refusals are reported as message 35 (place 656, for
  // "none", "-" and "#") or message 34 (class 0) unless `report` is false.
  static bool ParseModuleAddress(std::string_view text, std::uint32_t& cabinet, std::uint32_t& rack,
                                 std::uint32_t& slot, bool report = true);
  // The number a module answers under: one hexadecimal digit per part.
  static std::uint32_t ModuleAddress(std::uint32_t cabinet, std::uint32_t rack, std::uint32_t slot) {
    return cabinet * 256 + rack * 16 + slot;
  }

  static void SortNoCase(std::vector<std::string>& list);
  // Keeps the first of texts that are equal without regard to case, in order.
  static void RemoveDuplicatesNoCase(std::vector<std::string>& list);
  // 64 characters '0'/'1', the highest bit of `high` first.
  static std::string ToBitString(std::uint32_t low, std::uint32_t high);
  // True when a file or folder of that name exists ('\' counts as separator).
  static bool PathExists(const std::string& path);
  // A decimal count of the settings file, `fallback` when it is missing; a
  // value that is not a decimal number from 0 up is reported (message 37,
  // class 2) and `fallback` used.
  static std::int32_t ReadCountSetting(const char* section, const char* key, std::int32_t fallback);

  // The one place where "without regard to case" is decided: ASCII letters
  // fold, every other byte compares as it is.
  static bool EqualNoCase(std::string_view a, std::string_view b);
  static int CompareNoCase(std::string_view a, std::string_view b);
  static std::string ToLower(std::string_view text);
  static std::string ToUpper(std::string_view text);
  // Blank, tab, CR, LF, vertical tab and form feed.
  static bool IsSpace(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }
  static std::string_view Trim(std::string_view text);
  static std::string_view TrimRight(std::string_view text);
  // Every separator splits: "a;;b;" gives "a", "", "b", "".
  static std::vector<std::string_view> Split(std::string_view text, char separator);
  // The same into `out` (cleared first), so that a loop can reuse its storage.
  static void Split(std::string_view text, char separator, std::vector<std::string_view>& out);
};

}  // namespace faultbox
