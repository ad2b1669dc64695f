// Failure classes: relay vectors, their matching and step numbers, use
// counting, and the class record of the failure class file.
#include "config/QFCAbstractFailureClass.h"

#include <algorithm>
#include <limits>
#include <utility>

#include "platform/Archive.h"

namespace faultbox {
namespace {

struct PositionRange {
  std::size_t first;
  std::size_t last;  // inclusive
  bool empty;
};

// The groups as the step lookups read them: any group other than the two
// named ones covers every position.
PositionRange RangeOf(int group) {
  if (group == kGroupLoad) return {0, 4, false};
  if (group == kGroupExternal) return {5, kRelayPositions - 1, false};
  return {0, kRelayPositions - 1, false};
}

// FindNumber knows only the two named groups; anything else finds nothing.
PositionRange StrictRangeOf(int group) {
  if (group == kGroupLoad || group == kGroupExternal) return RangeOf(group);
  return {0, 0, true};
}

// A possibility takes at least its 32-bit position count in the file, a
// position three 32-bit numbers.
constexpr std::size_t kMinPossibilityBytes = 4;
constexpr std::size_t kPositionBytes = 12;

}  // namespace

// ---- QFTPossibility ----

void QFTPossibility::Set(std::size_t position, std::uint32_t state, std::uint32_t first,
                         std::uint32_t second) {
  if (position >= relayStates_.size()) {
    relayStates_.resize(position + 1, 0);
    firstNumbers_.resize(position + 1, 0);
    secondNumbers_.resize(position + 1, 0);
  }
  relayStates_[position] = state;
  firstNumbers_[position] = first;
  secondNumbers_[position] = second;
}

std::uint64_t QFTPossibility::RelayMask() const {
  std::uint64_t mask = 0;
  const std::size_t n = std::min<std::size_t>(relayStates_.size(), 64);
  for (std::size_t j = 0; j < n; ++j) {
    if (relayStates_[j] == kRelayOn) mask |= std::uint64_t{1} << j;
  }
  return mask;
}

void QFTPossibility::Serialize(Archive& ar) {
  if (ar.IsStoring()) {
    ar.WriteU32(static_cast<std::uint32_t>(relayStates_.size()));
    for (std::size_t i = 0; i < relayStates_.size(); ++i) {
      ar.WriteU32(firstNumbers_[i]);
      ar.WriteU32(secondNumbers_[i]);
      ar.WriteU32(relayStates_[i]);
    }
    return;
  }
  const std::uint32_t n = ar.ReadU32CountOf(kPositionBytes);
  relayStates_.assign(n, 0);
  firstNumbers_.assign(n, 0);
  secondNumbers_.assign(n, 0);
  for (std::uint32_t i = 0; i < n; ++i) {
    firstNumbers_[i] = ar.ReadU32();
    secondNumbers_[i] = ar.ReadU32();
    relayStates_[i] = ar.ReadU32();
  }
}

// ---- QFCAbstractFailureClass ----

bool QFCAbstractFailureClass::MoveSelectedPossibilityLater() {
  if (!HasPossibility(selected_) || selected_ + 1 >= GetPossibilityCount()) return false;
  std::swap(possibilities_[selected_], possibilities_[selected_ + 1]);
  ++selected_;
  return true;
}

bool QFCAbstractFailureClass::MoveSelectedPossibilityEarlier() {
  if (!HasPossibility(selected_) || selected_ == 0) return false;
  std::swap(possibilities_[selected_], possibilities_[selected_ - 1]);
  --selected_;
  return true;
}

bool QFCAbstractFailureClass::CanUse() const {
  return useLimit_ == 0 || useLimit_ > useCount_;
}

bool QFCAbstractFailureClass::HasPossibility(int index) const {
  return index >= 0 && index < GetPossibilityCount();
}

bool QFCAbstractFailureClass::TryUse() {
  if (!CanUse()) return false;
  if (useCount_ < std::numeric_limits<std::int32_t>::max()) ++useCount_;
  return true;
}

void QFCAbstractFailureClass::ReleaseUse() {
  if (useCount_ > 0) --useCount_;
}

void QFCAbstractFailureClass::Clear() {
  possibilities_.clear();
  selected_ = -1;
}

std::int32_t QFCAbstractFailureClass::GetStoredValue(int which) const {
  return which >= 0 && which < 3 ? storedValues_[which] : 0;
}

void QFCAbstractFailureClass::SetStoredValue(int which, std::int32_t value) {
  if (which >= 0 && which < 3) storedValues_[which] = value;
}

bool QFCAbstractFailureClass::SetSelectedPossibility(std::int32_t index) {
  if (index != -1 && !HasPossibility(index)) return false;
  selected_ = index;
  return true;
}

const QFTPossibility* QFCAbstractFailureClass::GetPossibility(int index) const {
  return HasPossibility(index) ? &possibilities_[static_cast<std::size_t>(index)] : nullptr;
}

QFTPossibility* QFCAbstractFailureClass::GetPossibility(int index) {
  return HasPossibility(index) ? &possibilities_[static_cast<std::size_t>(index)] : nullptr;
}

bool QFCAbstractFailureClass::GetRelayMask(int index, std::uint64_t& mask) const {
  const QFTPossibility* p = GetPossibility(index);
  if (!p) return false;
  mask = p->RelayMask();
  return true;
}

bool QFCAbstractFailureClass::MatchesStates(int index, const std::vector<std::uint32_t>& states) const {
  const QFTPossibility* p = GetPossibility(index);
  if (!p) return false;
  // Every position is judged, also when the lengths differ: a relay vector of
  // another length must not pass unseen, or the interlock would let any
  // setting through.
  for (std::size_t k = 0; k < states.size(); ++k) {
    const std::uint32_t stored = p->RelayState(k);
    const std::uint32_t given = states[k];
    const bool fits =
        stored == given || (stored == kRelayOff && given == 0) || (stored == kRelayAny && given == 1);
    if (!fits) return false;
  }
  return true;
}

bool QFCAbstractFailureClass::FindNumber(int index, std::uint32_t value, int group, bool inFirst) const {
  const QFTPossibility* p = GetPossibility(index);
  const PositionRange range = StrictRangeOf(group);
  if (!p || range.empty) return false;
  for (std::size_t k = range.first; k <= range.last; ++k) {
    if ((inFirst ? p->FirstNumber(k) : p->SecondNumber(k)) == value) return true;
  }
  return false;
}

std::int32_t QFCAbstractFailureClass::GetMaxNumber(int group, bool ofFirst) const {
  if (possibilities_.empty()) return -2;
  const QFTPossibility* p = GetPossibility(selected_);
  if (!p) return -1;
  const PositionRange range = RangeOf(group);
  std::uint32_t best = 0;
  for (std::size_t k = range.first; k <= range.last; ++k) {
    best = std::max(best, ofFirst ? p->FirstNumber(k) : p->SecondNumber(k));
  }
  // A number beyond the signed range must not read as "none" (-1) or worse.
  return static_cast<std::int32_t>(std::min<std::uint32_t>(best, std::numeric_limits<std::int32_t>::max()));
}

std::vector<std::uint32_t> QFCAbstractFailureClass::GetNumbers(int index, int group, bool ofFirst) const {
  std::vector<std::uint32_t> numbers;
  const QFTPossibility* p = GetPossibility(index);
  if (!p) return numbers;
  const PositionRange range = RangeOf(group);
  for (std::size_t k = range.first; k <= range.last; ++k) {
    numbers.push_back(ofFirst ? p->FirstNumber(k) : p->SecondNumber(k));
  }
  std::sort(numbers.begin(), numbers.end());
  numbers.erase(std::unique(numbers.begin(), numbers.end()), numbers.end());
  return numbers;
}

bool QFCAbstractFailureClass::RemoveSelectedPossibility() {
  if (!HasPossibility(selected_)) return false;
  possibilities_.erase(possibilities_.begin() + selected_);
  if (!HasPossibility(selected_)) selected_ = -1;
  return true;
}

void QFCAbstractFailureClass::Serialize(Archive& ar) {
  if (ar.IsStoring()) {
    ar.WriteString(limitation_);
    ar.WriteString(format_);
    ar.WriteString(description_);
    ar.WriteI32(selected_);
    for (std::int32_t v : storedValues_) ar.WriteI32(v);
    ar.WriteI32(useLimit_);
    ar.WriteString(name_);
    ar.WriteI32(id_);
    ar.WriteU32(static_cast<std::uint32_t>(possibilities_.size()));
    for (QFTPossibility& p : possibilities_) p.Serialize(ar);
    return;
  }
  possibilities_.clear();
  useCount_ = 0;
  limitation_ = ar.ReadString();
  format_ = ar.ReadString();
  description_ = ar.ReadString();
  const std::int32_t selected = ar.ReadI32();
  for (std::int32_t& v : storedValues_) v = ar.ReadI32();
  useLimit_ = ar.ReadI32();
  name_ = ar.ReadString();
  id_ = ar.ReadI32();
  const std::uint32_t count = ar.ReadU32CountOf(kMinPossibilityBytes);
  possibilities_.resize(count, QFTPossibility(0, 0));
  for (QFTPossibility& p : possibilities_) p.Serialize(ar);
  // A selection that names no possibility would send every later reader
  // outside the list.
  selected_ = HasPossibility(selected) ? selected : -1;
}

}  // namespace faultbox
