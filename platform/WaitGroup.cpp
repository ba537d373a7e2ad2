#include "platform/WaitGroup.h"

#include <cstdio>
#include <cstdlib>

namespace platform {

void WaitGroup::enter() {
  Mutex::Lock lock(_mutex);
  ++_entered;
}

void WaitGroup::leave() {
  Mutex::Lock lock(_mutex);
  if (_entered == 0) {
    std::fputs("a wait group was left more often than entered\n", stderr);
    std::abort();
  }
  if (--_entered == 0) _changed.notifyAll();
}

bool WaitGroup::wait(Clock& clock, Clock::Instant deadline) {
  Mutex::Lock lock(_mutex);
  return clock.waitUntil(_mutex, _changed, deadline, [this]() REQUIRES(_mutex) { return _entered == 0; });
}

void Semaphore::signal() {
  Mutex::Lock lock(_mutex);
  ++_count;
  _changed.notifyOne();
}

bool Semaphore::wait(Clock& clock, Clock::Instant deadline) {
  Mutex::Lock lock(_mutex);
  if (!clock.waitUntil(_mutex, _changed, deadline, [this]() REQUIRES(_mutex) { return _count > 0; })) return false;
  --_count;
  return true;
}

}  // namespace platform
