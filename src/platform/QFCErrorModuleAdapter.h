// The component's door to the error module: every message of every part of
// the component goes through here.
#pragma once

#include <memory>
#include <string>

#include "platform/ResultCodes.h"
#include "platform/ErrorModule.h"

namespace faultbox {

class QFCErrorModuleAdapter {
 public:
  QFCErrorModuleAdapter() = default;
  ~QFCErrorModuleAdapter();
  QFCErrorModuleAdapter(const QFCErrorModuleAdapter&) = delete;
  QFCErrorModuleAdapter& operator=(const QFCErrorModuleAdapter&) = delete;

  bool Create(int mainModule, int first, int second, void* hostDispatch, const std::string& componentName);
  // Destroys the module; afterwards every operation answers its no-module value.
  void Destroy();
  ErrorModule* Module() { return module_.get(); }

  // Returns the record's handle, or E_FAULTBOX without a module.
  int SetError(int errorClass, int number, const std::string& first, const std::string& second, int dialogKind);
  HRESULT DisplayFirstError(int handle, bool show);
  HRESULT DisplayLastError(int handle, bool show);
  HRESULT DisplayAllErrors(int handle, bool show);
  // The newest record's text, cleared from the stack when asked.
  HRESULT GetLastErrorText(int handle, std::string* text, bool clear);
  void SetMode(bool display);
  HRESULT ClearAllErrors();
  HRESULT ClearLastError();
  int GetStackSize(int handle);
  bool IsErrorOnStack(int handle);

 private:
  std::unique_ptr<ErrorModule> module_;
};

}  // namespace faultbox
