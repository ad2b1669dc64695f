// Creating, naming, finding, removing and storing the patterns of a system.
#include "patterns/QFCFailurePatterns.h"
#include "platform/MessageTable.h"

#include "config/QFCAbstractHardwareInfo.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCFailurePatternNode.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/kr40/QFCKR40FailurePattern.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"
#include "platform/Archive.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kMsgNameNotUnique = 87;
constexpr int kMsgPatternNotCreated = 94;

constexpr int kResDefaultName = 6769;

constexpr int kPlaceUnknownPlatform = 6301;
constexpr int kPlaceRemoveIndex = 6302;
constexpr int kPlaceRemoveName = 6303;
constexpr int kPlaceRenameInvalid = 6304;

// The smallest stored pattern: view flag, a one-byte name, the pin count.
constexpr std::size_t kMinPatternBytes = 4 + 1 + 4;

}  // namespace

QFCFailurePatterns::QFCFailurePatterns(QFCSystem* system) : system_(system) {}

QFCFailurePatterns::~QFCFailurePatterns() = default;

std::int32_t QFCFailurePatterns::GetPlatformType() const {
  return system_ ? system_->GetPlatformType() : 0;
}

std::unique_ptr<QFCAbstractFailurePattern> QFCFailurePatterns::NewPattern(std::int32_t platformType,
                                                                          const std::string& name) {
  if (platformType == fptKR40Platform) return std::make_unique<QFCKR40FailurePattern>(name, system_);
  if (platformType == fptKR60Platform) return std::make_unique<QFCKR60FailurePattern>(name, system_);
  return nullptr;
}

std::string QFCFailurePatterns::MakeDefaultName() const {
  // Among count + 1 numbers one is always free.
  const int last = GetCount() + 1;
  for (int number = 1; number <= last; ++number) {
    std::string name = ResourceText(kResDefaultName, {std::to_string(number)});
    if (!NameExists(name) || number == last) return name;
  }
  return {};
}

HRESULT QFCFailurePatterns::CreatePattern(QFCAbstractFailurePattern*& out, const std::string& name) {
  out = nullptr;
  const std::string patternName = name.empty() ? MakeDefaultName() : name;
  if (NameExists(patternName)) {
    TheReporter().ReportInternal(kMsgNameNotUnique, patternName);
    return E_FAULTBOX_NAME_NOT_UNIQUE;
  }
  std::unique_ptr<QFCAbstractFailurePattern> pattern = NewPattern(GetPlatformType(), patternName);
  if (!pattern) {
    TheReporter().ReportInternalFault(kPlaceUnknownPlatform);
    return E_FAULTBOX;
  }
  pattern->SetCollection(this);
  if (HRESULT result = pattern->Initialize(); result != FAULTBOX_OK) return result;
  out = pattern.get();
  patterns_.push_back(std::move(pattern));
  if (system_) system_->SetModified();
  return FAULTBOX_OK;
}

QFCAbstractFailurePattern* QFCFailurePatterns::FindPattern(std::string_view name) const {
  for (const auto& pattern : patterns_)
    if (pattern->GetName() == name) return pattern.get();
  return nullptr;
}

QFCAbstractFailurePattern* QFCFailurePatterns::GetAt(int index) const {
  if (index < 0 || index >= GetCount()) return nullptr;
  return patterns_[static_cast<std::size_t>(index)].get();
}

int QFCFailurePatterns::IndexOf(const QFCAbstractFailurePattern* pattern) const {
  for (std::size_t i = 0; i < patterns_.size(); ++i)
    if (patterns_[i].get() == pattern) return static_cast<int>(i);
  return -1;
}

bool QFCFailurePatterns::RemoveAt(int index) {
  if (index < 0 || index >= GetCount()) {
    TheReporter().ReportInternalFault(kPlaceRemoveIndex);
    return false;
  }
  auto it = patterns_.begin() + index;
  QFCAbstractFailurePattern* pattern = it->get();
  pattern->NotifyObservers(QFCAbstractFailurePattern::kHintObjectGone, pattern);
  // No folder may keep a reference to a pattern that is gone, and a
  // use-limited class must not stay blocked by its pins.
  if (root_) root_->RemovePatternEverywhere(pattern);
  if (QFCFailurePatternPins* pins = pattern->GetPins()) pins->ReleaseFailureClasses();
  std::unique_ptr<QFCAbstractFailurePattern> going = std::move(*it);
  patterns_.erase(it);
  return true;
}

bool QFCFailurePatterns::RemovePattern(std::string_view name) {
  const int index = IndexOf(FindPattern(name));
  if (index < 0) {
    TheReporter().ReportInternalFault(kPlaceRemoveName);
    return false;
  }
  const bool removed = RemoveAt(index);
  if (removed && system_) system_->SetModified();
  return removed;
}

bool QFCFailurePatterns::RenamePattern(QFCAbstractFailurePattern* pattern, const std::string& name) {
  if (pattern == nullptr || IndexOf(pattern) < 0) {
    TheReporter().ReportInternalFault(kPlaceRenameInvalid);
    return false;
  }
  if (NameExists(name)) {
    TheReporter().ReportError(kMsgNameNotUnique, name);
    return false;
  }
  pattern->SetName(name);
  pattern->UpdateViews(QFCAbstractFailurePattern::kHintRenamed);
  return true;
}

bool QFCFailurePatterns::GetActivatedPattern(QFCAbstractFailurePattern*& out) const {
  out = nullptr;
  for (const auto& pattern : patterns_)
    if (pattern->IsAnyPinActivated()) out = pattern.get();
  return out != nullptr;
}

void QFCFailurePatterns::ClearActivatedFlags() {
  for (const auto& pattern : patterns_) pattern->ClearActivatedFlags();
}

HRESULT QFCFailurePatterns::ResetHardware() {
  if (hardwareReset_) return hardwareReset_();
  ClearActivatedFlags();
  return FAULTBOX_OK;
}

void QFCFailurePatterns::OpenSavedViews() {
  for (const auto& pattern : patterns_) pattern->OpenSavedView();
}

void QFCFailurePatterns::RemoveAllPatterns() {
  while (!patterns_.empty()) RemoveAt(GetCount() - 1);
}

void QFCFailurePatterns::Serialize(Archive& ar) {
  if (ar.IsStoring()) {
    ar.WriteU32(static_cast<std::uint32_t>(patterns_.size()));
    for (const auto& pattern : patterns_) pattern->Serialize(ar);
    return;
  }
  RemoveAllPatterns();
  lostPinsOnLoad_ = 0;
  const std::uint32_t count = ar.ReadU32CountOf(kMinPatternBytes);
  for (std::uint32_t i = 0; i < count; ++i) {
    QFCAbstractFailurePattern* pattern = nullptr;
    if (CreatePattern(pattern, "") != FAULTBOX_OK || pattern == nullptr) {
      // The record has no length: without a pattern to read it into, the
      // rest of the document cannot be found.
      TheReporter().ReportError(kMsgPatternNotCreated);
      throw ArchiveException(ArchiveCause::kGeneric, "failure pattern could not be created");
    }
    pattern->Serialize(ar);
  }
}

}  // namespace faultbox
