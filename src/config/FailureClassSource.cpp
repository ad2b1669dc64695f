// The JSON source form of failure class sets: reading with a check of every
// value, and writing in the compact form a user would write by hand.
#include "config/FailureClassSource.h"

#include <nlohmann/json.hpp>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <limits>
#include <map>
#include <optional>
#include <vector>

#include "config/QFCAbstractFailureClass.h"
#include "platform/QFCReporter.h"

namespace faultbox {
namespace {

using Json = nlohmann::json;
using OrderedJson = nlohmann::ordered_json;

// After this many refusals the rest would only bury the first ones.
constexpr int kMaxReports = 50;
constexpr std::int64_t kInt32Min = std::numeric_limits<std::int32_t>::min();
constexpr std::int64_t kInt32Max = std::numeric_limits<std::int32_t>::max();

enum class TextEncoding { kUtf8, kLatin1 };

// ---- texts ----

// Strict UTF-8: no overlong forms, no surrogates, nothing above U+10FFFF.
bool IsValidUtf8(std::string_view s) {
  std::size_t i = 0;
  while (i < s.size()) {
    const auto c = static_cast<unsigned char>(s[i]);
    std::size_t len;
    std::uint32_t cp;
    if (c < 0x80) {
      ++i;
      continue;
    } else if ((c & 0xE0) == 0xC0) {
      len = 2;
      cp = c & 0x1F;
    } else if ((c & 0xF0) == 0xE0) {
      len = 3;
      cp = c & 0x0F;
    } else if ((c & 0xF8) == 0xF0) {
      len = 4;
      cp = c & 0x07;
    } else {
      return false;
    }
    if (i + len > s.size()) return false;
    for (std::size_t k = 1; k < len; ++k) {
      const auto d = static_cast<unsigned char>(s[i + k]);
      if ((d & 0xC0) != 0x80) return false;
      cp = (cp << 6) | (d & 0x3F);
    }
    static constexpr std::uint32_t kMinOf[] = {0, 0, 0x80, 0x800, 0x10000};
    if (cp < kMinOf[len] || cp > 0x10FFFF || (cp >= 0xD800 && cp <= 0xDFFF)) return false;
    i += len;
  }
  return true;
}

std::string Latin1ToUtf8(std::string_view s) {
  std::string out;
  out.reserve(s.size());
  for (char ch : s) {
    const auto c = static_cast<unsigned char>(ch);
    if (c < 0x80) {
      out.push_back(ch);
    } else {
      out.push_back(static_cast<char>(0xC0 | (c >> 6)));
      out.push_back(static_cast<char>(0x80 | (c & 0x3F)));
    }
  }
  return out;
}

// Valid UTF-8 in (the JSON reader guarantees it); false with the first
// character that has no Latin-1 byte.
bool Utf8ToLatin1(std::string_view s, std::string& out, std::uint32_t& bad) {
  out.clear();
  for (std::size_t i = 0; i < s.size();) {
    const auto c = static_cast<unsigned char>(s[i]);
    if (c < 0x80) {
      out.push_back(static_cast<char>(c));
      ++i;
      continue;
    }
    const std::size_t len = (c & 0xE0) == 0xC0 ? 2 : (c & 0xF0) == 0xE0 ? 3 : 4;
    std::uint32_t cp = c & (len == 2 ? 0x1F : len == 3 ? 0x0F : 0x07);
    for (std::size_t k = 1; k < len && i + k < s.size(); ++k) cp = (cp << 6) | (s[i + k] & 0x3F);
    if (cp > 0xFF) {
      bad = cp;
      return false;
    }
    out.push_back(static_cast<char>(cp));
    i += len;
  }
  return true;
}

std::string Quoted(std::string_view text) {
  return "\"" + std::string(text) + "\"";
}

// A value as the user wrote it, short enough for a message.
std::string Shown(const Json& v) {
  std::string text = v.dump(-1, ' ', false, Json::error_handler_t::replace);
  if (text.size() > 40) text = text.substr(0, 37) + "...";
  return text;
}

std::optional<std::int64_t> IntegerOf(const Json& v) {
  if (v.is_number_unsigned()) {
    const auto u = v.get<std::uint64_t>();
    if (u > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())) return std::nullopt;
    return static_cast<std::int64_t>(u);
  }
  if (v.is_number_integer()) return v.get<std::int64_t>();
  return std::nullopt;
}

std::optional<std::uint32_t> StateOf(const Json& v) {
  if (v.is_string()) {
    const auto& s = v.get_ref<const std::string&>();
    if (s == "any") return kRelayAny;
    if (s == "on") return kRelayOn;
    if (s == "off") return kRelayOff;
    return std::nullopt;
  }
  std::optional<std::int64_t> n = IntegerOf(v);
  if (n && *n >= 0 && *n <= 2) return static_cast<std::uint32_t>(*n);
  return std::nullopt;
}

const char* StateWord(std::uint32_t state) {
  switch (state) {
    case kRelayAny:
      return "any";
    case kRelayOn:
      return "on";
    default:
      return "off";
  }
}

std::optional<std::int32_t> PlatformOf(const Json& v) {
  if (v.is_string()) {
    const auto& s = v.get_ref<const std::string&>();
    if (s == "KR40" || s == "KR040" || s == "KR80" || s == "KR080") return kFailureClassPlatformKR40;
    if (s == "KR60" || s == "KR060") return kFailureClassPlatformKR60;
    return std::nullopt;
  }
  std::optional<std::int64_t> n = IntegerOf(v);
  if (n && (*n == kFailureClassPlatformKR40 || *n == kFailureClassPlatformKR60))
    return static_cast<std::int32_t>(*n);
  return std::nullopt;
}

// ---- reading ----

class SourceReader {
 public:
  explicit SourceReader(const std::string& sourceName) : source_(sourceName) {}

