// Forwarding to the error module, with the answers for a missing module.
#include "platform/QFCErrorModuleAdapter.h"

namespace faultbox {

QFCErrorModuleAdapter::~QFCErrorModuleAdapter() { Destroy(); }

bool QFCErrorModuleAdapter::Create(int mainModule, int first, int second, void* hostDispatch,
                                   const std::string& componentName) {
  auto module = std::make_unique<ErrorModule>();
  if (!module->Create(mainModule, first, second, hostDispatch, componentName)) return false;
  module_ = std::move(module);
  return true;
}

void QFCErrorModuleAdapter::Destroy() {
  if (!module_) return;
  module_->Destroy();
  module_.reset();
}

int QFCErrorModuleAdapter::SetError(int errorClass, int number, const std::string& first, const std::string& second,
                                    int dialogKind) {
  if (!module_) return E_FAULTBOX;
  return module_->SetError(errorClass, dialogKind, number, first, second);
}

HRESULT QFCErrorModuleAdapter::DisplayFirstError(int handle, bool show) {
  return module_ ? module_->DisplayFirstError(handle & 0xFFFF, show) : 0;
}

HRESULT QFCErrorModuleAdapter::DisplayLastError(int handle, bool show) {
  return module_ ? module_->DisplayLastError(handle & 0xFFFF, show) : 0;
}

HRESULT QFCErrorModuleAdapter::DisplayAllErrors(int handle, bool show) {
  return module_ ? module_->DisplayAllErrors(handle & 0xFFFF, show) : 0;
}

HRESULT QFCErrorModuleAdapter::GetLastErrorText(int, std::string* text, bool clear) {
  if (!module_) return E_FAULTBOX;
  ErrorRecord record;
  if (!module_->GetLastError(&record)) return E_FAULTBOX;
  if (clear) module_->ClearLastError();
  if (text) *text = record.Text();
  return FAULTBOX_OK;
}

void QFCErrorModuleAdapter::SetMode(bool display) {
  if (module_) module_->SetMode(display);
}

HRESULT QFCErrorModuleAdapter::ClearAllErrors() { return module_ ? module_->ClearAllErrors() : E_FAULTBOX; }

HRESULT QFCErrorModuleAdapter::ClearLastError() { return module_ ? module_->ClearLastError() : E_FAULTBOX; }

int QFCErrorModuleAdapter::GetStackSize(int handle) { return module_ ? module_->GetStackSize(handle) : 0; }

bool QFCErrorModuleAdapter::IsErrorOnStack(int handle) { return module_ && module_->IsErrorOnStack(handle); }

}  // namespace faultbox
