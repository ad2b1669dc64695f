// Number conversion in the pin file's forms, module addresses and the
// case-insensitive text helpers.
#include "config/QFCFSHelper.h"

#include "platform/Text.h"

#include <algorithm>
#include <limits>
#include <optional>
#include <set>

#include "platform/QFCReporter.h"
#include "platform/FileHelper.h"
#include "platform/MessageTable.h"
#include "platform/Settings.h"

namespace faultbox {
namespace {

constexpr int kMsgInvalidValue = 37;

// Characters that make a number text invalid in both bases; they mark unused
// values, separators and quoting in pin files. The bytes 0xA7 ... 0xFC are the
// Western European code page's section sign and German umlauts.
constexpr std::string_view kRefused =
    "\"*,.!$&=?{}|<>-;:_#'~\\/()% "
    "\xA7\xD6\xC4\xDC\xF6\xE4\xFC";
constexpr std::string_view kStrictRefused = "*,;:_#'~\\/()%";

bool HasAny(std::string_view text, std::string_view set) {
  return text.find_first_of(set) != std::string_view::npos;
}

int DigitValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'A' && c <= 'Z') return c - 'A' + 10;
  if (c >= 'a' && c <= 'z') return c - 'a' + 10;
  return 99;
}

// The standard unsigned conversion: leading white space, an optional sign,
// digits up to the first other character. Fails on overflow and, unlike the
// C library, on a minus sign (a negative number must not wrap).
bool ConvertUnsigned(std::string_view text, int base, std::uint32_t& value) {
  std::size_t i = 0;
  while (i < text.size() && QFCFSHelper::IsSpace(text[i])) ++i;
  if (i < text.size() && (text[i] == '+' || text[i] == '-')) {
    if (text[i] == '-') return false;
    ++i;
  }
  std::uint64_t result = 0;
  for (; i < text.size(); ++i) {
    const int digit = DigitValue(text[i]);
    if (digit >= base) break;
    result = result * static_cast<unsigned>(base) + static_cast<unsigned>(digit);
    if (result > 0xFFFFFFFFu) return false;
  }
  value = static_cast<std::uint32_t>(result);
  return true;
}

}  // namespace

