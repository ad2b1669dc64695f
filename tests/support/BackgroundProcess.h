// A program running beside the test (a hub, a simulated bench), read line by
// line from its standard output and stopped by a signal.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <string>
#include <vector>

namespace faultbox::test {

class BackgroundProcess {
 public:
  // argv[0] is the program's path. Standard error stays the test's.
  explicit BackgroundProcess(const std::vector<std::string>& argv);
  // Kills the program if it still runs.
  ~BackgroundProcess();
  BackgroundProcess(const BackgroundProcess&) = delete;
  BackgroundProcess& operator=(const BackgroundProcess&) = delete;

  bool Started() const { return pid_ > 0; }
  // The next line of its standard output without the line end; "" at the
  // end of the output or when `limit` passed.
  std::string ReadLine(std::chrono::milliseconds limit = std::chrono::seconds(20));
  // Sends `signal`, waits for the end and returns the exit status; -1 when
  // it did not exit normally.
  int Stop(int signal);

 private:
  pid_t pid_ = -1;
  int out_ = -1;
  std::string buffer_;
};

}  // namespace faultbox::test
