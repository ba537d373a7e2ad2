#pragma once

#include <functional>

#include "platform/Clock.h"

namespace tsd {

/// The device's clock, and a voice that tells how long a wait can still take.
class CountdownClock : public platform::Clock {
 public:
  /// Told on the waiting thread, once a second while somebody waits, with the whole seconds that are left.
  using Tick = std::function<void(long long secondsLeft)>;

  CountdownClock(platform::Clock& clock, Tick tick) : _clock(clock), _tick(std::move(tick)) {}

  Instant now() override { return _clock.now(); }
  bool waitUntil(std::unique_lock<std::mutex>& lock, std::condition_variable& changed, Instant deadline,
                 const std::function<bool()>& satisfied) override;

 private:
  platform::Clock& _clock;
  Tick _tick;
};

}  // namespace tsd
