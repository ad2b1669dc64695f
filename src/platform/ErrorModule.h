// The error module: a stack of reported message records that front ends
// display through their sinks (terminal, output window, Python logging).
#pragma once

#include <cstdint>
#include <deque>
#include <mutex>
#include <string>
#include <vector>

#include "platform/ResultCodes.h"

namespace faultbox {

struct ErrorRecord {
  int handle = 0;
  int errorClass = 0;  // 3 error, 2 warning, 1 information, 0 internal fault or plain information
  int dialogKind = 0;  // 1 asks the front end to show the message at once
  int number = 0;
  std::string first;
  std::string second;
  // The message's text with both inserted texts put in.
  std::string Text() const;
};

// A front end's way of showing messages. `show` asks for the message to be
// brought to the user's attention at once (a message box in a GUI).
class MessageSink {
 public:
  virtual ~MessageSink() = default;
  virtual void Display(const ErrorRecord& record, bool show) = 0;
};

class ErrorModule {
 public:
  // Records kept at most; a run that reports more drops the oldest undisplayed ones.
  static constexpr std::size_t kMaxRecords = 10000;

  bool Create(int mainModule, int first, int second, void* hostDispatch, const std::string& componentName);
  void Destroy();

  // Pushes a record and returns its handle (never 0).
  int SetError(int errorClass, int dialogKind, int number, const std::string& first, const std::string& second);

  // Hand records to the sinks and take them off the stack: the oldest, the
  // newest, or all in the order reported. With the display mode off they stay
  // on the stack for the caller to collect. The handle names the report that
  // asks; records are displayed whatever their handle.
  HRESULT DisplayFirstError(int handle, bool show);
  HRESULT DisplayLastError(int handle, bool show);
  HRESULT DisplayAllErrors(int handle, bool show);

  // The newest record; false when the stack is empty.
  bool GetLastError(ErrorRecord* out) const;
  HRESULT ClearLastError();
  HRESULT ClearAllErrors();
  int GetStackSize(int handle) const;
  bool IsErrorOnStack(int handle) const;
  void SetMode(bool display);
  bool Mode() const;

  void AddSink(MessageSink* sink);
  void RemoveSink(MessageSink* sink);

 private:
  HRESULT Display(std::vector<ErrorRecord> records, bool show);

  mutable std::mutex mutex_;
  std::deque<ErrorRecord> stack_;
  std::vector<MessageSink*> sinks_;
  int mainModule_ = 0;
  std::string componentName_;
  int nextHandle_ = 1;
  bool display_ = true;
};

}  // namespace faultbox
