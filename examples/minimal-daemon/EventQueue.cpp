#include "EventQueue.h"

#include <algorithm>

namespace tiny {

void EventQueue::post(std::function<void()> event) {
  platform::Mutex::Lock lock(_mutex);
  _events.push_back(std::move(event));
}

bool EventQueue::deliverNext() {
  NoneRuns one(*this);
  std::function<void()> event;
  {
    platform::Mutex::Lock lock(_mutex);
    if (_events.empty()) return false;
    event = std::move(_events.front());
    _events.pop_front();
  }
  auto outer = _deliverer.exchange(std::this_thread::get_id());
  event();
  _deliverer = outer;
  return true;
}

void EventQueue::deliver() {
  while (deliverNext()) {
  }
}

bool EventQueue::waitUntil(platform::Mutex& mutex, platform::Condition& changed, Instant deadline,
                           const std::function<bool()>& satisfied) {
  // Another thread may post while this one sleeps, so it never sleeps for long.
  constexpr std::chrono::milliseconds nap(5);
  while (!satisfied() && now() < deadline) {
    mutex.unlock();
    bool delivered = deliverNext();
    mutex.lock();
    if (!delivered) changed.waitUntil(mutex, std::min<Instant>(deadline, now() + nap), satisfied);
  }
  return satisfied();
}

}  // namespace tiny
