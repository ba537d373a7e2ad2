#include "platform/SerialQueue.h"

#include <cstdio>
#include <cstdlib>

namespace platform {

/// A caller's place in the line for a scope, also when the clock throws.
class SerialQueue::Waiting {
 public:
  explicit Waiting(SerialQueue& queue) NO_THREAD_SAFETY_ANALYSIS : _queue(queue) {
    _place.thread = std::this_thread::get_id();
    Place** at = &_queue._first;
    while (*at && (*at)->thread != _place.thread) at = &(*at)->next;
    _place.next = *at;
    *at = &_place;
  }
  ~Waiting() NO_THREAD_SAFETY_ANALYSIS {
    Place** at = &_queue._first;
    while (*at != &_place) at = &(*at)->next;
    *at = _place.next;
    _queue.callNext();
  }
  Waiting(const Waiting&) = delete;
  Waiting& operator=(const Waiting&) = delete;

  void wait(Clock& clock) NO_THREAD_SAFETY_ANALYSIS {
    auto isNext = [this]() NO_THREAD_SAFETY_ANALYSIS { return !_queue._busy && _queue._first == &_place; };
    while (!isNext()) clock.waitUntil(_queue._mutex, _place.turn, Clock::noDeadline, isNext);
    _queue._busy = true;
  }

 private:
  SerialQueue& _queue;
  Place _place;
};

void SerialQueue::callNext() {
  if (!_busy && _first) _first->turn.notifyOne();
}

void SerialQueue::enter(Clock& clock) NO_THREAD_SAFETY_ANALYSIS {
  if (_running.load(std::memory_order_relaxed) == std::this_thread::get_id()) {
    std::fprintf(stderr, "serial queue \"%s\" was entered from a block that runs on it\n", _label.c_str());
    std::abort();
  }
  Mutex::Lock lock(_mutex);
  if (_busy || _first) Waiting(*this).wait(clock);
  _busy = true;
  _running.store(std::this_thread::get_id(), std::memory_order_relaxed);
}

void SerialQueue::leave() NO_THREAD_SAFETY_ANALYSIS {
  Mutex::Lock lock(_mutex);
  _running.store(std::thread::id(), std::memory_order_relaxed);
  _busy = false;
  callNext();
}

}  // namespace platform