  std::unique_ptr<QFCAbstractFailureClasses> Read(const Json& root) {
    if (!root.is_object()) {
      Refuse(source_,
             "the source must be a JSON object with the keys \"version\", \"platform\" and \"classes\"");
      return nullptr;
    }
    CheckKeys(root, {"version", "platform", "encoding", "classes"}, source_);

    if (root.contains("encoding")) {
      const Json& e = root["encoding"];
      if (e == "utf-8") {
        encoding_ = TextEncoding::kUtf8;
      } else if (e == "latin-1") {
        encoding_ = TextEncoding::kLatin1;
      } else {
        Refuse(source_, "\"encoding\" must be \"utf-8\" or \"latin-1\", not " + Shown(e));
      }
    }

    std::int32_t platform = kFailureClassPlatformKR60;
    if (!root.contains("platform")) {
      Refuse(source_, "the key \"platform\" is missing (\"KR40\" for the KR40 family, \"KR60\")");
    } else if (std::optional<std::int32_t> p = PlatformOf(root["platform"])) {
      platform = *p;
    } else {
      Refuse(source_,
             "\"platform\" must be \"KR40\" (also \"KR040\", \"KR80\", \"KR080\", or 1) or \"KR60\" "
             "(also \"KR060\", or 2), not " +
                 Shown(root["platform"]));
    }
    auto classes = QFCAbstractFailureClasses::Create(platform);

    std::string version;
    if (!root.contains("version")) {
      Refuse(source_, "the key \"version\" is missing (the version text of the set)");
    } else {
      Text(root["version"], source_, "version", version);
    }
    classes->SetVersion(version);

    if (!root.contains("classes")) {
      Refuse(source_, "the key \"classes\" is missing (the list of failure classes)");
    } else if (!root["classes"].is_array()) {
      Refuse(source_, "\"classes\" must be a list of failure classes");
    } else {
      int entry = 0;
      for (const Json& c : root["classes"]) ReadClass(c, ++entry, *classes);
    }
    return errors_ == 0 ? std::move(classes) : nullptr;
  }

  int Errors() const { return errors_; }

 private:
  void Refuse(const std::string& where, const std::string& what) {
    ++errors_;
    if (errors_ <= kMaxReports) {
      TheReporter().ReportError(kMsgFailureClassSourceValue, where, what);
    } else if (errors_ == kMaxReports + 1) {
      TheReporter().ReportError(kMsgFailureClassSourceValue, source_, "further problems are not reported");
    }
  }

  void CheckKeys(const Json& object, std::initializer_list<std::string_view> known,
                 const std::string& where) {
    for (auto it = object.begin(); it != object.end(); ++it) {
      if (std::find(known.begin(), known.end(), it.key()) == known.end()) {
        std::string list;
        for (std::string_view k : known) list += (list.empty() ? "" : ", ") + Quoted(k);
        Refuse(where, "unknown key " + Quoted(it.key()) + " (known keys: " + list + ")");
      }
    }
  }

