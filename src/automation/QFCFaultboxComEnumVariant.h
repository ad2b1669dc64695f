// The enumerator of a collection wrapper: it walks the live model collection
// through the collection's wrapper, so that elements appended behind the
// current position are seen and the count is checked anew on every step.
#pragma once

#include <cstdint>
#include <memory>

#include "automation/AutomationTypes.h"
#include "automation/QFCAutomationCall.h"

namespace faultbox {

class QFCEnumVariant : public QFCAutomationObject {
 public:
  // Up to `count` elements from the current position into `items` (emptied
  // first); `fetched` is how many. S_OK when all came, S_FALSE when the
  // collection ended first.
  [[nodiscard]] virtual HRESULT Next(std::uint32_t count, QFTObjectArray& items, std::uint32_t& fetched) = 0;
  // Advances by `count`. E_FAULTBOX_INVALID_PARAMETER when that reaches the
  // end of the collection or would pass it; the position never passes the end.
  [[nodiscard]] virtual HRESULT Skip(std::uint32_t count) = 0;
  // Back to the first element.
  [[nodiscard]] virtual HRESULT Reset() = 0;
  // E_NOTIMPL.
  [[nodiscard]] virtual HRESULT Clone(std::shared_ptr<QFCEnumVariant>& clone) = 0;
};

// `Collection` is a collection wrapper with IsAttached, GetKeptText,
// LiveCount and LiveAt.
template <class Collection>
class QFCFaultboxComEnumVariant : public QFCEnumVariant {
 public:
  explicit QFCFaultboxComEnumVariant(std::shared_ptr<Collection> collection)
      : collection_(std::move(collection)) {}

  bool IsAttached() const override { return collection_ && collection_->IsAttached(); }

  [[nodiscard]] HRESULT Next(std::uint32_t count, QFTObjectArray& items, std::uint32_t& fetched) override {
    QFCAutomationCall frame;
    items.clear();
    fetched = 0;
    if (!IsAttached()) return frame.Detached(collection_->GetKeptText());
    const std::int64_t live = collection_->LiveCount();
    while (fetched < count && position_ < live) {
      items.push_back(collection_->LiveAt(static_cast<int>(position_)));
      ++position_;
      ++fetched;
    }
    return frame.Return(fetched == count ? S_OK : S_FALSE);
  }

  [[nodiscard]] HRESULT Skip(std::uint32_t count) override {
    QFCAutomationCall frame;
    if (!IsAttached()) return frame.Detached(collection_->GetKeptText());
    const std::int64_t live = collection_->LiveCount();
    const std::int64_t target = position_ + count;
    if (target >= live) {
      position_ = live;
      return frame.Return(E_FAULTBOX_INVALID_PARAMETER);
    }
    position_ = target;
    return frame.Return(S_OK);
  }

  [[nodiscard]] HRESULT Reset() override {
    QFCAutomationCall frame;
    if (!IsAttached()) return frame.Detached(collection_->GetKeptText());
    position_ = 0;
    return frame.Return(S_OK);
  }

  [[nodiscard]] HRESULT Clone(std::shared_ptr<QFCEnumVariant>& clone) override {
    QFCAutomationCall frame;
    clone.reset();
    if (!IsAttached()) return frame.Detached(collection_->GetKeptText());
    return frame.Return(E_NOTIMPL);
  }

 private:
  std::shared_ptr<Collection> collection_;
  std::int64_t position_ = 0;
};

}  // namespace faultbox
