// The failure class collection: lookups, candidate selection and the layout
// of the failure class file.
#include "config/QFCAbstractFailureClasses.h"

#include <algorithm>

#include "config/kr40/QFCKR40FailureClasses.h"
#include "config/kr60/QFCKR60FailureClasses.h"
#include "platform/Archive.h"

namespace faultbox {
namespace {

// The smallest class object a file can hold: a 2-byte class reference, four
// empty texts and seven 32-bit numbers.
constexpr std::size_t kMinClassBytes = 2 + 4 * 1 + 7 * 4;

}  // namespace

std::unique_ptr<QFCAbstractFailureClasses> QFCAbstractFailureClasses::Create(std::int32_t platform) {
  if (platform == kFailureClassPlatformKR40) return std::make_unique<QFCKR40FailureClasses>();
  if (platform == kFailureClassPlatformKR60) return std::make_unique<QFCKR60FailureClasses>();
  return nullptr;
}

QFCAbstractFailureClass* QFCAbstractFailureClasses::GetAt(int index) const {
  return index >= 0 && index < GetCount() ? classes_[static_cast<std::size_t>(index)].get() : nullptr;
}

QFCAbstractFailureClass* QFCAbstractFailureClasses::FindById(std::int32_t id) const {
  for (const auto& c : classes_) {
    if (c->GetId() == id) return c.get();
  }
  return nullptr;
}

void QFCAbstractFailureClasses::FindByStates(const std::vector<std::uint32_t>& states,
                                             const std::vector<QFTFoundFailureClass>& candidates,
                                             std::vector<QFTFoundFailureClass>& found) const {
  found.clear();
  for (const auto& c : classes_) {
    // The candidate list names a class once per relay vector; walking the
    // class once per name would only repeat the same records.
    const bool named = std::any_of(candidates.begin(), candidates.end(), [&](const QFTFoundFailureClass& f) {
      return f.failureClassId == c->GetId();
    });
    if (!named || !c->CanUse() || c->GetPossibilityCount() == 0) continue;
    for (int j = 0; j < c->GetPossibilityCount(); ++j) {
      if (c->MatchesStates(j, states)) found.push_back({c->GetId(), j});
    }
  }
}

void QFCAbstractFailureClasses::ResetAllUses() {
  for (auto& c : classes_) c->ResetUses();
}

QFCAbstractFailureClass& QFCAbstractFailureClasses::AddFailureClass() {
  classes_.push_back(CreateFailureClass());
  return *classes_.back();
}

void QFCAbstractFailureClasses::Add(std::unique_ptr<QFCAbstractFailureClass> failureClass) {
  if (failureClass) classes_.push_back(std::move(failureClass));
}

void QFCAbstractFailureClasses::Serialize(Archive& ar) {
  if (ar.IsStoring()) {
    ar.WriteString(kFileHeader);
    ar.WriteString(version_);
    ar.WriteI32(platform_);
    ar.WriteU32(static_cast<std::uint32_t>(classes_.size()));
    for (auto& c : classes_) {
      ar.WriteObjectStart(c->GetClassName(), QFCAbstractFailureClass::kSchema);
      c->Serialize(ar);
    }
    return;
  }
  classes_.clear();
  ar.ReadString();  // the generator's header text
  version_ = ar.ReadString();
  platform_ = ar.ReadI32();
  const std::uint32_t count = ar.ReadU32CountOf(kMinClassBytes);
  for (std::uint32_t i = 0; i < count; ++i) {
    // Either class type may stand in either platform's file: both derive from
    // the abstract failure class, and the platform type decides the rest.
    const std::size_t type =
        ar.ReadObjectStart({{QFCKR40FailureClass::kClassName, QFCAbstractFailureClass::kSchema},
                            {QFCKR60FailureClass::kClassName, QFCAbstractFailureClass::kSchema}});
    std::unique_ptr<QFCAbstractFailureClass> c;
    if (type == 0) {
      c = std::make_unique<QFCKR40FailureClass>();
    } else {
      c = std::make_unique<QFCKR60FailureClass>();
    }
    c->Serialize(ar);
    classes_.push_back(std::move(c));
  }
}

}  // namespace faultbox
