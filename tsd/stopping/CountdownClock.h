#pragma once

#include <atomic>
#include <functional>

#include "platform/Clock.h"
#include "platform/ThreadSafety.h"
#include "tsd/stopping/StopSignal.h"

namespace tsd {

/// The device's clock for the plug-in's waits: it tells how long a wait can still take, and when a stop is requested it
/// jumps to the deadline, so that the waiter goes on as after a time-out.
class CountdownClock : public platform::Clock {
 public:
  /// Told on the waiting thread, once a second while somebody waits, with the whole seconds that are left. May be null.
  using Tick = std::function<void(long long secondsLeft)>;

  /// The clock and the signal outlive it.
  CountdownClock(platform::Clock& clock, const StopSignal& stop, Tick tick)
      : _clock(clock), _stop(stop), _tick(std::move(tick)) {}

  Instant now() override;
  bool waitUntil(platform::Mutex& mutex, platform::Condition& changed, Instant deadline,
                 const std::function<bool()>& satisfied) override REQUIRES(mutex);

 private:
  void runAheadTo(Instant instant);

  platform::Clock& _clock;
  const StopSignal& _stop;
  const Tick _tick;
  std::atomic<Instant> _reached{Instant::min()};  // the clock never shows an earlier time
};

}  // namespace tsd