  bool Integer(const Json& v, std::int64_t min, std::int64_t max, const std::string& where,
               const std::string& what, std::int64_t& out) {
    std::optional<std::int64_t> n = IntegerOf(v);
    if (!n || *n < min || *n > max) {
      Refuse(where, what + " must be a whole number from " + std::to_string(min) + " to " +
                        std::to_string(max) + ", not " + Shown(v));
      return false;
    }
    out = *n;
    return true;
  }

  bool Text(const Json& v, const std::string& where, const std::string& key, std::string& out) {
    if (!v.is_string()) {
      Refuse(where, Quoted(key) + " must be a text, not " + Shown(v));
      return false;
    }
    const auto& s = v.get_ref<const std::string&>();
    if (encoding_ == TextEncoding::kUtf8) {
      out = s;
      return true;
    }
    std::uint32_t bad = 0;
    if (!Utf8ToLatin1(s, out, bad)) {
      char code[16];
      std::snprintf(code, sizeof code, "U+%04X", static_cast<unsigned>(bad));
      Refuse(where, Quoted(key) + " holds the character " + code + ", which latin-1 cannot write");
      return false;
    }
    return true;
  }

  void ReadClass(const Json& c, int entry, QFCAbstractFailureClasses& classes) {
    std::string where = source_ + ": class entry " + std::to_string(entry);
    if (!c.is_object()) {
      Refuse(where, "a failure class must be a JSON object");
      return;
    }
    QFCAbstractFailureClass& fc = classes.AddFailureClass();

    // ID and name first, so that every later message can name the class.
    std::int64_t id = 0;
    bool idKnown = false;
    if (!c.contains("id")) {
      Refuse(where, "the key \"id\" is missing");
    } else {
      idKnown = Integer(c["id"], kInt32Min, kInt32Max, where, "\"id\"", id);
    }
    if (idKnown) where = source_ + ": class " + std::to_string(id);
    std::string name;
    bool nameKnown = false;
    if (!c.contains("name")) {
      Refuse(where, "the key \"name\" is missing");
    } else {
      nameKnown = Text(c["name"], where, "name", name);
    }
    if (idKnown && nameKnown) where += " " + Quoted(c["name"].get<std::string>());
    fc.SetId(static_cast<std::int32_t>(id));
    fc.SetName(name);
    if (idKnown) {
      auto [it, fresh] = firstOfId_.emplace(static_cast<std::int32_t>(id), "entry " + std::to_string(entry));
      if (fresh && nameKnown) it->second += " " + Quoted(c["name"].get<std::string>());
      if (!fresh) {
        Refuse(where, "ID " + std::to_string(id) + " is already given to class " + it->second +
                          " of \"classes\"; pins could never reach this class");
      }
    }

    CheckKeys(c,
              {"id", "name", "description", "limitation", "format", "useLimit", "storedValues", "selected",
               "relayVectors"},
              where);

    std::string text;
    if (c.contains("description") && Text(c["description"], where, "description", text))
      fc.SetDescription(text);
    if (c.contains("limitation") && Text(c["limitation"], where, "limitation", text)) fc.SetLimitation(text);
    if (c.contains("format") && Text(c["format"], where, "format", text)) fc.SetFormat(text);

    std::int64_t n = 0;
    if (c.contains("useLimit") &&
        Integer(c["useLimit"], 0, kInt32Max, where, "\"useLimit\" (0 = no limit)", n)) {
      fc.SetUseLimit(static_cast<std::int32_t>(n));
    }
    if (c.contains("storedValues")) {
      const Json& values = c["storedValues"];
      if (!values.is_array() || values.size() != 3) {
        Refuse(where, "\"storedValues\" must be a list of three whole numbers, not " + Shown(values));
      } else {
        for (int i = 0; i < 3; ++i) {
          if (Integer(values[static_cast<std::size_t>(i)], kInt32Min, kInt32Max, where,
                      "stored value " + std::to_string(i + 1), n)) {
            fc.SetStoredValue(i, static_cast<std::int32_t>(n));
          }
        }
      }
    }

    if (c.contains("relayVectors")) {
      const Json& vectors = c["relayVectors"];
      if (!vectors.is_array()) {
        Refuse(where, "\"relayVectors\" must be a list of relay vectors");
      } else {
        int index = 0;
        for (const Json& v : vectors) {
          fc.AddPossibility(ReadPossibility(v, where + ", relay vector " + std::to_string(index)));
          ++index;
        }
      }
    }

    if (c.contains("selected") && Integer(c["selected"], -1, fc.GetPossibilityCount() - 1, where,
                                          "\"selected\" (-1 = none, else the index of a relay vector)", n)) {
      fc.SetSelectedPossibility(static_cast<std::int32_t>(n));
    }
  }

