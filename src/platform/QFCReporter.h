// The component's reporting: the one error module adapter of the process and
// the reporting operations that every layer calls.
#pragma once

#include <string>

#include "platform/QFCErrorModuleAdapter.h"
#include "platform/ResultCodes.h"

namespace faultbox {

class QFCReporter {
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

 private:
  HRESULT Report(int errorClass, int number, const std::string& first, const std::string& second, int dialogKind);

  QFCErrorModuleAdapter adapter_;
};

// The one reporter of the process.
QFCReporter& TheReporter();

}  // namespace faultbox
