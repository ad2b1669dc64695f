// What the simulated benches share: the thread that runs a bench, started
// and stopped once, and the counters that tests and tools wait on.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <system_error>
#include <thread>
#include <utility>

namespace faultbox::sim {

// `Counts` is the bench's counter record; it has at least `resets` and
// `answers`, counted since the start.
template <class Counts>
class SimulatorThread {
 public:
  SimulatorThread(const SimulatorThread&) = delete;
  SimulatorThread& operator=(const SimulatorThread&) = delete;

  Counts Counters() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return counters_;
  }
  // Wait until the counter reaches the given total; false when `limit` passed first.
  bool WaitForResets(std::uint64_t count, std::chrono::milliseconds limit) const {
    return WaitFor(&Counts::resets, count, limit);
  }
  bool WaitForAnswers(std::uint64_t count, std::chrono::milliseconds limit) const {
    return WaitFor(&Counts::answers, count, limit);
  }

 protected:
  SimulatorThread() = default;
  // The bench stops the thread in its own destructor: the thread uses its members.
  ~SimulatorThread() = default;

  // Runs `run` on the bench's thread; false with the reason in `error`.
  bool StartThread(std::function<void()> run, std::string* error) {
    try {
      thread_ = std::thread(std::move(run));
    } catch (const std::system_error& e) {
      if (error != nullptr) *error = std::string("thread: ") + e.what();
      return false;
    }
    running_ = true;
    return true;
  }
  // `wake` makes the thread's loop end; then waits for it. Nothing when the
  // thread does not run (any more).
  void StopThread(const std::function<void()>& wake) {
    if (!running_) return;
    wake();
    thread_.join();
    running_ = false;
  }

  bool WaitFor(std::uint64_t Counts::*counter, std::uint64_t count, std::chrono::milliseconds limit) const {
    std::unique_lock<std::mutex> lock(mutex_);
    return changed_.wait_for(lock, limit, [&] { return counters_.*counter >= count; });
  }
  // Wakes the waiters once the counters changed; called without mutex_ held.
  void NotifyCountersChanged() { changed_.notify_all(); }

  // Guards the counters and whatever else the bench keeps beside them.
  mutable std::mutex mutex_;
  Counts counters_;

 private:
  mutable std::condition_variable changed_;
  std::thread thread_;
  bool running_ = false;
};

// Starts a bench; when it does not start, `onFailure` gets the reason (a
// test records it as its failure).
template <class Simulator, class Options, class OnFailure>
std::unique_ptr<Simulator> StartBench(const Options& options, OnFailure&& onFailure) {
  std::string error;
  std::unique_ptr<Simulator> bench = Simulator::Start(options, &error);
  if (!bench) std::forward<OnFailure>(onFailure)(error);
  return bench;
}

}  // namespace faultbox::sim