  bool PositionOf(const Json& v, std::size_t size, const std::string& where, const std::string& what,
                  std::size_t& out) {
    std::int64_t n = 0;
    if (size == 0) {
      Refuse(where, what + ": the relay vector has no positions");
      return false;
    }
    if (!Integer(v, 0, static_cast<std::int64_t>(size) - 1, where, what, n)) return false;
    out = static_cast<std::size_t>(n);
    return true;
  }

  QFTPossibility ReadPossibility(const Json& v, const std::string& where) {
    if (!v.is_object()) {
      Refuse(where, "a relay vector must be a JSON object");
      return QFTPossibility();
    }
    if (v.contains("positions")) {
      for (auto it = v.begin(); it != v.end(); ++it) {
        if (it.key() != "positions") {
          Refuse(where, "the key " + Quoted(it.key()) + " cannot stand beside \"positions\" (the full list)");
        }
      }
      return ReadFullPossibility(v["positions"], where);
    }
    CheckKeys(v, {"size", "default", "on", "off", "any", "steps"}, where);

    std::int64_t size = static_cast<std::int64_t>(kRelayPositions);
    if (v.contains("size")) {
      std::int64_t n = 0;
      if (Integer(v["size"], 0, static_cast<std::int64_t>(kMaxSourcePositions), where, "\"size\"", n))
        size = n;
    }
    std::uint32_t fallback = kRelayOff;
    if (v.contains("default")) {
      if (std::optional<std::uint32_t> s = StateOf(v["default"])) {
        fallback = *s;
      } else {
        Refuse(where,
               "\"default\" must be \"off\", \"on\" or \"any\" (or 2, 1, 0), not " + Shown(v["default"]));
      }
    }
    QFTPossibility p(static_cast<std::size_t>(size), fallback);
    std::vector<const char*> namedBy(static_cast<std::size_t>(size), nullptr);

    for (const char* key : {"on", "off", "any"}) {
      if (!v.contains(key)) continue;
      const Json& list = v[key];
      if (!list.is_array()) {
        Refuse(where, Quoted(key) + " must be a list of positions, not " + Shown(list));
        continue;
      }
      const std::uint32_t state = *StateOf(Json(key));
      for (const Json& item : list) {
        std::size_t pos = 0;
        if (!PositionOf(item, p.Size(), where, "a position in " + Quoted(key), pos)) continue;
        const std::string at = where + ", position " + std::to_string(pos);
        if (namedBy[pos] != nullptr) {
          Refuse(at, "the position is named in " + Quoted(namedBy[pos]) + " and in " + Quoted(key));
          continue;
        }
        namedBy[pos] = key;
        p.Set(pos, state, 0, 0);
      }
    }

    if (v.contains("steps")) {
      const Json& steps = v["steps"];
      if (!steps.is_object()) {
        Refuse(where, "\"steps\" must be an object from position to [first, second], not " + Shown(steps));
      } else {
        for (auto it = steps.begin(); it != steps.end(); ++it) {
          const std::string& key = it.key();
          const bool digits =
              !key.empty() && key.size() <= 9 &&
              std::all_of(key.begin(), key.end(), [](char ch) { return ch >= '0' && ch <= '9'; });
          const std::size_t pos = digits ? static_cast<std::size_t>(std::stoul(key)) : p.Size();
          if (pos >= p.Size()) {
            Refuse(where, "\"steps\" names " + Quoted(key) + ", which is not a position from 0 to " +
                              std::to_string(static_cast<long>(p.Size()) - 1));
            continue;
          }
          const std::string at = where + ", position " + std::to_string(pos);
          std::uint32_t first = 0, second = 0;
          if (ReadSteps(it.value(), at, first, second)) p.Set(pos, p.RelayState(pos), first, second);
        }
      }
    }
    return p;
  }

