#pragma once

#include <atomic>
#include <functional>
#include <list>
#include <mutex>
#include <thread>

namespace tsd {

/// SIGINT and SIGTERM as a wish to stop. The first is remembered and told to whoever waits; a second ends the process
/// at once, with the exit code for a cancelled command.
///
/// Made before any other thread: the threads that follow inherit that they do not take these signals themselves.
class StopSignal {
 public:
  StopSignal();
  ~StopSignal();
  StopSignal(const StopSignal&) = delete;
  StopSignal& operator=(const StopSignal&) = delete;

  bool requested() const { return _requested; }
  /// From now on a second signal does not end the process any more: what is left is to write the result, and half a
  /// document would be worse than none.
  void letFinish();

  /// Calls `told` on the signals' thread when a stop is requested. Once the subscription is gone it is not called.
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

  std::atomic<bool> _requested{false};
  std::mutex _mutex;
  bool _finishes = false;                         // guarded by _mutex
  std::list<std::function<void()>> _subscribers;  // guarded by _mutex
  int _signals = -1;                              // descriptor that reads the signals
  int _end = -1;                                  // descriptor that ends the watching thread
  std::thread _watcher;
};

}  // namespace tsd
