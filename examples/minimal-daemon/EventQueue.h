#pragma once

#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>

#include "platform/Clock.h"

namespace tiny {

/// Everything that happens later on this device, in the order in which it was caused. It happens on the thread that
/// delivers, which is the daemon's own: between two calls, or while the plug-in waits.
class EventQueue final : public platform::Clock {
 public:
  void post(std::function<void()> event);
  /// Runs what was posted, and what that posts.
  void deliver();

  /// Held while an event runs. Whoever takes it knows that no callback runs; an event may take it again.
  std::recursive_mutex& delivering() { return _delivering; }

  Instant now() override { return std::chrono::steady_clock::now(); }
  bool waitUntil(std::unique_lock<std::mutex>& lock, std::condition_variable& changed, Instant deadline,
                 const std::function<bool()>& satisfied) override;

 private:
  bool deliverNext();

  std::recursive_mutex _delivering;
  std::mutex _mutex;
  std::deque<std::function<void()>> _events;  // guarded by _mutex
};

}  // namespace tiny
