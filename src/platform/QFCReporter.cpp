// The reporting operations every layer calls.
#include "platform/QFCReporter.h"

namespace faultbox {

QFCReporter& TheReporter() {
  static QFCReporter reporter;
  return reporter;
}

bool QFCReporter::StartReporting() {
  if (adapter_.Module()) return true;
  return adapter_.Create(kMainModule, 0, 1, nullptr, "Faultbox component");
}

HRESULT QFCReporter::Report(int errorClass, int number, const std::string& first, const std::string& second,
                               int dialogKind) {
  if (!adapter_.Module()) return E_FAULTBOX;
  const int handle = adapter_.SetError(errorClass, number, first, second, dialogKind);
  return ShowReported(handle, dialogKind != 0);
}

HRESULT QFCReporter::ReportError(int number, const std::string& first, const std::string& second,
                                    int dialogKind) {
  return Report(3, number, first, second, dialogKind);
}

HRESULT QFCReporter::ReportWarning(int number, const std::string& first, const std::string& second,
                                      int dialogKind) {
  return Report(2, number, first, second, dialogKind);
}

HRESULT QFCReporter::ReportInfo(int number, const std::string& first, const std::string& second,
                                   int dialogKind) {
  return Report(1, number, first, second, dialogKind);
}

HRESULT QFCReporter::ReportInternal(int number, const std::string& first, const std::string& second,
                                       int dialogKind) {
  if (!adapter_.Module()) return E_FAULTBOX;
  const int handle = adapter_.SetError(0, number, first, second, dialogKind);
  return adapter_.DisplayAllErrors(handle, true);
}

HRESULT QFCReporter::ShowReported(int handle, bool show) {
  if (!adapter_.Module()) return E_FAULTBOX;
  if (handle == 0) return 0;
  std::string text;
  adapter_.GetLastErrorText(handle, &text, false);
  return adapter_.DisplayAllErrors(handle, show);
}

HRESULT QFCReporter::ReportInternalFault(int place) {
  return ShowReported(ReportInternal(kInternalFault, std::to_string(place)), true);
}

}  // namespace faultbox
