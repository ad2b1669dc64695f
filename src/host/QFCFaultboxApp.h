// The component's application object: it owns the error reporting and offers
// the reporting operations that every part of the component calls.
#pragma once

#include <atomic>
#include <string>

#include "host/QFCErrorModuleAdapter.h"
#include "host/ResultCodes.h"

namespace faultbox {

class QFCFaultboxApp {
 public:
  static constexpr int kMainModule = 33;
  static constexpr int kInternalFault = 35;

  QFCErrorModuleAdapter& ErrorAdapter() { return adapter_; }
  // Creates the error module (main module 33, "Faultbox component"); false when it cannot be created.
  bool StartReporting();
  void StopReporting() { adapter_.Destroy(); }
  // The error module, or nullptr before StartReporting.
  ErrorModule* Module() { return adapter_.Module(); }

  // Report with class 3, 2 or 1, then show what is reported; without a module
  // they report nothing and answer E_FAULTBOX.
  HRESULT ReportError(int number, const std::string& first = {}, const std::string& second = {}, int dialogKind = 0);
  HRESULT ReportWarning(int number, const std::string& first = {}, const std::string& second = {},
                        int dialogKind = 0);
  HRESULT ReportInfo(int number, const std::string& first = {}, const std::string& second = {}, int dialogKind = 0);
  // Class 0, displayed at once; returns the display's result.
  HRESULT ReportInternal(int number, const std::string& first = {}, const std::string& second = {},
                         int dialogKind = 0);
  HRESULT ShowReported(int handle, bool show);

  // Message 35 naming the place in the code that found a missing or invalid object.
  HRESULT ReportInternalFault(int place);

  // The "UserMode" value of the component's settings that switches to the
  // service mode 2.
  static constexpr const char* kServiceModeCode = "8C3E51A7-2F64-4B9D-A0E7-6D15F2C94B38";
  // The user mode: 0 without a "UserMode" setting, 2 when it is the service
  // code, 1 for any other value. Read on first use and then kept.
  int GetUserMode();
  // Forgets the mode read, so that the next GetUserMode reads the setting again.
  void ResetUserMode() { userMode_ = -1; }

 private:
  HRESULT Report(int errorClass, int number, const std::string& first, const std::string& second, int dialogKind);

  QFCErrorModuleAdapter adapter_;
  std::atomic<int> userMode_{-1};  // -1 until read
};

// The one application object of the process.
QFCFaultboxApp& TheApp();

}  // namespace faultbox
