#pragma once

#include <atomic>
#include <functional>
#include <list>
#include <thread>

#include "device/files/FileDescriptor.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace tsd {

/// SIGINT and SIGTERM as a request to stop. The first is remembered and told to whoever waits; a second ends the
/// process at once, with the exit code for a cancelled command, whatever any thread is doing.
///
/// One at a time, made before any other thread: later threads inherit the blocked signals.
class StopSignal {
 public:
  /// Throws a `CommandError` when the system has no thread or descriptor left.
  StopSignal();
  ~StopSignal();
  StopSignal(const StopSignal&) = delete;
  StopSignal& operator=(const StopSignal&) = delete;

  bool requested() const { return _requested; }
  /// From now on a second signal no longer ends the process: only the result is left to be written, and half a document
  /// would be worse than none.
  void letFinish();

  /// Calls `told` on the signals' thread when a stop is requested, or at once when it was. Once the subscription is
  /// destroyed it is not called.
  class Subscription {
   public:
    Subscription(StopSignal& signal, std::function<void()> told);
    ~Subscription();
    Subscription(const Subscription&) = delete;
    Subscription& operator=(const Subscription&) = delete;

   private:
    StopSignal& _signal;
    std::list<std::function<void()>>::iterator _place;
  };

 private:
  void watch();
  /// Whether a signal came. From now on the next one ends the process.
  bool takeRequest() EXCLUDES(_mutex);

  std::atomic<bool> _requested{false};
  platform::Mutex _mutex;
  bool _finishes GUARDED_BY(_mutex) = false;
  std::list<std::function<void()>> _subscribers GUARDED_BY(_mutex);
  device::FileDescriptor _signals;  // reads the signals
  device::FileDescriptor _end;      // ends the watching thread
  std::thread _watcher;
};

}  // namespace tsd
