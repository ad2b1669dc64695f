// Adding, finding, removing and storing the pins of one pattern.
#include "patterns/QFCFailurePatternPins.h"

#include <algorithm>
#include <unordered_set>

#include "config/QFCAbstractPin.h"
#include "config/QFCECU.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "platform/Archive.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kMsgActivatedStays = 45;
constexpr int kMsgPinLost = 140;

constexpr int kPlaceAddInvalidPin = 6201;
constexpr int kPlaceAddNoPatternPin = 6202;
constexpr int kPlaceRemoveNotOurs = 6203;
constexpr int kPlaceNoPlaceholder = 6204;

// The smallest stored pattern pin entry: two one-byte names, the pin's record
// (at least its two counts, five one-byte texts and three numbers) and five entries.
constexpr std::size_t kMinEntryBytes = 2 + (2 + 2 + 5 + 12) + 20;

}  // namespace

QFCFailurePatternPins::QFCFailurePatternPins(QFCAbstractFailurePattern* pattern) : pattern_(pattern) {}

QFCFailurePatternPins::~QFCFailurePatternPins() {
  // Pattern pins refer to the placeholders: they go first.
  pins_.clear();
  placeholders_.clear();
}

std::string QFCFailurePatternPins::Key(std::string_view pinName, std::string_view ecuName) {
  std::string key;
  key.reserve(pinName.size() + ecuName.size() + 1);
  key.append(pinName).push_back('\0');
  key.append(ecuName);
  return key;
}

void QFCFailurePatternPins::RebuildIndex() const {
  index_.clear();
  index_.reserve(pins_.size());
  for (const auto& pin : pins_) {
    const QFCAbstractPin* referenced = pin->GetPin();
    if (referenced == nullptr) continue;
    index_.emplace(Key(referenced->PinName(), referenced->EcuName()), pin.get());
  }
  indexDirty_ = false;
}

QFCAbstractFailurePatternPin* QFCFailurePatternPins::FindPin(std::string_view pinName,
                                                             std::string_view ecuName) const {
  if (indexDirty_) RebuildIndex();
  auto it = index_.find(Key(pinName, ecuName));
  return it == index_.end() ? nullptr : it->second;
}

bool QFCFailurePatternPins::Contains(const QFCAbstractFailurePatternPin* pin) const {
  return std::any_of(pins_.begin(), pins_.end(), [pin](const auto& p) { return p.get() == pin; });
}

QFCAbstractFailurePatternPin* QFCFailurePatternPins::GetAt(int index) const {
  if (index < 0 || index >= GetCount()) return nullptr;
  return pins_[static_cast<std::size_t>(index)].get();
}

bool QFCFailurePatternPins::AddPin(QFCAbstractPin* pin, QFCAbstractFailurePatternPin*& out,
                                   bool runInterlock) {
  out = nullptr;
  if (pin == nullptr || pattern_ == nullptr) {
    TheReporter().ReportInternalFault(kPlaceAddInvalidPin);
    return false;
  }
  // A placeholder's names are not known before its record is read.
  const bool fromPinFile = pin->GetCompareOnLoad();
  const std::string pinName = fromPinFile ? pin->PinName() : std::string();
  const std::string ecuName = fromPinFile ? pin->EcuName() : std::string();
  if (QFCAbstractFailurePatternPin* existing = FindPin(pinName, ecuName)) {
    out = existing;
    return true;
  }
  std::unique_ptr<QFCAbstractFailurePatternPin> patternPin = pattern_->CreatePatternPin();
  if (!patternPin) {
    TheReporter().ReportInternalFault(kPlaceAddNoPatternPin);
    return false;
  }
  patternPin->SetPin(pin);
  out = patternPin.get();
  pins_.push_back(std::move(patternPin));
  if (!indexDirty_) index_.emplace(Key(pinName, ecuName), out);
  if (!fromPinFile) indexDirty_ = true;
  if (runInterlock) pattern_->OnPinChanged(nullptr);
  return true;
}