  bool ReadSteps(const Json& v, const std::string& at, std::uint32_t& first, std::uint32_t& second) {
    if (!v.is_array() || v.size() != 2) {
      Refuse(at, "the steps must be [first, second] (activation step, deactivation step), not " + Shown(v));
      return false;
    }
    std::int64_t a = 0, b = 0;
    // Both numbers are checked, so that one run reports every bad value.
    const bool firstOk =
        Integer(v[0], 0, kMaxSourceStep, at, "the first number (activation step, 0 = every step)", a);
    const bool secondOk = Integer(v[1], 0, kMaxSourceStep, at, "the second number (deactivation step)", b);
    const bool ok = firstOk && secondOk;
    first = static_cast<std::uint32_t>(a);
    second = static_cast<std::uint32_t>(b);
    return ok;
  }

  QFTPossibility ReadFullPossibility(const Json& list, const std::string& where) {
    if (!list.is_array()) {
      Refuse(where, "\"positions\" must be a list of [state, first, second], one per position");
      return QFTPossibility();
    }
    if (list.size() > kMaxSourcePositions) {
      Refuse(where, "\"positions\" has " + std::to_string(list.size()) + " entries; at most " +
                        std::to_string(kMaxSourcePositions) + " are allowed");
      return QFTPossibility();
    }
    QFTPossibility p(list.size(), kRelayOff);
    for (std::size_t pos = 0; pos < list.size(); ++pos) {
      const std::string at = where + ", position " + std::to_string(pos);
      const Json& entry = list[pos];
      if (!entry.is_array() || entry.size() != 3) {
        Refuse(at, "each position must be [state, first, second], not " + Shown(entry));
        continue;
      }
      std::optional<std::uint32_t> state = StateOf(entry[0]);
      if (!state) {
        Refuse(at, "the relay state must be 0 (any), 1 (on) or 2 (off), not " + Shown(entry[0]));
        continue;
      }
      std::uint32_t first = 0, second = 0;
      if (!ReadSteps(Json::array({entry[1], entry[2]}), at, first, second)) continue;
      p.Set(pos, *state, first, second);
    }
    return p;
  }

  const std::string& source_;
  TextEncoding encoding_ = TextEncoding::kUtf8;
  int errors_ = 0;
  std::map<std::int32_t, std::string> firstOfId_;  // where each ID was first given
};

// ---- writing ----

// Relay vectors in the form a user writes: the states that differ from the
// most common one listed by position, and the steps of the positions that
// have any. Vectors with states a source cannot name keep the full list.
OrderedJson PossibilitySource(const QFTPossibility& p) {
  OrderedJson v = OrderedJson::object();
  const auto& states = p.RelayStates();
  const bool plain =
      std::all_of(states.begin(), states.end(), [](std::uint32_t s) { return s <= kRelayOff; });
  if (!plain || p.Size() > kMaxSourcePositions) {
    OrderedJson list = OrderedJson::array();
    for (std::size_t k = 0; k < p.Size(); ++k) {
      list.push_back(OrderedJson::array({p.RelayState(k), p.FirstNumber(k), p.SecondNumber(k)}));
    }
    v["positions"] = std::move(list);
    return v;
  }
  std::array<std::size_t, 3> count{};
  for (std::uint32_t s : states) ++count[s];
  std::uint32_t fallback = kRelayOff;
  for (std::uint32_t s : {kRelayAny, kRelayOn}) {
    if (count[s] > count[fallback]) fallback = s;
  }
  if (p.Size() != kRelayPositions) v["size"] = p.Size();
  if (fallback != kRelayOff) v["default"] = StateWord(fallback);
  for (std::uint32_t s : {kRelayOn, kRelayOff, kRelayAny}) {
    if (s == fallback || count[s] == 0) continue;
    OrderedJson list = OrderedJson::array();
    for (std::size_t k = 0; k < p.Size(); ++k) {
      if (states[k] == s) list.push_back(k);
    }
    v[StateWord(s)] = std::move(list);
  }
  OrderedJson steps = OrderedJson::object();
  for (std::size_t k = 0; k < p.Size(); ++k) {
    if (p.FirstNumber(k) != 0 || p.SecondNumber(k) != 0) {
      steps[std::to_string(k)] = OrderedJson::array({p.FirstNumber(k), p.SecondNumber(k)});
    }
  }
  if (!steps.empty()) v["steps"] = std::move(steps);
  return v;
}

// Objects one key a line; lists of plain values on one line, lists of lists
// one entry a line: relay vectors stay readable without running over pages.
void Pretty(const OrderedJson& j, int indent, std::string& out) {
  const std::string pad(static_cast<std::size_t>(indent), ' ');
  const std::string inner(static_cast<std::size_t>(indent) + 2, ' ');
  if (j.is_object() && !j.empty()) {
    out += "{\n";
    bool first = true;
    for (auto it = j.begin(); it != j.end(); ++it) {
      out += first ? "" : ",\n";
      first = false;
      out += inner + OrderedJson(it.key()).dump() + ": ";
      Pretty(it.value(), indent + 2, out);
    }
    out += "\n" + pad + "}";
  } else if (j.is_array() && !j.empty()) {
    const bool flat =
        std::none_of(j.begin(), j.end(), [](const OrderedJson& e) { return e.is_structured(); });
    if (flat) {
      out += "[";
      for (std::size_t i = 0; i < j.size(); ++i) out += (i ? ", " : "") + j[i].dump();
      out += "]";
      return;
    }
    out += "[\n";
    for (std::size_t i = 0; i < j.size(); ++i) {
      out += (i ? ",\n" : "") + inner;
      Pretty(j[i], indent + 2, out);
    }
    out += "\n" + pad + "]";
  } else {
    out += j.dump();
  }
}

}  // namespace

