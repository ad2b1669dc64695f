// The records a thread reports while a collector lives on it, for the
// automation call frame that turns them into the reason a member failed.
#pragma once

#include <cstddef>
#include <vector>

#include "platform/ErrorModule.h"

namespace faultbox {

// The records the calling thread reports while one lives, whatever the
// display mode and the sinks: errors, warnings and internal faults, the first
// kKept of them. Collectors nest, and each sees what was reported during its
// own life. The automation call frame turns them into the reason a member
// failed.
class ThreadReportCollector {
 public:
  static constexpr std::size_t kKept = 16;
  ThreadReportCollector();
  ~ThreadReportCollector();
  ThreadReportCollector(const ThreadReportCollector&) = delete;
  ThreadReportCollector& operator=(const ThreadReportCollector&) = delete;

  const std::vector<ErrorRecord>& Records() const { return records_; }
  // The calling thread's innermost collector; nullptr when none lives.
  static const ThreadReportCollector* Innermost();
  // Hands a record just reported to the calling thread's collectors.
  static void Note(const ErrorRecord& record);

 private:
  ThreadReportCollector* outer_;
  std::vector<ErrorRecord> records_;
};

}  // namespace faultbox
