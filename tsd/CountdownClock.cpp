#include "tsd/CountdownClock.h"

#include <algorithm>

namespace tsd {

bool CountdownClock::waitUntil(std::unique_lock<std::mutex>& lock, std::condition_variable& changed, Instant deadline,
                               const std::function<bool()>& satisfied) {
  while (true) {
    if (satisfied()) return true;
    auto left = deadline - _clock.now();
    if (left <= Duration::zero()) return false;
    auto seconds = std::chrono::ceil<std::chrono::seconds>(left);
    _tick(seconds.count());
    // To the next whole second before the deadline.
    auto next = deadline - (seconds - std::chrono::seconds(1));
    if (_clock.waitUntil(lock, changed, std::min(deadline, next), satisfied)) return true;
  }
}

}  // namespace tsd
