#pragma once

#include <atomic>
#include <deque>
#include <functional>
#include <memory>
#include <thread>

#include "platform/Clock.h"
#include "platform/Mutex.h"

namespace tiny {

/// Everything that happens later on this device, in the order in which it was caused. It happens on the thread that
/// delivers, which is the daemon's own: between two calls, or while the plug-in waits.
class EventQueue final : public platform::Clock {
 public:
  void post(std::function<void()> event);
  /// Runs what was posted, and what that posts.
  void deliver();

  /// While it lives no callback runs, but for the one that made it.
  class NoneRuns {
   public:
    explicit NoneRuns(EventQueue& queue) {
      if (queue._deliverer != std::this_thread::get_id())
        _lock = std::make_unique<platform::Mutex::Lock>(queue._delivering);
    }

   private:
    std::unique_ptr<platform::Mutex::Lock> _lock;
  };

  Instant now() override { return std::chrono::steady_clock::now(); }
  bool waitUntil(platform::Mutex& mutex, platform::Condition& changed, Instant deadline,
                 const std::function<bool()>& satisfied) override APPSYNC_REQUIRES(mutex);

 private:
  bool deliverNext();

  platform::Mutex _delivering;
  std::atomic<std::thread::id> _deliverer;  // the thread on which an event runs
  platform::Mutex _mutex;
  std::deque<std::function<void()>> _events;  // guarded by _mutex
};

}  // namespace tiny
