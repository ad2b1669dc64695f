// Owner-chain questions and observer bookkeeping of the model objects.
#include "config/QFCAbstractObjectData.h"

#include <algorithm>

namespace faultbox {

QFCAbstractObjectData::QFCAbstractObjectData(std::string name, std::int32_t kind,
                                             QFCAbstractObjectData* owner)
    : name_(std::move(name)), kind_(kind), owner_(owner) {}

QFCAbstractObjectData::~QFCAbstractObjectData() = default;

void QFCAbstractObjectData::Serialize(Archive&) {}

bool QFCAbstractObjectData::IsConnected() const {
  const QFCAbstractObjectData* up = Upward();
  return up != nullptr && up->IsConnected();
}

bool QFCAbstractObjectData::IsPatternActivated() const {
  const QFCAbstractObjectData* up = Upward();
  return up != nullptr && up->IsPatternActivated();
}

bool QFCAbstractObjectData::IsReadOnly() const {
  const QFCAbstractObjectData* up = Upward();
  return up != nullptr && up->IsReadOnly();
}

void QFCAbstractObjectData::SetModified() {
  if (QFCAbstractObjectData* up = Upward()) up->SetModified();
}

QFCAbstractObjectData* QFCAbstractObjectData::GetSystem() const {
  // Bounded walk: a chain that loops without reaching a system gives nullptr.
  const QFCAbstractObjectData* object = this;
  for (int depth = 0; object != nullptr && depth < 64; ++depth) {
    if (object->kind_ == kKindSystem) return const_cast<QFCAbstractObjectData*>(object);
    object = object->Upward();
  }
  return nullptr;
}

void QFCAbstractObjectData::AddObserver(QFCObjectObserver* observer) {
  if (observer && std::find(observers_.begin(), observers_.end(), observer) == observers_.end()) {
    observers_.push_back(observer);
  }
}

void QFCAbstractObjectData::RemoveObserver(QFCObjectObserver* observer) {
  observers_.erase(std::remove(observers_.begin(), observers_.end(), observer), observers_.end());
}

void QFCAbstractObjectData::NotifyObservers(int hint, void* extra) {
  const std::vector<QFCObjectObserver*> current = observers_;
  for (QFCObjectObserver* observer : current) {
    // Skip observers that an earlier one removed.
    if (std::find(observers_.begin(), observers_.end(), observer) != observers_.end()) {
      observer->OnUpdate(this, hint, extra);
    }
  }
}

}  // namespace faultbox
