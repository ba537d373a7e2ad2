#include "tsd/stopping/CountdownClock.h"

#include <algorithm>

namespace tsd {

platform::Clock::Instant CountdownClock::now() { return std::max(_clock.now(), _reached.load()); }

void CountdownClock::runAheadTo(Instant instant) {
  Instant reached = _reached;
  while (reached < instant && !_reached.compare_exchange_weak(reached, instant)) {
  }
}

bool CountdownClock::waitUntil(platform::Mutex& mutex, platform::Condition& changed, Instant deadline,
                               const std::function<bool()>& satisfied) {
  if (deadline == noDeadline) return _clock.waitUntil(mutex, changed, deadline, satisfied);
  // A stop request cannot wake a thread that waits for something else.
  constexpr auto lookInterval = std::chrono::milliseconds(100);
  long long told = 0;
  while (true) {
    if (satisfied()) return true;
    auto left = deadline - now();
    if (left <= Duration::zero()) return false;
    if (_stop.requested()) {
      runAheadTo(deadline);
      continue;
    }
    long long seconds = std::chrono::ceil<std::chrono::seconds>(left).count();
    if (_tick && seconds != told) _tick(seconds);
    told = seconds;
    auto nextSecond = deadline - std::chrono::seconds(seconds - 1);
    if (_clock.waitUntil(mutex, changed, std::min<Instant>(nextSecond, now() + lookInterval), satisfied)) return true;
  }
}

}  // namespace tsd
