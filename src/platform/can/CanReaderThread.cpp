// The reader thread the descriptor-based CAN drivers share.
#include <poll.h>
#include <unistd.h>

#include "platform/can/CanDrivers.h"

namespace faultbox {

void CanReaderThread::Stop() {
  if (stopped_) return;
  stopped_ = true;
  const std::uint64_t one = 1;
  [[maybe_unused]] ssize_t n = ::write(stopFd_, &one, sizeof one);
  if (thread_.joinable()) thread_.join();
  ::close(fd_);
  ::close(stopFd_);
}

CanReaderThread::Wake CanReaderThread::WaitReadable() const {
  for (;;) {
    pollfd p[2] = {{fd_, POLLIN, 0}, {stopFd_, POLLIN, 0}};
    if (::poll(p, 2, -1) < 0) {
      if (errno == EINTR) continue;
      return Wake::kFailed;
    }
    if (p[1].revents != 0) return Wake::kStopped;
    return Wake::kReadable;
  }
}

}  // namespace faultbox
