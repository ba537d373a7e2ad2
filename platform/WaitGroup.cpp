#include "platform/WaitGroup.h"

#include <cstdio>
#include <cstdlib>

namespace platform {

void WaitGroup::enter() {
  std::lock_guard lock(_mutex);
  ++_entered;
}

void WaitGroup::leave() {
  std::lock_guard lock(_mutex);
  if (_entered == 0) {
    std::fputs("a wait group was left more often than entered\n", stderr);
    std::abort();
  }
  if (--_entered == 0) _changed.notify_all();
}

bool WaitGroup::wait(Clock& clock, Clock::Instant deadline) {
  std::unique_lock lock(_mutex);
  return clock.waitUntil(lock, _changed, deadline, [this] { return _entered == 0; });
}

void Semaphore::signal() {
  std::lock_guard lock(_mutex);
  ++_count;
  _changed.notify_one();
}

bool Semaphore::wait(Clock& clock, Clock::Instant deadline) {
  std::unique_lock lock(_mutex);
  if (!clock.waitUntil(lock, _changed, deadline, [this] { return _count > 0; })) return false;
  --_count;
  return true;
}

}  // namespace platform
