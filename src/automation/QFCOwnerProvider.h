// The part of every wrapper that ties it to its model object: the owner (not
// owned; cleared when the model object goes away, never set again) and the
// text a member call reports once it is gone.
#pragma once

#include <string>
#include <utility>

#include "automation/AutomationTypes.h"
#include "automation/QFCAutomationCall.h"
#include "platform/MessageTable.h"

namespace faultbox {

template <class Model>
class QFCOwnerProvider : public QFCAutomationObject {
 public:
  static constexpr int kKeptTextId = 8907;

  explicit QFCOwnerProvider(Model* owner) : owner_(owner) {
    const char* text = ResourceString(kKeptTextId);
    keptText_ = text ? text : "The object no longer exists.";
  }

  bool IsAttached() const override { return owner_ != nullptr; }
  Model* GetOwner() const { return owner_; }
  const std::string& GetKeptText() const { return keptText_; }

  // Called once, by the model object's side, as the model object goes away.
  virtual void Detach() { owner_ = nullptr; }

 protected:
  // Runs a member: the call frame, the detached check, then `body(owner)`.
  template <class Body>
  [[nodiscard]] HRESULT Call(Body&& body) const {
    QFCAutomationCall frame;
    if (owner_ == nullptr) return frame.Detached(keptText_);
    return frame.Return(std::forward<Body>(body)(*owner_));
  }

 private:
  Model* owner_;
  std::string keptText_;
};

}  // namespace faultbox
