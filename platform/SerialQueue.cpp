#include "platform/SerialQueue.h"

#include <cstdio>
#include <cstdlib>

namespace platform {

void SerialQueue::enter(Clock& clock) NO_THREAD_SAFETY_ANALYSIS {
  if (_running.load(std::memory_order_relaxed) == std::this_thread::get_id()) {
    std::fprintf(stderr, "serial queue \"%s\" was entered from a block that runs on it\n", _label.c_str());
    std::abort();
  }
  Mutex::Lock lock(_mutex);
  while (_busy) clock.waitUntil(_mutex, _left, Clock::noDeadline, [this]() REQUIRES(_mutex) { return !_busy; });
  _busy = true;
  _running.store(std::this_thread::get_id(), std::memory_order_relaxed);
}

void SerialQueue::leave() NO_THREAD_SAFETY_ANALYSIS {
  Mutex::Lock lock(_mutex);
  _running.store(std::thread::id(), std::memory_order_relaxed);
  _busy = false;
  _left.notifyOne();
}

}  // namespace platform
