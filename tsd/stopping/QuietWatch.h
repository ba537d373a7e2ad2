#pragma once

#include <thread>

#include "device/events/EventQueue.h"
#include "platform/Clock.h"
#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"
#include "tsd/stopping/StopSignal.h"

namespace tsd {

/// Finds out when a device has gone quiet: every event that was posted, and whatever those posted, has run. What has
/// not been reported by then never will be.
class QuietWatch {
 public:
  /// Throws a `CommandError` when the system has no thread left.
  QuietWatch(device::EventQueue& events, StopSignal& stop);
  /// Waits until the events have ended.
  ~QuietWatch();
  QuietWatch(const QuietWatch&) = delete;
  QuietWatch& operator=(const QuietWatch&) = delete;

  /// True when the device is quiet, false when the deadline or a stop request came first.
  bool waitUntil(platform::Clock::Instant deadline);

 private:
  device::EventQueue& _events;
  StopSignal& _stop;
  platform::Mutex _mutex;
  platform::Condition _changed;
  bool _quiet GUARDED_BY(_mutex) = false;
  StopSignal::Subscription _stopped;
  std::thread _drain;
};

}  // namespace tsd
