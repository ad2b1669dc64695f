// Values, common checks, failure class entries and document storage of pins.
#include "config/QFCAbstractPin.h"

#include <cstdio>

#include "config/QFCECU.h"
#include "config/QFCFSHelper.h"
#include "platform/QFCReporter.h"
#include "platform/Archive.h"
#include "platform/MessageTable.h"

namespace faultbox {

// ---- value table ----

std::optional<std::string_view> QFCPinValueTable::Find(std::string_view key) const {
  if (index_) {
    auto it = index_->find(std::string(key));
    if (it == index_->end()) return std::nullopt;
    return At(it->second).second;
  }
  for (std::size_t i = 0; i < spans_.size(); ++i) {
    const Entry entry = At(i);
    if (entry.first == key) return entry.second;
  }
  return std::nullopt;
}

QFCPinValueTable::Entry QFCPinValueTable::At(std::size_t index) const {
  const Span& s = spans_[index];
  const std::string_view text(text_);
  return {text.substr(s.key, s.keyLength), text.substr(s.value, s.valueLength)};
}

void QFCPinValueTable::Set(std::string_view key, std::string_view value) {
  if (Contains(key)) {
    // Rare (values are given once per column): rebuild with the new value.
    QFCPinValueTable copy;
    copy.Reserve(spans_.size());
    for (std::size_t i = 0; i < spans_.size(); ++i) {
      const Entry e = At(i);
      copy.Set(e.first, e.first == key ? value : e.second);
    }
    *this = std::move(copy);
    return;
  }
  const auto at = static_cast<std::uint32_t>(text_.size());
  text_.append(key).append(value);
  spans_.push_back({at, static_cast<std::uint32_t>(key.size()), static_cast<std::uint32_t>(at + key.size()),
                    static_cast<std::uint32_t>(value.size())});
  if (index_) {
    index_->emplace(std::string(key), spans_.size() - 1);
  } else if (spans_.size() >= kIndexFrom) {
    index_ = std::make_unique<std::unordered_map<std::string, std::size_t>>();
    for (std::size_t i = 0; i < spans_.size(); ++i) index_->emplace(std::string(At(i).first), i);
  }
}

void QFCPinValueTable::Clear() {
  text_.clear();
  spans_.clear();
  index_.reset();
}

// ---- pin ----

namespace {

constexpr std::string_view kFailureClassLabel = "faults_ecu";

bool HasUpper(std::string_view text) {
  for (char c : text) {
    if (c >= 'A' && c <= 'Z') return true;
  }
  return false;
}

bool IsNotUsedMark(std::string_view value) {
  return value == "-" || value == "#";
}

}  // namespace

QFCAbstractPin::QFCAbstractPin(std::int32_t platform, QFCAbstractObjectData* system)
    : QFCAbstractObjectData(platform == 2 ? "Faultbox.Component_KR60" : "Faultbox.Component_KR40", kKindPin,
                            system),
      platform_(platform) {}

const std::string& QFCAbstractPin::GetRepeatableColumn() {
  static const std::string column = QFCFSHelper::ToLower(ResourceString(6709) ? ResourceString(6709) : "");
  return column;
}

// Built when asked rather than kept: short enough to need no allocation, and
// a pin is one of very many.
std::string QFCAbstractPin::Column(std::string_view name) const {
  std::string out(name);
  out.append("(").append(std::to_string(ecuVersion_)).append(")");
  return out;
}

QFCAbstractPin::~QFCAbstractPin() = default;

HRESULT QFCAbstractPin::CheckFailureClassEntry(const std::string&) const {
  return E_FAULTBOX;
}

HRESULT QFCAbstractPin::SetValue(const std::string& column, const std::string& value) {
  const std::string key = HasUpper(column) ? QFCFSHelper::ToLower(column) : column;
  if (values_.Contains(key)) {
    if (key == GetRepeatableColumn()) return FAULTBOX_OK;
    TheReporter().ReportWarning(40, key, fileName_);
    return E_FAULTBOX_INVALID_PARAMETER;
  }
  if (key == GetFailureClassColumn()) ForgetFailureClasses();
  values_.Set(key, value);
  return FAULTBOX_OK;
}

std::optional<std::string_view> QFCAbstractPin::FindValue(std::string_view column) const {
  return HasUpper(column) ? values_.Find(QFCFSHelper::ToLower(column)) : values_.Find(column);
}

int QFCAbstractPin::GetValue(std::string_view column, std::string& value) const {
  const std::optional<std::string_view> found = FindValue(column);
  if (!found) {
    TheReporter().ReportError(39, std::string(column), fileName_);
    return kMissing;
  }
  value.assign(*found);
  return IsNotUsedMark(value) ? kNotUsed : kPresent;
}

void QFCAbstractPin::SetEcuVersion(std::int32_t n) {
  ecuVersion_ = n;
  ForgetFailureClasses();
}

std::string QFCAbstractPin::PinName() const {
  const auto v = FindValue(GetPinNameColumn());
  return v ? std::string(*v) : std::string();
}

std::string QFCAbstractPin::EcuName() const {
  const auto v = FindValue(GetEcuNameColumn());
  return v ? std::string(*v) : std::string();
}

std::string QFCAbstractPin::GetFailureClassText() const {
  const auto v = FindValue(GetFailureClassColumn());
  return v ? std::string(*v) : std::string();
}

std::string QFCAbstractPin::DetailText(std::string_view value) const {
  std::string out = "Value: ";
  out.append(value).append(", pin name: ").append(PinName());
  out.append(", ECU name: ").append(EcuName()).append(", File name: ").append(fileName_);
  return out;
}

void QFCAbstractPin::ReportInvalid(std::string_view column, std::string_view value) const {
  TheReporter().ReportError(37, std::string(column), DetailText(value));
}

void QFCAbstractPin::ForgetFailureClasses() {
  failureClasses_.clear();
  failureClassOutcome_ = -1;
}

int QFCAbstractPin::ReadFailureClasses(std::vector<std::string>& list) {
  const int outcome = EnsureFailureClasses();
  list = failureClasses_;
  return outcome;
}

int QFCAbstractPin::EnsureFailureClasses() {
  if (failureClassOutcome_ < 0) {
    std::vector<std::string> entries;
    std::string text;
    int outcome = GetValue(GetFailureClassColumn(), text);
    if (outcome == kPresent) {
      const std::vector<std::string_view> items = QFCFSHelper::Split(text, ',');
      for (std::size_t i = 0; i < items.size() && outcome == kPresent; ++i) {
        std::string entry(QFCFSHelper::Trim(items[i]));
        if (entry.find_first_of("()") != std::string::npos) {
          // A parenthesised parameter list was split at its commas: join the
          // items back up to the one that closes it.
          std::size_t j = i;
          while (QFCFSHelper::Trim(items[j]).find(')') == std::string_view::npos && j + 1 < items.size()) {
            ++j;
            entry.append(",").append(QFCFSHelper::Trim(items[j]));
          }
          const bool closed = QFCFSHelper::Trim(items[j]).find(')') != std::string_view::npos;
          i = j;
          if (!closed) break;  // an entry whose ")" never comes is dropped
        }
        // An empty entry ("1,,2" or a trailing comma) is the platform's to
        // judge: both read it as ID 0, which no failure class has.
        if (Failed(CheckFailureClassEntry(entry))) {
          ReportInvalid(kFailureClassLabel, entry);
          outcome = kMissing;
          break;
        }
        entries.push_back(std::move(entry));
      }
    }
    // A refused entry ends the list; the entries before it stay, so a KR60
    // pin still offers them (a KR40 pin refuses its line on the outcome).
    failureClasses_ = std::move(entries);
    failureClassOutcome_ = outcome;
  }
  return failureClassOutcome_;
}

std::size_t QFCAbstractPin::GetFailureClassCount() {
  EnsureFailureClasses();
  return failureClasses_.size();
}

void QFCAbstractPin::SetPresent(bool present) {
  if (!present && IsConnected()) {
    char address[16];
    std::snprintf(address, sizeof address, "0x%X", GetModuleAddress());
    TheReporter().ReportWarning(109, address, PinName());
  }
  present_ = present;
}

HRESULT QFCAbstractPin::Validate() {
  std::string pinName;
  std::string ecuName;
  const int pin = GetPinName(pinName);
  if (pin == kNotUsed) return W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION;
  const int ecu = GetEcuName(ecuName);
  if (ecu == kNotUsed) {
    TheReporter().ReportError(41, "ecu_name", DetailText(ecuName));
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  if (pin == kMissing || ecu == kMissing) return E_FAULTBOX_CONSISTENCY_CHECK;
  return FAULTBOX_OK;
}

void QFCAbstractPin::Serialize(Archive& ar) {
  if (ar.IsStoring()) {
    ar.WriteCount(static_cast<std::uint32_t>(values_.Size()));
    for (const auto& [key, value] : values_) {
      ar.WriteString(key);
      ar.WriteString(value);
    }
    ar.WriteCount(static_cast<std::uint32_t>(failureClasses_.size()));
    for (const std::string& entry : failureClasses_) ar.WriteString(entry);
    ar.WriteString(fileName_);
    ar.WriteString(GetEcuNameColumn());
    ar.WriteString(GetFailureClassColumn());
    ar.WriteString(GetPinNameColumn());
    ar.WriteI32(ecuVersion_);
    ar.WriteString(GetFailureClassText());
    ar.WriteI32(0);
    ar.WriteI32(ecuVersion_);
    for (const std::string& column : GetPlatformColumns()) {
      ar.WriteString(FindValue(column).value_or(std::string_view()));
    }
    return;
  }
  if (compareOnLoad_) {
    LoadCompared(ar);
    return;
  }
  QFCPinValueTable values;
  for (std::uint32_t n = ar.ReadCountOf(2); n > 0; --n) {
    const std::string key = QFCFSHelper::ToLower(ar.ReadString());
    const std::string value = ar.ReadString();
    values.Set(key, value);
  }
  std::vector<std::string> entries;
  for (std::uint32_t n = ar.ReadCountOf(1); n > 0; --n) entries.push_back(ar.ReadString());
  std::string fileName = ar.ReadString();
  // The three column names follow from n, read next.
  for (int i = 0; i < 3; ++i) ar.ReadString();
  const std::int32_t n = ar.ReadI32();
  ar.ReadString();  // the raw failure class text is also in the values
  ar.ReadI32();
  ar.ReadI32();
  for (std::size_t i = GetPlatformColumns().size(); i > 0; --i) ar.ReadString();
  // Only a completely read pin replaces the current state.
  values_ = std::move(values);
  fileName_ = std::move(fileName);
  ecuVersion_ = n;
  failureClasses_ = std::move(entries);
  failureClassOutcome_ = failureClasses_.empty() ? -1 : kPresent;
}

void QFCAbstractPin::LoadCompared(Archive& ar) {
  for (std::uint32_t n = ar.ReadCountOf(2); n > 0; --n) {
    ar.ReadString();
    ar.ReadString();
  }
  for (std::uint32_t n = ar.ReadCountOf(1); n > 0; --n) ar.ReadString();
  for (int i = 0; i < 4; ++i) ar.ReadString();
  const std::int32_t storedN = ar.ReadI32();
  const std::string storedFailureText = ar.ReadString();
  ar.ReadI32();
  const std::int32_t storedN2 = ar.ReadI32();
  std::vector<std::pair<std::string, std::string>> platformValues;
  for (const std::string& column : GetPlatformColumns()) platformValues.emplace_back(column, ar.ReadString());

  const std::string where =
      "pin name: " + PinName() + ", ECU name: " + EcuName() + ", File name: " + fileName_;
  auto differs = [&](std::string_view column) {
    TheReporter().ReportWarning(142, std::string(column), where);
    SetModified();
    if (QFCAbstractObjectData* system = GetSystem()) system->SetChanged(true);
  };
  if (storedFailureText != GetFailureClassText()) differs(kFailureClassLabel);
  if (storedN != ecuVersion_ || storedN2 != ecuVersion_) {
    const char* label = ResourceString(6771);
    differs(label ? label : "ECU version");
  }
  for (const auto& [column, stored] : platformValues) {
    if (stored != FindValue(column).value_or(std::string_view())) differs(column);
  }
}

}  // namespace faultbox
