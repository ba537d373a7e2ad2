#pragma once

#include <chrono>
#include <functional>

#include "platform/Condition.h"
#include "platform/Mutex.h"

namespace platform {

/// The monotonic clock, and the only place where anybody waits.
///
/// A virtual clock lets the rest of the device run while a caller waits and jumps to the deadline when nothing
/// is left to run, so that a wait of minutes is exact and takes no time. Callable from any thread.
class Clock {
 public:
  using Duration = std::chrono::nanoseconds;
  /// Since an arbitrary origin; never goes back.
  using Instant = std::chrono::time_point<std::chrono::steady_clock, Duration>;

  /// Waits for another thread that is at work, for as long as that takes: no time passes for it.
  static constexpr Instant noDeadline = Instant::max();

  virtual ~Clock() = default;

  virtual Instant now() = 0;

  /// Waits until `satisfied` answers true or the deadline has passed; answers what `satisfied` last said.
  /// `mutex` is held on entry and on return and whenever `satisfied` runs, and is released in between; whoever
  /// makes the condition true notifies `changed`. No other guard may be held by the caller.
  virtual bool waitUntil(Mutex& mutex, Condition& changed, Instant deadline, const std::function<bool()>& satisfied)
      APPSYNC_REQUIRES(mutex) = 0;
};

}  // namespace platform
