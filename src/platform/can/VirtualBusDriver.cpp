// The in-process bus: named buses on which every participant receives what
// every other one transmits, at once and in the transmitting thread.
#include <condition_variable>
#include <map>
#include <mutex>

#include "platform/can/CanDrivers.h"
#include "platform/can/SocketcandProtocol.h"

namespace faultbox {

namespace {

// One participant as the bus sees it. Deliveries in flight are counted so
// that closing waits for them: after the channel is gone nothing reaches its sink.
class Member {
 public:
  explicit Member(std::shared_ptr<CanFrameSink> sink) : sink_(std::move(sink)) {}

  void Deliver(const CanFrameRecord& frame) {
    {
      std::lock_guard lock(mutex_);
      if (closed_) return;
      ++inFlight_;
    }
    sink_->Deliver(frame);
    {
      std::lock_guard lock(mutex_);
      --inFlight_;
    }
    idle_.notify_all();
  }

  void Close() {
    std::unique_lock lock(mutex_);
    closed_ = true;
    idle_.wait(lock, [this] { return inFlight_ == 0; });
  }

 private:
  std::shared_ptr<CanFrameSink> sink_;
  std::mutex mutex_;
  std::condition_variable idle_;
  int inFlight_ = 0;
  bool closed_ = false;
};

struct Buses {
  std::mutex mutex;
  std::map<std::string, std::vector<std::shared_ptr<Member>>> members;
};

Buses& TheBuses() {
  static Buses* b = new Buses;
  return *b;
}

class VirtualChannel final : public CanDriverChannel {
 public:
  VirtualChannel(std::string bus, std::shared_ptr<CanFrameSink> sink)
      : bus_(std::move(bus)), self_(std::make_shared<Member>(std::move(sink))) {
    Buses& buses = TheBuses();
    std::lock_guard lock(buses.mutex);
    buses.members[bus_].push_back(self_);
  }

  ~VirtualChannel() override {
    {
      Buses& buses = TheBuses();
      std::lock_guard lock(buses.mutex);
      auto it = buses.members.find(bus_);
      if (it != buses.members.end()) {
        std::erase(it->second, self_);
        if (it->second.empty()) buses.members.erase(it);
      }
    }
    self_->Close();
  }

  CanResult Transmit(const CanFrameRecord& frame, std::string*) override {
    std::vector<std::shared_ptr<Member>> others;
    {
      Buses& buses = TheBuses();
      std::lock_guard lock(buses.mutex);
      for (const auto& m : buses.members[bus_])
        if (m != self_) others.push_back(m);
    }
    // Delivered outside the bus lock: a receiver may answer from its sink.
    for (const auto& m : others) m->Deliver(frame);
    return CanResult::kOk;
  }

  std::string TraceName() const override { return bus_; }

 private:
  std::string bus_;
  std::shared_ptr<Member> self_;
};

class VirtualBusDriver final : public CanDriver {
 public:
  bool IsAvailable(const std::string& interfaceName) override {
    return IsValidSocketcandBusName(interfaceName);
  }

  std::unique_ptr<CanDriverChannel> Open(const std::string& interfaceName, std::shared_ptr<CanFrameSink> sink,
                                         CanResult* result, std::string* error) override {
    if (!IsValidSocketcandBusName(interfaceName) || !sink) {
      *result = CanResult::kInvalidParameter;
      *error = "\"" + interfaceName + "\" is not a bus name (1 to 64 characters without blanks, '<' or '>')";
      return nullptr;
    }
    *result = CanResult::kOk;
    return std::make_unique<VirtualChannel>(interfaceName, std::move(sink));
  }
};

}  // namespace

std::shared_ptr<CanDriver> MakeVirtualBusDriver() {
  return std::make_shared<VirtualBusDriver>();
}

}  // namespace faultbox
