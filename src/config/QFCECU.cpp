// Pin ownership and the enabled state of an ECU.
#include "config/QFCECU.h"

#include <algorithm>
#include <functional>

#include "platform/QFCReporter.h"

namespace faultbox {

QFCECU::QFCECU(std::string name, QFCAbstractObjectData* system)
    : QFCAbstractObjectData(std::move(name), kKindEcu, system) {}

QFCECU::~QFCECU() = default;

namespace {

std::size_t HashName(std::string_view name) {
  return std::hash<std::string_view>{}(name);
}

}  // namespace

void QFCECU::AddPin(std::unique_ptr<QFCAbstractPin> pin) {
  if (!pin) return;
  pin->SetEcu(this);
  const std::string name = pin->PinName();
  if (!Lookup(name, HashName(name))) Insert(HashName(name), pin.get());
  pins_.push_back(std::move(pin));
}

bool QFCECU::AddPinIfNew(std::unique_ptr<QFCAbstractPin>& pin) {
  if (!pin) return false;
  const std::string name = pin->PinName();
  const std::size_t hash = HashName(name);
  if (Lookup(name, hash)) return false;
  Insert(hash, pin.get());
  pin->SetEcu(this);
  pins_.push_back(std::move(pin));
  return true;
}

QFCAbstractPin* QFCECU::FindPin(std::string_view pinName) const {
  return Lookup(pinName, HashName(pinName));
}

QFCAbstractPin* QFCECU::Lookup(std::string_view name, std::size_t hash) const {
  if (slots_.empty()) return nullptr;
  const std::size_t mask = slots_.size() - 1;
  for (std::size_t i = hash & mask; slots_[i].pin != nullptr; i = (i + 1) & mask) {
    if (slots_[i].hash == hash && slots_[i].pin->PinName() == name) return slots_[i].pin;
  }
  return nullptr;
}

void QFCECU::Insert(std::size_t hash, QFCAbstractPin* pin) {
  if ((pins_.size() + 1) * 2 > slots_.size()) {
    std::vector<Slot> old = std::move(slots_);
    slots_.assign(std::max<std::size_t>(16, old.size() * 2), Slot{});
    const std::size_t mask = slots_.size() - 1;
    for (const Slot& slot : old) {
      if (slot.pin == nullptr) continue;
      std::size_t i = slot.hash & mask;
      while (slots_[i].pin != nullptr) i = (i + 1) & mask;
      slots_[i] = slot;
    }
  }
  const std::size_t mask = slots_.size() - 1;
  std::size_t i = hash & mask;
  while (slots_[i].pin != nullptr) i = (i + 1) & mask;
  slots_[i] = {hash, pin};
}

QFCAbstractPin* QFCECU::GetPin(int index) const {
  if (index < 0 || index >= GetPinCount()) return nullptr;
  return pins_[static_cast<std::size_t>(index)].get();
}

bool QFCECU::AreAllPinsPresent() const {
  for (const auto& pin : pins_) {
    if (!pin->IsPresent()) return false;
  }
  return true;
}

bool QFCECU::SetEnabled(bool enabled, bool quiet) {
  if (IsReadOnly() && !quiet) {
    TheReporter().ReportError(136, GetName());
    return false;
  }
  if (!enabled && IsPatternActivated()) {
    TheReporter().ReportError(132, GetName());
    return false;
  }
  enabled_ = enabled;
  if (!quiet) NotifyObservers();
  SetModified();
  return true;
}

}  // namespace faultbox
