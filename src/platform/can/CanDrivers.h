// The drivers the CAN access layer always has, and the small helpers they
// share. Operating system headers stay in each driver's own source.
#pragma once

#include <cerrno>
#include <cstdint>
#include <cstring>
#include <memory>
#include <string>
#include <thread>
#include <utility>

#include "platform/CanAccess.h"

namespace faultbox {

// Linux kernel CAN ("can0", "vcan0").
std::shared_ptr<CanDriver> MakeSocketCanDriver();
// An in-process bus per name ("bench1").
std::shared_ptr<CanDriver> MakeVirtualBusDriver();
// A bus shared through a hub over TCP ("127.0.0.1:29536/bench1").
std::shared_ptr<CanDriver> MakeTcpBusDriver();

// The port the hub listens on unless told otherwise.
constexpr std::uint16_t kCanHubDefaultPort = 29536;

// Microseconds since the epoch, the time stamps of frame records.
std::uint64_t CanTimeStampNow();

// "call: what errno says", for the error texts of the drivers.
inline std::string CanSystemError(const char* call) {
  return std::string(call) + ": " + std::strerror(errno);
}

// The reader of a driver channel whose bus is a file descriptor: a thread
// that waits for the descriptor to become readable, and an eventfd that
// stops it. A channel stops it before its other members go: the thread
// hands frames to them.
class CanReaderThread {
 public:
  enum class Wake { kReadable, kStopped, kFailed };

  // Owns both descriptors from here on.
  CanReaderThread(int fd, int stopFd) : fd_(fd), stopFd_(stopFd) {}
  ~CanReaderThread() { Stop(); }
  CanReaderThread(const CanReaderThread&) = delete;
  CanReaderThread& operator=(const CanReaderThread&) = delete;

  template <class Loop>
  void Start(Loop&& loop) {
    thread_ = std::thread(std::forward<Loop>(loop));
  }
  // Wakes the thread, waits for its end and closes both descriptors; only
  // the first call does anything.
  void Stop();
  // For the thread: blocks until the bus descriptor has something to read
  // (or an error to tell), Stop() was called, or waiting failed.
  Wake WaitReadable() const;
  int Fd() const { return fd_; }

 private:
  int fd_;
  int stopFd_;
  std::thread thread_;
  bool stopped_ = false;
};

}  // namespace faultbox
