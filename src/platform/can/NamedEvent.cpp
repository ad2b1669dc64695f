// The process-wide registry of named events and the events themselves.
#include "platform/can/NamedEvent.h"

#include <cstdint>
#include <map>

namespace faultbox {
namespace {

struct EventRegistry {
  std::mutex mutex;
  std::map<std::string, std::weak_ptr<NamedEvent>> events;
};

// Never destroyed: events may outlive every other static object.
EventRegistry& Events() {
  static EventRegistry* registry = new EventRegistry;
  return *registry;
}

}  // namespace

std::shared_ptr<NamedEvent> NamedEvent::Create(const std::string& name) {
  EventRegistry& registry = Events();
  std::lock_guard lock(registry.mutex);
  auto it = registry.events.find(name);
  if (it != registry.events.end() && !it->second.expired()) return nullptr;
  std::shared_ptr<NamedEvent> event(new NamedEvent(name));
  registry.events[name] = event;
  return event;
}

std::shared_ptr<NamedEvent> NamedEvent::CreateFirstFree(std::string_view format) {
  const std::size_t mark = format.find("%i");
  if (mark == std::string_view::npos) return nullptr;
  const std::string head(format.substr(0, mark));
  const std::string tail(format.substr(mark + 2));
  EventRegistry& registry = Events();
  std::lock_guard lock(registry.mutex);
  for (std::int64_t i = 0; i <= INT32_MAX; ++i) {
    const std::string name = head + std::to_string(i) + tail;
    auto it = registry.events.find(name);
    if (it != registry.events.end() && !it->second.expired()) continue;
    std::shared_ptr<NamedEvent> event(new NamedEvent(name));
    registry.events[name] = event;
    return event;
  }
  return nullptr;
}

std::shared_ptr<NamedEvent> NamedEvent::Open(const std::string& name) {
  EventRegistry& registry = Events();
  std::lock_guard lock(registry.mutex);
  auto it = registry.events.find(name);
  return it == registry.events.end() ? nullptr : it->second.lock();
}

NamedEvent::~NamedEvent() {
  EventRegistry& registry = Events();
  std::lock_guard lock(registry.mutex);
  // The name may already belong to a newer event created after this one expired.
  auto it = registry.events.find(name_);
  if (it != registry.events.end() && it->second.expired()) registry.events.erase(it);
}

void NamedEvent::Set() {
  {
    std::lock_guard lock(mutex_);
    signalled_ = true;
  }
  cv_.notify_one();
}

void NamedEvent::Reset() {
  std::lock_guard lock(mutex_);
  signalled_ = false;
}

NamedEvent::WaitResult NamedEvent::Wait(std::chrono::milliseconds timeout) {
  std::unique_lock lock(mutex_);
  if (!cv_.wait_for(lock, timeout, [this] { return signalled_; })) return WaitResult::kTimedOut;
  signalled_ = false;
  return WaitResult::kSignalled;
}

}  // namespace faultbox
