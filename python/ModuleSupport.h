// What every binding of the Python module shares: the one lock that keeps
// script threads out of each other's calls, the conversion of a failure code
// and the messages reported with it into faultbox.FaultboxError, and of
// Python values into automation variants.
#pragma once

#include <pybind11/pybind11.h>

#include <exception>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "automation/AutomationTypes.h"
#include "automation/QFCAutomationCall.h"
#include "automation/QFCFaultInjectionImpl.h"
#include "platform/ErrorModule.h"
#include "platform/MessageTable.h"

namespace faultbox::python {

namespace py = pybind11;

// The model takes no locks of its own. Recursive, because a logging handler
// runs inside a call (a reported message) and may call the module again.
std::recursive_mutex& ModelMutex();

// A failed member on its way to Python; the translator raises it as
// faultbox.FaultboxError or the subclass of its family.
class FaultboxFailure : public std::exception {
 public:
  FaultboxFailure(HRESULT code, std::string description, std::vector<ErrorRecord> messages = {})
      : code_(code), description_(std::move(description)), messages_(std::move(messages)) {}
  const char* what() const noexcept override { return description_.c_str(); }
  HRESULT Code() const { return code_; }
  const std::string& Description() const { return description_; }
  const std::vector<ErrorRecord>& Messages() const { return messages_; }

 private:
  HRESULT code_;
  std::string description_;
  std::vector<ErrorRecord> messages_;
};

// Collects the messages reported while a call runs, so that its failure can
// carry them. Calls nest (a logging handler may call the module): the
// innermost one collects.
class MessageCapture {
 public:
  MessageCapture();
  ~MessageCapture();
  MessageCapture(const MessageCapture&) = delete;
  MessageCapture& operator=(const MessageCapture&) = delete;
  std::vector<ErrorRecord> Take();

 private:
  friend void NoteReportedMessage(const ErrorRecord& record);
  MessageCapture* outer_;
  std::vector<ErrorRecord> records_;
};

// Hands a reported message to the call in progress, if there is one.
void NoteReportedMessage(const ErrorRecord& record);

// The description a failure gets: the member's error information, else the
// help text of its code, else "".
std::string DescribeFailure(HRESULT code);

// Runs `body` (which answers a result code) with the GIL released and the
// model locked; a failure code is thrown as FaultboxFailure once the GIL is
// back. Answers the (successful) code.
template <class Body>
HRESULT Invoke(Body&& body) {
  HRESULT code = FAULTBOX_OK;
  std::string description;
  std::vector<ErrorRecord> messages;
  {
    py::gil_scoped_release release;
    std::lock_guard<std::recursive_mutex> lock(ModelMutex());
    MessageCapture capture;
    code = std::forward<Body>(body)();
    // The error information is the calling thread's; read it before another
    // call on this thread replaces it.
    if (Failed(code)) {
      description = DescribeFailure(code);
      messages = capture.Take();
    }
  }
  if (Failed(code)) throw FaultboxFailure(code, description, std::move(messages));
  return code;
}

// Texts of the model are bytes as the files hold them, mostly UTF-8. Bytes
// that are not come to Python as lone surrogates and go back unchanged, as
// file names do in Python on Linux.
py::str ToText(const std::string& text);
std::string FromText(py::handle text);
py::list ToTextList(const std::vector<std::string>& texts);
// A file name: a str or an os.PathLike (pathlib.Path); bytes paths keep their bytes.
std::string FromPath(py::handle path);

// The root object scripts hold; the module keeps the one there is. The
// model's root inside goes at the interpreter's exit, and the object answers
// every member as a detached wrapper does from then on.
struct ScriptRoot {
  std::shared_ptr<QFCFaultInjectionImpl> impl;

  // Invoke for a member of the model's root.
  template <class Body>
  HRESULT Run(Body&& body) {
    return Invoke([&] {
      QFCAutomationCall frame;
      if (!impl) {
        const char* kept = ResourceString(QFCFaultInjectionImpl::kKeptTextId);
        return frame.Detached(kept ? kept : "");
      }
      return frame.Return(body(*impl));
    });
  }
};

// A Python value as an automation argument: None is an omitted argument;
// bool, int, float and str keep their kind; a model object is an object; a
// list or tuple is an array of objects (an element that is no model object
// is kept as an empty object, which every member refuses). Anything else is
// an empty object, which converts to nothing.
Variant ToVariant(py::handle value);

// Registers the enumerations with their help texts and every constant on
// `module`, and the translation of a failure into the exception that
// `_set_failure_factory` names.
void AddErrorsAndConstants(py::module_& module);

}  // namespace faultbox::python
