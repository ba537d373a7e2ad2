#include "device/services/NotificationService.h"

#include <utility>

#include "platform/DeviceNames.h"

namespace device {

using platform::KBNotificationCallback;
using platform::KBNotificationSuspensionBehavior;

/// Callbacks are plain functions; the journal names the one that has a known name.
static InjectionPoint pointOfCallback(std::string_view name) {
  return name == platform::startupNotificationName
             ? InjectionPoint("AppsClient", "_handleTSDStartupCompletedNotification")
             : InjectionPoint("AppsClient", "KBNotificationCallback");
}

std::uint32_t NotificationService::notify_register_check(std::string_view name, int& token) {
  return _boundary.call(
      {{"NotificationCenter", "notify_register_check"}}, nullptr, {{"name", name}},
      [&]() -> std::uint32_t {
        if (name.empty()) return invalidName;
        platform::Mutex::Lock lock(_mutex);
        _tokens.emplace_back(name);
        token = static_cast<int>(_tokens.size());
        return 0;
      },
      injectedFailure);
}

std::uint32_t NotificationService::notify_set_state(int token, std::uint64_t state) {
  return _boundary.call(
      {{"NotificationCenter", "notify_set_state"}}, nullptr, {{"token", token}, {"state", state}},
      [&]() -> std::uint32_t {
        platform::Mutex::Lock change(_changeMutex);
        std::string name;
        {
          platform::Mutex::Lock lock(_mutex);
          if (token < 1 || static_cast<std::size_t>(token) > _tokens.size()) return invalidToken;
          name = _tokens[static_cast<std::size_t>(token) - 1];
          _states[name] = state;
        }
        if (_stateChanged) _stateChanged(name, state);
        return 0;
      },
      injectedFailure);
}

std::uint32_t NotificationService::notify_post(std::string_view name) {
  return _boundary.call(
      {{"NotificationCenter", "notify_post"}}, nullptr, {{"name", name}},
      [&]() -> std::uint32_t {
        if (name.empty()) return invalidName;
        post(name);
        return 0;
      },
      injectedFailure);
}

void NotificationService::post(std::string_view name) {
  _events.post(Lane::notification, [this, name = std::string(name)] { deliver(name); });
}

void NotificationService::deliver(const std::string& name) {
  _observers.deliverIf([&](const Registration& registration) { return registration.name == name; },
                       [&](void* observer, const Registration& registration) {
                         _boundary.enter({pointOfCallback(name)}, {{"name", name}},
                                         [&] { registration.callback(*this, observer, name, nullptr, {}); });
                       });
}

void NotificationService::KBNotificationCenterAddObserver(std::weak_ptr<void> observer, KBNotificationCallback callback,
                                                          std::string_view name, const void*,
                                                          KBNotificationSuspensionBehavior suspension) {
  _boundary.call({{"NotificationCenter", "KBNotificationCenterAddObserver"}}, nullptr,
                 {CallArgument::object("observer", "observer", observer.lock().get()),
                  {"name", name},
                  {"suspension", static_cast<int>(suspension)}},
                 [&] {
                   _observers.add(observer, {std::string(name), callback});
                 });
}

void NotificationService::KBNotificationCenterRemoveObserver(const void* observer, std::string_view name) {
  _boundary.call({{"NotificationCenter", "KBNotificationCenterRemoveObserver"}}, nullptr,
                 {CallArgument::object("observer", "observer", observer), {"name", name}},
                 [&] { _observers.removeIf(observer, [&](const Registration& known) { return known.name == name; }); });
  _boundary.forgetObject(observer);
}

std::uint64_t NotificationService::state(std::string_view name) {
  platform::Mutex::Lock lock(_mutex);
  auto found = _states.find(name);
  return found == _states.end() ? 0 : found->second;
}

void NotificationService::restoreState(const std::string& name, std::uint64_t state) {
  platform::Mutex::Lock lock(_mutex);
  _states[name] = state;
}

}  // namespace device
