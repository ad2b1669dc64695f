// The bond between a model object and its one automation wrapper: it lives in
// the model object's attachment slot, holds one reference to the wrapper and
// detaches the wrapper when the model object goes away. Scripts may keep the
// wrapper longer; every member then fails with the wrapper's kept text.
#pragma once

#include <memory>

#include "config/QFCAbstractObjectData.h"

namespace faultbox {

template <class Wrapper, class Model>
class QFCInterfaceProvider : public QFCObjectAttachment {
 public:
  explicit QFCInterfaceProvider(std::shared_ptr<Wrapper> wrapper) : wrapper_(std::move(wrapper)) {}
  ~QFCInterfaceProvider() override {
    if (wrapper_) wrapper_->Detach();
  }
  QFCInterfaceProvider(const QFCInterfaceProvider&) = delete;
  QFCInterfaceProvider& operator=(const QFCInterfaceProvider&) = delete;

  const std::shared_ptr<Wrapper>& GetWrapper() const { return wrapper_; }

  // The model object's wrapper, made by `make(model)` on first use; nullptr
  // when `make` has no wrapper for it.
  template <class Make>
  static std::shared_ptr<Wrapper> Of(Model& model, Make&& make) {
    if (auto* provider = dynamic_cast<QFCInterfaceProvider*>(model.GetAttachment()))
      return provider->wrapper_;
    std::shared_ptr<Wrapper> wrapper = make(model);
    if (!wrapper) return nullptr;
    model.SetAttachment(std::make_unique<QFCInterfaceProvider>(wrapper));
    return wrapper;
  }

 private:
  std::shared_ptr<Wrapper> wrapper_;
};

}  // namespace faultbox