bool QFCFailurePatternPins::RemovePins(const std::vector<QFCAbstractFailurePatternPin*>& pins) {
  std::unordered_set<const QFCAbstractFailurePatternPin*> going;
  for (QFCAbstractFailurePatternPin* pin : pins) {
    // Only this pattern's own pins can leave it; by identity, so that a pin
    // of another pattern never takes a namesake of this one with it.
    if (pin == nullptr || !Contains(pin)) {
      TheReporter().ReportInternalFault(kPlaceRemoveNotOurs);
      continue;
    }
    if (pin->IsActivated()) {
      TheReporter().ReportWarning(kMsgActivatedStays, pin->GetPinName());
      continue;
    }
    going.insert(pin);
  }
  if (going.empty()) return true;
  for (const auto& pin : pins_)
    if (going.count(pin.get()) != 0) pin->ReleaseFailureClass();
  pins_.erase(
      std::remove_if(pins_.begin(), pins_.end(), [&](const auto& p) { return going.count(p.get()) != 0; }),
      pins_.end());
  indexDirty_ = true;
  return true;
}

void QFCFailurePatternPins::RemoveAll() {
  pins_.clear();
  placeholders_.clear();
  index_.clear();
  indexDirty_ = false;
}

void QFCFailurePatternPins::ReleaseFailureClasses() {
  for (const auto& pin : pins_) pin->ReleaseFailureClass();
}

QFCAbstractPin* QFCFailurePatternPins::FindSystemPin(const std::string& pinName,
                                                     const std::string& ecuName) const {
  const QFCSystem* system = pattern_ ? pattern_->GetOwnerSystem() : nullptr;
  if (system == nullptr) return nullptr;
  // ECU names are exact; additional pin files may bring an ECU of the same name.
  for (QFCECU* ecu : system->GetECUs()) {
    if (ecu == nullptr || ecu->GetName() != ecuName) continue;
    QFCAbstractPin* pin = ecu->FindPin(pinName);
    if (pin != nullptr && pin->GetCompareOnLoad() && pin->PinName() == pinName) return pin;
  }
  return nullptr;
}

void QFCFailurePatternPins::Serialize(Archive& ar, int& lostPins) {
  if (ar.IsStoring()) {
    ar.WriteU32(static_cast<std::uint32_t>(pins_.size()));
    for (const auto& pin : pins_) {
      QFCAbstractPin* referenced = pin->GetPin();
      ar.WriteString(referenced ? referenced->PinName() : std::string());
      ar.WriteString(referenced ? referenced->EcuName() : std::string());
      if (referenced) referenced->Serialize(ar);
      for (std::uint32_t entry : pin->GetPinConfig()) ar.WriteU32(entry);
    }
    return;
  }
  const std::uint32_t count = ar.ReadU32CountOf(kMinEntryBytes);
  for (std::uint32_t i = 0; i < count; ++i) {
    const std::string pinName = ar.ReadString();
    const std::string ecuName = ar.ReadString();
    QFCAbstractPin* pin = FindSystemPin(pinName, ecuName);
    if (pin == nullptr) {
      std::unique_ptr<QFCAbstractPin> placeholder = pattern_->CreatePlaceholderPin();
      if (!placeholder) {
        TheReporter().ReportInternalFault(kPlaceNoPlaceholder);
        throw ArchiveException(ArchiveCause::kGeneric, "no placeholder pin for a lost pin");
      }
      // Cleared so that the pin's record, read next, fills it completely.
      placeholder->SetCompareOnLoad(false);
      pin = placeholder.get();
      placeholders_.push_back(std::move(placeholder));
      TheReporter().ReportWarning(kMsgPinLost, "Pin name: " + pinName + ",ECU name: " + ecuName);
      ++lostPins;
    }
    QFCAbstractFailurePatternPin* patternPin = nullptr;
    if (!AddPin(pin, patternPin, false) || patternPin == nullptr)
      throw ArchiveException(ArchiveCause::kGeneric, "pattern pin could not be added");
    pin->Serialize(ar);
    QFCAbstractFailurePatternPin::PinConfig config{};
    for (std::uint32_t& entry : config) entry = ar.ReadU32();
    patternPin->SetPinConfigs(config);
    // A placeholder knows its names only now.
    if (!pin->GetCompareOnLoad()) indexDirty_ = true;
  }
}

}  // namespace faultbox