bool QFCFSHelper::StringToNumber(std::string_view text, std::uint32_t& value, int base) {
  text = Trim(text);
  if (base == 10) {
    for (char c : text) {
      if ((c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z')) return false;
    }
  } else if (base == 16) {
    if (text.substr(0, 2) == "0x") text.remove_prefix(2);
    for (char c : text) {
      if ((c >= 'G' && c <= 'Z') || (c >= 'a' && c <= 'z')) return false;
    }
  } else {
    return false;
  }
  if (HasAny(text, kRefused)) return false;
  return ConvertUnsigned(text, base, value);
}

bool QFCFSHelper::StringToNumberStrict(std::string_view text, std::uint32_t& value, int base) {
  if (HasAny(text, kStrictRefused)) return false;
  if (base != 10 && base != 16) return false;
  std::string_view digits = text;
  if (base == 16) {
    std::string_view t = Trim(digits);
    if (t.substr(0, 2) == "0x") digits = t.substr(2);
  }
  std::uint32_t result = 0;
  if (!ConvertUnsigned(digits, base, result)) return false;
  if (result == 0 && HasAny(digits, "123456789ABCDEF")) return false;
  value = result;
  return true;
}

bool QFCFSHelper::ParseModuleAddress(std::string_view text, std::uint32_t& cabinet, std::uint32_t& rack,
                                     std::uint32_t& slot, bool report) {
  if (text == "none" || text == "-" || text == "#") {
    if (report) TheReporter().ReportInternalFault(656);
    return false;
  }
  std::string_view parts[3];
  std::size_t count = 0;
  for (std::size_t pos = 0;; ++count) {
    const std::size_t end = text.find('_', pos);
    if (count == 3) {  // a fourth part
      if (report) TheReporter().ReportInternal(34, std::string(text));
      return false;
    }
    parts[count] = text.substr(pos, end == std::string_view::npos ? std::string_view::npos : end - pos);
    if (end == std::string_view::npos) {
      ++count;
      break;
    }
    pos = end + 1;
  }
  struct Part {
    int nameId;
    std::uint32_t max;
    std::uint32_t* out;
  };
  const Part order[] = {{6727, 9, &cabinet}, {6732, 15, &rack}, {6749, 15, &slot}};
  std::uint32_t read[3] = {0, 0, 0};
  for (std::size_t i = 0; i < count; ++i) {
    if (!StringToNumber(parts[i], read[i], 10) || read[i] > order[i].max) {
      if (report) TheReporter().ReportInternal(34, ResourceString(order[i].nameId), std::string(text));
      return false;
    }
  }
  for (std::size_t i = 0; i < 3; ++i) *order[i].out = read[i];
  return true;
}

void QFCFSHelper::SortNoCase(std::vector<std::string>& list) {
  std::stable_sort(list.begin(), list.end(),
                   [](const std::string& a, const std::string& b) { return CompareNoCase(a, b) < 0; });
}

void QFCFSHelper::RemoveDuplicatesNoCase(std::vector<std::string>& list) {
  std::set<std::string> seen;
  std::vector<std::string> kept;
  kept.reserve(list.size());
  for (auto& item : list) {
    if (seen.insert(ToLower(item)).second) kept.push_back(std::move(item));
  }
  list = std::move(kept);
}

std::string QFCFSHelper::ToBitString(std::uint32_t low, std::uint32_t high) {
  const std::uint64_t bits = (static_cast<std::uint64_t>(high) << 32) | low;
  std::string out(64, '0');
  for (int i = 0; i < 64; ++i) {
    if (bits & (std::uint64_t{1} << (63 - i))) out[static_cast<std::size_t>(i)] = '1';
  }
  return out;
}

bool QFCFSHelper::PathExists(const std::string& path) {
  return !path.empty() && QFCFileHelper::Exists(QFCFileHelper::ToNative(path));
}

// One comparison without regard to case for the whole component.
bool QFCFSHelper::EqualNoCase(std::string_view a, std::string_view b) { return EqualsNoCase(a, b); }

int QFCFSHelper::CompareNoCase(std::string_view a, std::string_view b) { return faultbox::CompareNoCase(a, b); }

std::string QFCFSHelper::ToLower(std::string_view text) { return faultbox::ToLower(text); }

std::string QFCFSHelper::ToUpper(std::string_view text) { return faultbox::ToUpper(text); }

std::string_view QFCFSHelper::Trim(std::string_view text) {
  std::size_t begin = 0;
  while (begin < text.size() && IsSpace(text[begin])) ++begin;
  return TrimRight(text.substr(begin));
}

std::string_view QFCFSHelper::TrimRight(std::string_view text) {
  std::size_t end = text.size();
  while (end > 0 && IsSpace(text[end - 1])) --end;
  return text.substr(0, end);
}

std::vector<std::string_view> QFCFSHelper::Split(std::string_view text, char separator) {
  std::vector<std::string_view> out;
  Split(text, separator, out);
  return out;
}

void QFCFSHelper::Split(std::string_view text, char separator, std::vector<std::string_view>& out) {
  out.clear();
  std::size_t pos = 0;
  for (;;) {
    const std::size_t end = text.find(separator, pos);
    if (end == std::string_view::npos) {
      out.push_back(text.substr(pos));
      return;
    }
    out.push_back(text.substr(pos, end - pos));
    pos = end + 1;
  }
}

std::int32_t QFCFSHelper::ReadCountSetting(const char* section, const char* key,
                                                 std::int32_t fallback) {
  const std::optional<std::string> text = Settings::GetString(section, key);
  if (!text) return fallback;
  std::uint32_t value = 0;
  // An empty value would convert to 0 and make every wait fail at once: it is
  // no number, like any other text the conversion refuses.
  if (Trim(*text).empty() || !StringToNumber(*text, value, 10) ||
      value > static_cast<std::uint32_t>(std::numeric_limits<std::int32_t>::max())) {
    TheReporter().ReportWarning(kMsgInvalidValue, key, "Value: " + *text + ", File: " + Settings::Path());
    return fallback;
  }
  return static_cast<std::int32_t>(value);
}

}  // namespace faultbox
