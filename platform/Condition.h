#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>

#include "platform/Mutex.h"

namespace platform {

/// What threads that hold a `Mutex` wait for. A waiter releases the mutex meanwhile and holds it again whenever
/// `satisfied` runs and on return. `satisfied` touches what the mutex guards, so it says that it needs it:
///
///     _changed.wait(_mutex, [this]() REQUIRES(_mutex) { return _done; });
///
/// Notifying needs no mutex; every waiter of one condition uses the same one.
class Condition {
 public:
  void notifyOne() { _changed.notify_one(); }
  void notifyAll() { _changed.notify_all(); }

  template <class Satisfied>
  void wait(Mutex& mutex, Satisfied&& satisfied) APPSYNC_REQUIRES(mutex) {
    Waiting waiting(mutex);
    _changed.wait(waiting.lock, satisfied);
  }

  /// On the machine's own clock, whose time is real; whoever waits for a device waits on its `Clock`. Answers what
  /// `satisfied` last said.
  template <class Satisfied>
  bool waitUntil(Mutex& mutex, std::chrono::time_point<std::chrono::steady_clock, std::chrono::nanoseconds> deadline,
                 Satisfied&& satisfied) APPSYNC_REQUIRES(mutex) {
    Waiting waiting(mutex);
    return _changed.wait_until(waiting.lock, deadline, satisfied);
  }

  /// Until somebody notifies or the time is over on the machine's own clock; it may also end for no reason at all.
  void waitFor(Mutex& mutex, std::chrono::nanoseconds time) APPSYNC_REQUIRES(mutex) {
    Waiting waiting(mutex);
    _changed.wait_for(waiting.lock, time);
  }

 private:
  /// The mutex in the shape in which the library waits with it; whoever held it holds it afterwards too.
  struct Waiting {
    explicit Waiting(Mutex& mutex) : lock(mutex._mutex, std::adopt_lock) {}
    ~Waiting() { lock.release(); }
    Waiting(const Waiting&) = delete;
    Waiting& operator=(const Waiting&) = delete;

    std::unique_lock<std::mutex> lock;
  };

  std::condition_variable _changed;
};

}  // namespace platform
