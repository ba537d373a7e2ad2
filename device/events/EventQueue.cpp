#include "device/events/EventQueue.h"

#include <pthread.h>

#include <new>
#include <utility>

#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

namespace {
constinit thread_local const char* threadName = "daemon";
}

const char* nameOfLane(Lane lane) {
  switch (lane) {
    case Lane::coordination:
      return "coordination";
    case Lane::registry:
      return "registry";
    case Lane::notification:
      return "notification";
  }
  return "";
}

const char* currentThreadName() { return threadName; }

ThreadName::ThreadName(const std::string& name) : _name(name), _previous(threadName) { threadName = _name.c_str(); }
ThreadName::~ThreadName() { threadName = _previous; }

/// A thread that releases held events may know nothing of the queue's life.
struct EventQueue::Door {
  explicit Door(EventQueue* queue) : queue(queue) {}

  platform::Mutex mutex;
  EventQueue* queue GUARDED_BY(mutex);  // null once the queue is closed

  void pass(Lane lane, Event& event) {
    platform::Mutex::Lock lock(mutex);
    if (queue) queue->enqueue(lane, event);
  }
};

/// What one thread holds back, in the order in which it was posted. The end of the thread releases it.
struct EventQueue::HeldEvents {
  struct Held {
    std::shared_ptr<Door> door;
    Lane lane;
    Event event;
  };
  std::vector<Held> events;

  ~HeldEvents() { letGo(); }

  void letGo() {
    auto released = std::exchange(events, {});
    for (auto& held : released) held.door->pass(held.lane, held.event);
  }
};

EventQueue::HeldEvents& EventQueue::heldEvents() {
  // Not an object of the thread's, for which the C library ends a process that has no memory left.
  static const pthread_key_t key = [] {
    pthread_key_t made{};
    if (pthread_key_create(&made, [](void* held) { delete static_cast<HeldEvents*>(held); }) != 0)
      throw std::bad_alloc();
    return made;
  }();
  if (auto* held = static_cast<HeldEvents*>(pthread_getspecific(key))) return *held;
  auto made = std::make_unique<HeldEvents>();
  if (pthread_setspecific(key, made.get()) != 0) throw std::bad_alloc();
  return *made.release();
}

EventQueue::EventQueue() : _door(std::make_shared<Door>(this)) {}
EventQueue::~EventQueue() = default;

void EventQueue::close() {
  platform::Mutex::Lock lock(_door->mutex);
  _door->queue = nullptr;
}

void EventQueue::post(Lane lane, Event event) {
  if (_thread.callDepth == 0) {
    enqueue(lane, event);
    return;
  }
  heldEvents().events.push_back({_door, lane, std::move(event)});
  _thread.holds = true;
}

void EventQueue::releaseHeld() {
  _thread.holds = false;
  heldEvents().letGo();
}

}  // namespace device
