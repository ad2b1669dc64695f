// Collects every message the component reports while it lives, so that tests
// can assert numbers, classes and inserted texts.
#pragma once

#include <algorithm>
#include <string>
#include <vector>

#include "platform/QFCReporter.h"

namespace faultbox::test {

class MessageCapture : public MessageSink {
 public:
  MessageCapture() {
    TheReporter().StartReporting();
    TheReporter().Module()->ClearAllErrors();
    TheReporter().Module()->AddSink(this);
  }
  ~MessageCapture() override {
    if (TheReporter().Module()) TheReporter().Module()->RemoveSink(this);
  }
  void Display(const ErrorRecord& record, bool show) override {
    records.push_back(record);
    shown.push_back(show);
  }

  std::vector<int> Numbers() const {
    std::vector<int> out;
    for (const auto& r : records) out.push_back(r.number);
    return out;
  }
  int Count(int number) const {
    return static_cast<int>(std::count_if(records.begin(), records.end(), [&](const auto& r) { return r.number == number; }));
  }
  const ErrorRecord* Find(int number) const {
    for (const auto& r : records)
      if (r.number == number) return &r;
    return nullptr;
  }
  void Clear() {
    records.clear();
    shown.clear();
  }

  std::vector<ErrorRecord> records;
  std::vector<bool> shown;
};

}  // namespace faultbox::test
