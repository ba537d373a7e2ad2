#include "Notifications.h"

#include <algorithm>

namespace tiny {

constexpr std::uint32_t unknownToken = 1;

std::uint32_t Notifications::notify_register_check(std::string_view name, int& token) {
  platform::Mutex::Lock lock(_mutex);
  auto known = std::find(_names.begin(), _names.end(), name);
  token = static_cast<int>(known - _names.begin());
  if (known == _names.end()) _names.emplace_back(name);
  return 0;
}

std::uint32_t Notifications::notify_set_state(int token, std::uint64_t state) {
  platform::Mutex::Lock lock(_mutex);
  if (token < 0 || static_cast<std::size_t>(token) >= _names.size()) return unknownToken;
  _states[token] = state;
  return 0;
}

std::uint32_t Notifications::notify_post(std::string_view name) {
  platform::Mutex::Lock lock(_mutex);
  for (const auto& each : _observers) {
    if (each->name != name) continue;
    _queue.post([this, each] {
      auto observer = each->observer.lock();
      {
        platform::Mutex::Lock inside(_mutex);
        if (std::find(_observers.begin(), _observers.end(), each) == _observers.end()) return;
      }
      if (observer) each->callback(*this, observer.get(), each->name, nullptr, {});
    });
  }
  return 0;
}

void Notifications::KBNotificationCenterAddObserver(std::weak_ptr<void> observer,
                                                    platform::KBNotificationCallback callback, std::string_view name,
                                                    const void*, platform::KBNotificationSuspensionBehavior) {
  const void* address = observer.lock().get();
  platform::Mutex::Lock lock(_mutex);
  _observers.push_back(
      std::make_shared<const Registration>(Registration{address, std::string(name), std::move(observer), callback}));
}

void Notifications::KBNotificationCenterRemoveObserver(const void* observer, std::string_view name) {
  {
    platform::Mutex::Lock lock(_mutex);
    _observers.erase(std::remove_if(_observers.begin(), _observers.end(),
                                    [&](const auto& each) { return each->address == observer && each->name == name; }),
                     _observers.end());
  }
  EventQueue::NoneRuns noneRuns(_queue);
}

}  // namespace tiny
