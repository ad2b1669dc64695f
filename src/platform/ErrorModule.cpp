// The error module's record stack and its hand-over to the sinks.
#include "platform/ErrorModule.h"

#include <algorithm>

#include "platform/MessageTable.h"
#include "platform/ThreadReportCollector.h"

namespace faultbox {

std::string ErrorRecord::Text() const { return FormatMessage(number, first, second); }

namespace {
thread_local ThreadReportCollector* t_innermost = nullptr;
constexpr int kInternalFault = 35;
}  // namespace

ThreadReportCollector::ThreadReportCollector() : outer_(t_innermost) {
  t_innermost = this;
}

ThreadReportCollector::~ThreadReportCollector() {
  t_innermost = outer_;
}

const ThreadReportCollector* ThreadReportCollector::Innermost() {
  return t_innermost;
}

void ThreadReportCollector::Note(const ErrorRecord& record) {
  // Progress and plain notes never explain a failure.
  if (record.errorClass < 2 && record.number != kInternalFault) return;
  for (ThreadReportCollector* c = t_innermost; c != nullptr; c = c->outer_)
    if (c->records_.size() < kKept) c->records_.push_back(record);
}

bool ErrorModule::Create(int mainModule, int, int, void*, const std::string& componentName) {
  std::lock_guard lock(mutex_);
  mainModule_ = mainModule;
  componentName_ = componentName;
  return true;
}

void ErrorModule::Destroy() {
  std::lock_guard lock(mutex_);
  stack_.clear();
  sinks_.clear();
}

int ErrorModule::SetError(int errorClass, int dialogKind, int number, const std::string& first,
                          const std::string& second) {
  std::lock_guard lock(mutex_);
  ErrorRecord record{nextHandle_, errorClass, dialogKind, number, first, second};
  // Handles travel as 16-bit values in places; keep them small and never 0.
  nextHandle_ = nextHandle_ >= 0x7FFF ? 1 : nextHandle_ + 1;
  ThreadReportCollector::Note(record);
  if (stack_.size() >= kMaxRecords) stack_.pop_front();
  stack_.push_back(std::move(record));
  return stack_.back().handle;
}

HRESULT ErrorModule::Display(std::vector<ErrorRecord> records, bool show) {
  std::vector<MessageSink*> sinks;
  {
    std::lock_guard lock(mutex_);
    sinks = sinks_;
  }
  // Sinks run outside the lock: a sink may report again (a GUI asking back).
  for (const ErrorRecord& record : records)
    for (MessageSink* sink : sinks) sink->Display(record, show || record.dialogKind == 1);
  return FAULTBOX_OK;
}

HRESULT ErrorModule::DisplayFirstError(int, bool show) {
  std::vector<ErrorRecord> records;
  {
    std::lock_guard lock(mutex_);
    if (!display_ || stack_.empty()) return FAULTBOX_OK;
    records.push_back(std::move(stack_.front()));
    stack_.pop_front();
  }
  return Display(std::move(records), show);
}

HRESULT ErrorModule::DisplayLastError(int, bool show) {
  std::vector<ErrorRecord> records;
  {
    std::lock_guard lock(mutex_);
    if (!display_ || stack_.empty()) return FAULTBOX_OK;
    records.push_back(std::move(stack_.back()));
    stack_.pop_back();
  }
  return Display(std::move(records), show);
}

HRESULT ErrorModule::DisplayAllErrors(int, bool show) {
  std::vector<ErrorRecord> records;
  {
    std::lock_guard lock(mutex_);
    if (!display_) return FAULTBOX_OK;
    records.assign(std::make_move_iterator(stack_.begin()), std::make_move_iterator(stack_.end()));
    stack_.clear();
  }
  return Display(std::move(records), show);
}

bool ErrorModule::GetLastError(ErrorRecord* out) const {
  std::lock_guard lock(mutex_);
  if (stack_.empty()) return false;
  if (out) *out = stack_.back();
  return true;
}

HRESULT ErrorModule::ClearLastError() {
  std::lock_guard lock(mutex_);
  if (stack_.empty()) return E_FAULTBOX;
  stack_.pop_back();
  return FAULTBOX_OK;
}

HRESULT ErrorModule::ClearAllErrors() {
  std::lock_guard lock(mutex_);
  stack_.clear();
  return FAULTBOX_OK;
}

int ErrorModule::GetStackSize(int) const {
  std::lock_guard lock(mutex_);
  return static_cast<int>(stack_.size());
}

bool ErrorModule::IsErrorOnStack(int handle) const {
  std::lock_guard lock(mutex_);
  return std::any_of(stack_.begin(), stack_.end(), [&](const ErrorRecord& r) { return r.handle == handle; });
}

void ErrorModule::SetMode(bool display) {
  std::lock_guard lock(mutex_);
  display_ = display;
}

bool ErrorModule::Mode() const {
  std::lock_guard lock(mutex_);
  return display_;
}

void ErrorModule::AddSink(MessageSink* sink) {
  std::lock_guard lock(mutex_);
  if (std::find(sinks_.begin(), sinks_.end(), sink) == sinks_.end()) sinks_.push_back(sink);
}

void ErrorModule::RemoveSink(MessageSink* sink) {
  std::lock_guard lock(mutex_);
  sinks_.erase(std::remove(sinks_.begin(), sinks_.end(), sink), sinks_.end());
}

}  // namespace faultbox
