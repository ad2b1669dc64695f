// The automation call frame and the per-thread error information.
#include "automation/QFCAutomationCall.h"
#include "platform/MessageTable.h"

#include <algorithm>
#include <atomic>
#include <optional>
#include <vector>

#include "patterns/QFCAbstractFailurePattern.h"

namespace faultbox {

namespace {

// A counter rather than a flag: a member may run while another thread's
// member waits on the hardware, and the mark must stay until both returned.
std::atomic<int> g_callsInProgress{0};
thread_local std::optional<QFTErrorInfo> t_errorInfo;

struct CodeText {
  HRESULT code;
  int resource;
};

constexpr CodeText kCodeTexts[] = {
    {E_FAULTBOX, 8906},
    {E_FAULTBOX_CANN_NOT_OPEN_FILE, 6715},
    {E_FAULTBOX_FILE_IS_NOT_OPENED, 6715},
    {E_FAULTBOX_NAME_NOT_UNIQUE, 6719},
    {E_FAULTBOX_INITIALIZE, 6720},
    {W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION, 6720},
    {E_FAULTBOX_MSG_WAS_NOT_TRANSMITED, 6720},
    {E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING, 6720},
    {E_FAULTBOX_MESSAGE_BUILD, 6720},
    {E_FAULTBOX_TAG_NOT_FOUND, 6724},
    {E_FAULTBOX_HEADER_COL_NOT_FOUND, 6724},
    {E_FAULTBOX_CONSISTENCY_CHECK, 6724},
    {E_FAULTBOX_PIN_WAS_DELETED_FROM_PIN_FILE, 6742},
    {E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED, 6712},
    {E_FAULTBOX_RECEIVE_MESSAGE, 6723},
    {E_FAULTBOX_EVALUATE_MESSAGE, 6723},
    {E_FAULTBOX_CONNECT, 6721},
    {E_FAULTBOX_DISCONNECT, 6722},
    {E_FAULTBOX_OTHER_SYSTEM_FOR_SAME_HIL_IS_ACTIVATED, 6748},
    {E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE, 8910},
    {E_FAULTBOX_TIME_OUT, 6711},
    {E_FAULTBOX_ACTIVATE_FAILURE_PATTERN, 6725},
    {E_FAULTBOX_DEACTIVATE_FAILURE_PATTERN, 6726},
    {E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED, 8912},
    {E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED, 6767},
};

bool HasTextOfItsOwn(HRESULT code) {
  if (code == E_FAULTBOX) return false;
  for (const CodeText& entry : kCodeTexts)
    if (entry.code == code) return true;
  return false;
}

std::string ReasonsOf(const std::vector<ErrorRecord>& records) {
  for (const auto& wanted : {+[](const ErrorRecord& r) { return r.errorClass == 3; },
                             +[](const ErrorRecord& r) { return r.errorClass == 2; },
                             +[](const ErrorRecord& r) { return r.errorClass < 2; }}) {
    std::vector<std::string> texts;
    for (const ErrorRecord& record : records) {
      if (!wanted(record)) continue;
      std::string text = record.Text();
      if (std::find(texts.begin(), texts.end(), text) == texts.end()) texts.push_back(std::move(text));
    }
    if (texts.empty()) continue;
    std::string out;
    for (const std::string& text : texts) out += (out.empty() ? "" : " ") + text;
    return out;
  }
  return {};
}

}  // namespace

QFCAutomationCall::QFCAutomationCall() {
  t_errorInfo.reset();
  ++g_callsInProgress;
}

QFCAutomationCall::~QFCAutomationCall() {
  --g_callsInProgress;
}

bool QFCAutomationCall::InProgress() {
  return g_callsInProgress.load() > 0;
}

HRESULT QFCAutomationCall::Return(HRESULT code) {
  if (Succeeded(code)) {
    // A step that failed on the way does not make a successful member fail.
    t_errorInfo.reset();
    return code;
  }
  if (t_errorInfo && t_errorInfo->code == code) return code;
  t_errorInfo.reset();
  std::string description = ErrorDescriptionOfCode(code);
  // "An unspecified error occurred" tells a script nothing: the messages the
  // model reported on the way say what went wrong.
  if (!HasTextOfItsOwn(code)) {
    if (std::string reasons = ReasonsOf(reported_.Records()); !reasons.empty())
      description = std::move(reasons);
  }
  if (!description.empty()) t_errorInfo = QFTErrorInfo{code, std::move(description)};
  return code;
}

std::string ReasonsReportedInCall() {
  const ThreadReportCollector* collector = ThreadReportCollector::Innermost();
  return collector ? ReasonsOf(collector->Records()) : std::string();
}

HRESULT QFCAutomationCall::Detached(const std::string& keptText) {
  return RaiseError(E_FAULTBOX, keptText);
}

[[nodiscard]] HRESULT RaiseError(HRESULT code, std::string description) {
  t_errorInfo = QFTErrorInfo{code, std::move(description)};
  return code;
}

bool GetErrorInfo(QFTErrorInfo& info) {
  if (!t_errorInfo) return false;
  info = *t_errorInfo;
  return true;
}

std::string ErrorDescriptionOfCode(HRESULT code) {
  for (const CodeText& entry : kCodeTexts)
    // The file name is not known here; the member that knows it names it.
    if (entry.code == code) return ResourceText(entry.resource, {""});
  return {};
}

}  // namespace faultbox
