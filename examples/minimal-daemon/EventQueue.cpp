#include "EventQueue.h"

#include <algorithm>

namespace tiny {

void EventQueue::post(std::function<void()> event) {
  std::lock_guard lock(_mutex);
  _events.push_back(std::move(event));
}

bool EventQueue::deliverNext() {
  std::lock_guard one(_delivering);
  std::function<void()> event;
  {
    std::lock_guard lock(_mutex);
    if (_events.empty()) return false;
    event = std::move(_events.front());
    _events.pop_front();
  }
  event();
  return true;
}

void EventQueue::deliver() {
  while (deliverNext()) {
  }
}

bool EventQueue::waitUntil(std::unique_lock<std::mutex>& lock, std::condition_variable& changed, Instant deadline,
                           const std::function<bool()>& satisfied) {
  // Another thread may post while this one sleeps, so it never sleeps for long.
  constexpr std::chrono::milliseconds nap(5);
  while (!satisfied() && now() < deadline) {
    lock.unlock();
    bool delivered = deliverNext();
    lock.lock();
    if (!delivered && !satisfied()) changed.wait_until(lock, std::min(deadline, now() + nap));
  }
  return satisfied();
}

}  // namespace tiny
