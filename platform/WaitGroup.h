#pragma once

#include <cstdint>

#include "platform/Clock.h"
#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace platform {

/// Counts entries and leaves; a waiter is released when they balance. Callable from any thread.
class WaitGroup {
 public:
  void enter();
  /// Leaving more often than entering ends the process with a message.
  void leave();
  /// True when the group balanced, false when the deadline passed first.
  bool wait(Clock& clock, Clock::Instant deadline);

 private:
  Mutex _mutex;
  Condition _changed;
  std::int64_t _entered GUARDED_BY(_mutex) = 0;
};

/// A counting semaphore that starts at 0. Callable from any thread.
class Semaphore {
 public:
  void signal();
  /// Takes one count. True when there was one before the deadline.
  bool wait(Clock& clock, Clock::Instant deadline);

 private:
  Mutex _mutex;
  Condition _changed;
  std::int64_t _count GUARDED_BY(_mutex) = 0;
};

}  // namespace platform
