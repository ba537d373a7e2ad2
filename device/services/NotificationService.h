#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "device/boundary/Boundary.h"
#include "device/events/EventQueue.h"
#include "device/events/ObserverList.h"
#include "platform/Mutex.h"
#include "platform/NotificationCenter.h"
#include "platform/ThreadSafety.h"

namespace device {

/// Named notifications with a 64-bit state each; observers are called on the notification lane. Outlives what it
/// posted: the event queue is stopped before it goes.
class NotificationService final : public platform::NotificationCenter {
 public:
  /// Statuses other than 0.
  static constexpr std::uint32_t invalidName = 1;
  static constexpr std::uint32_t invalidToken = 2;
  static constexpr std::uint32_t injectedFailure = 1000000;

  /// Told whenever a name's state was set, in the order of the changes, so that it can be kept. Must not set one
  /// itself. May be null.
  using StateChanged = std::function<void(const std::string& name, std::uint64_t state)>;

  NotificationService(Boundary& boundary, EventQueue& events, StateChanged stateChanged)
      : _boundary(boundary), _events(events), _stateChanged(std::move(stateChanged)) {}

  std::uint32_t notify_register_check(std::string_view name, int& token) override;
  std::uint32_t notify_set_state(int token, std::uint64_t state) override;
  std::uint32_t notify_post(std::string_view name) override;

  /// Notifications are delivered in the order in which they were posted; observers are never suspended here, and no
  /// notification is about an object.
  void KBNotificationCenterAddObserver(std::weak_ptr<void> observer, platform::KBNotificationCallback callback,
                                       std::string_view name, const void* object,
                                       platform::KBNotificationSuspensionBehavior suspension) override;
  void KBNotificationCenterRemoveObserver(const void* observer, std::string_view name) override;

  /// Below the boundary: what the device and its owner do themselves.
  void post(std::string_view name);
  /// 0 for a name that nobody has set.
  std::uint64_t state(std::string_view name);
  /// What was kept by an earlier process.
  void restoreState(const std::string& name, std::uint64_t state);

 private:
  struct Registration {
    std::string name;
    platform::KBNotificationCallback callback;
  };

  void deliver(const std::string& name);

  Boundary& _boundary;
  EventQueue& _events;
  const StateChanged _stateChanged;
  ObserverList<void, Registration> _observers;
  platform::Mutex _changeMutex;  // states change, and are told, one after another
  platform::Mutex _mutex;
  std::vector<std::string> _tokens GUARDED_BY(_mutex);  // the name of each, from token 1
  std::map<std::string, std::uint64_t, std::less<>> _states GUARDED_BY(_mutex);
};

}  // namespace device
