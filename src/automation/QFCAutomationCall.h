// The frame every automation member runs in: the process-wide mark that a
// script's call is in progress, and the error information of the calling
// thread that tells a script why a member failed.
#pragma once

#include <string>

#include "platform/ResultCodes.h"
#include "platform/ThreadReportCollector.h"

namespace faultbox {

// What a failed member leaves for its caller.
struct QFTErrorInfo {
  HRESULT code = FAULTBOX_OK;
  std::string description;
};

class QFCAutomationCall {
 public:
  // Clears the thread's error information and marks the call.
  QFCAutomationCall();
  ~QFCAutomationCall();
  QFCAutomationCall(const QFCAutomationCall&) = delete;
  QFCAutomationCall& operator=(const QFCAutomationCall&) = delete;

  // True while any member runs. The document reads it to leave out the
  // questions it would ask a user in front of a screen.
  static bool InProgress();

  // The member's result: a failure without error information of its own gets
  // the description of its code, or, when the code says no more than that
  // the member failed, the texts of the errors (else warnings) reported
  // during the call; codes without either get none.
  [[nodiscard]] HRESULT Return(HRESULT code);
  // The wrapper's model object is gone: E_FAULTBOX with the kept text.
  [[nodiscard]] HRESULT Detached(const std::string& keptText);

 private:
  ThreadReportCollector reported_;
};

// The texts of the errors reported so far during the member that runs on this
// thread (else its warnings, else its internal faults), each once, joined by
// blanks; "" when nothing was reported.
std::string ReasonsReportedInCall();

// Sets the thread's error information and answers `code`, for a member that
// knows more than its code says.
[[nodiscard]] HRESULT RaiseError(HRESULT code, std::string description);
// The error information of the last member called on this thread that failed
// with one; false when there is none.
bool GetErrorInfo(QFTErrorInfo& info);
// The description a failure code gets when the member gives none: "" for
// codes without one.
std::string ErrorDescriptionOfCode(HRESULT code);

}  // namespace faultbox
