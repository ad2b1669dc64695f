// Receive events known by name in the process, which a transfer interface
// waits on and a CAN channel sets when a frame arrives.
#pragma once

#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>

namespace faultbox {

// The name pattern of the receive events; %i is 0, 1, 2, ...
constexpr const char* kCanReceiveEventFormat = "FS_CAN_RECEIVE_EVENT_%i";

// An auto-reset event known by name in this process. The name is taken while
// any reference to the event lives and free again afterwards. Set() wakes one
// waiter at once, or the next one to wait if none is waiting.
class NamedEvent {
 public:
  enum class WaitResult { kSignalled, kTimedOut };

  // Creates an unsignalled event under the first name of `format` (which
  // holds "%i" once) for which no event exists: "..._0", then "..._1", ...
  static std::shared_ptr<NamedEvent> CreateFirstFree(std::string_view format = kCanReceiveEventFormat);
  // Creates an unsignalled event named `name`; nullptr when one of that name exists.
  static std::shared_ptr<NamedEvent> Create(const std::string& name);
  // The event of that name, or nullptr when none exists.
  static std::shared_ptr<NamedEvent> Open(const std::string& name);

  ~NamedEvent();
  NamedEvent(const NamedEvent&) = delete;
  NamedEvent& operator=(const NamedEvent&) = delete;

  const std::string& Name() const { return name_; }
  void Set();
  void Reset();
  // Returns at once when signalled (and takes the signal), else waits up to `timeout`.
  WaitResult Wait(std::chrono::milliseconds timeout);

 private:
  explicit NamedEvent(std::string name) : name_(std::move(name)) {}
  std::string name_;
  std::mutex mutex_;
  std::condition_variable cv_;
  bool signalled_ = false;
};

}  // namespace faultbox
