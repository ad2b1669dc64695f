// The reporting operations of the application object.
#include "host/QFCFaultboxApp.h"

#include "platform/Settings.h"

namespace faultbox {

QFCFaultboxApp& TheApp() {
  static QFCFaultboxApp app;
  return app;
}

bool QFCFaultboxApp::StartReporting() {
  if (adapter_.Module()) return true;
  return adapter_.Create(kMainModule, 0, 1, nullptr, "Faultbox component");
}

HRESULT QFCFaultboxApp::Report(int errorClass, int number, const std::string& first, const std::string& second,
                               int dialogKind) {
  if (!adapter_.Module()) return E_FAULTBOX;
  const int handle = adapter_.SetError(errorClass, number, first, second, dialogKind);
  return ShowReported(handle, dialogKind != 0);
}

HRESULT QFCFaultboxApp::ReportError(int number, const std::string& first, const std::string& second,
                                    int dialogKind) {
  return Report(3, number, first, second, dialogKind);
}

HRESULT QFCFaultboxApp::ReportWarning(int number, const std::string& first, const std::string& second,
                                      int dialogKind) {
  return Report(2, number, first, second, dialogKind);
}

HRESULT QFCFaultboxApp::ReportInfo(int number, const std::string& first, const std::string& second,
                                   int dialogKind) {
  return Report(1, number, first, second, dialogKind);
}

HRESULT QFCFaultboxApp::ReportInternal(int number, const std::string& first, const std::string& second,
                                       int dialogKind) {
  if (!adapter_.Module()) return E_FAULTBOX;
  const int handle = adapter_.SetError(0, number, first, second, dialogKind);
  return adapter_.DisplayAllErrors(handle, true);
}

HRESULT QFCFaultboxApp::ShowReported(int handle, bool show) {
  if (!adapter_.Module()) return E_FAULTBOX;
  if (handle == 0) return 0;
  std::string text;
  adapter_.GetLastErrorText(handle, &text, false);
  return adapter_.DisplayAllErrors(handle, show);
}

HRESULT QFCFaultboxApp::ReportInternalFault(int place) {
  return ShowReported(ReportInternal(kInternalFault, std::to_string(place)), true);
}

int QFCFaultboxApp::GetUserMode() {
  int mode = userMode_.load();
  if (mode >= 0) return mode;
  const std::optional<std::string> value = Settings::GetString(Settings::kComponentSection, "UserMode");
  mode = !value ? 0 : (*value == kServiceModeCode ? 2 : 1);
  userMode_.store(mode);
  return mode;
}

}  // namespace faultbox