[[nodiscard]] HRESULT ParseFailureClassSource(std::string_view text, const std::string& sourceName,
                                std::unique_ptr<QFCAbstractFailureClasses>* out) {
  if (out) out->reset();
  Json root;
  try {
    root = Json::parse(text.begin(), text.end(), nullptr, true, /*ignore_comments=*/true);
  } catch (const Json::parse_error& e) {
    // The library's text starts with its own exception name; the rest says
    // where and why.
    std::string why = e.what();
    const std::size_t close = why.find("] ");
    if (close != std::string::npos) why = why.substr(close + 2);
    TheReporter().ReportError(kMsgFailureClassSourceSyntax, sourceName, why);
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  SourceReader reader(sourceName);
  std::unique_ptr<QFCAbstractFailureClasses> classes = reader.Read(root);
  if (!classes || reader.Errors() > 0) return E_FAULTBOX_CONSISTENCY_CHECK;
  if (out) *out = std::move(classes);
  return FAULTBOX_OK;
}

std::string FailureClassSourceText(const QFCAbstractFailureClasses& classes) {
  // Texts that are not UTF-8 come from files written elsewhere in a single-byte
  // code page; latin-1 carries every byte through unchanged.
  bool utf8 = IsValidUtf8(classes.GetVersion());
  for (int i = 0; utf8 && i < classes.GetCount(); ++i) {
    const QFCAbstractFailureClass& c = *classes.GetAt(i);
    utf8 = IsValidUtf8(c.GetName()) && IsValidUtf8(c.GetDescription()) && IsValidUtf8(c.GetLimitation()) &&
           IsValidUtf8(c.GetFormat());
  }
  auto text = [utf8](const std::string& s) { return utf8 ? s : Latin1ToUtf8(s); };

  OrderedJson root = OrderedJson::object();
  root["version"] = text(classes.GetVersion());
  if (classes.GetPlatform() == kFailureClassPlatformKR40) {
    root["platform"] = "KR40";
  } else if (classes.GetPlatform() == kFailureClassPlatformKR60) {
    root["platform"] = "KR60";
  } else {
    root["platform"] = classes.GetPlatform();
  }
  if (!utf8) root["encoding"] = "latin-1";
  OrderedJson list = OrderedJson::array();
  for (int i = 0; i < classes.GetCount(); ++i) {
    const QFCAbstractFailureClass& c = *classes.GetAt(i);
    OrderedJson cj = OrderedJson::object();
    cj["id"] = c.GetId();
    cj["name"] = text(c.GetName());
    cj["description"] = text(c.GetDescription());
    cj["limitation"] = text(c.GetLimitation());
    cj["format"] = text(c.GetFormat());
    cj["useLimit"] = c.GetUseLimit();
    cj["storedValues"] = OrderedJson::array({c.GetStoredValue(0), c.GetStoredValue(1), c.GetStoredValue(2)});
    cj["selected"] = c.GetSelectedPossibility();
    OrderedJson vectors = OrderedJson::array();
    for (int j = 0; j < c.GetPossibilityCount(); ++j)
      vectors.push_back(PossibilitySource(*c.GetPossibility(j)));
    cj["relayVectors"] = std::move(vectors);
    list.push_back(std::move(cj));
  }
  root["classes"] = std::move(list);
  std::string out;
  Pretty(root, 0, out);
  out += "\n";
  return out;
}

}  // namespace faultbox
