#pragma once

#include <condition_variable>
#include <mutex>
#include <thread>

#include "device/EventQueue.h"
#include "platform/Clock.h"
#include "tsd/StopSignal.h"

namespace tsd {

/// Finds out when a device has gone quiet: every event that was posted, and whatever those posted, has run. What has
/// not been reported by then never will be.
class QuietWatch {
 public:
  QuietWatch(device::EventQueue& events, StopSignal& stop);
  /// Waits for the events' end.
  ~QuietWatch();
  QuietWatch(const QuietWatch&) = delete;
  QuietWatch& operator=(const QuietWatch&) = delete;

  /// True when it is quiet, false when the deadline or a stop request came first.
  bool waitUntil(platform::Clock::Instant deadline);

 private:
  device::EventQueue& _events;
  StopSignal& _stop;
  std::mutex _mutex;
  std::condition_variable _changed;
  bool _quiet = false;  // guarded by _mutex
  std::thread _drain;
  StopSignal::Subscription _stopped;
};

}  // namespace tsd
