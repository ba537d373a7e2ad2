#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "EventQueue.h"
#include "platform/Mutex.h"
#include "platform/NotificationCenter.h"

namespace tiny {

class Notifications final : public platform::NotificationCenter {
 public:
  explicit Notifications(EventQueue& queue) : _queue(queue) {}

  std::uint32_t notify_register_check(std::string_view name, int& token) override;
  std::uint32_t notify_set_state(int token, std::uint64_t state) override;
  std::uint32_t notify_post(std::string_view name) override;
  void KBNotificationCenterAddObserver(std::weak_ptr<void> observer, platform::KBNotificationCallback callback,
                                       std::string_view name, const void* object,
                                       platform::KBNotificationSuspensionBehavior suspension) override;
  void KBNotificationCenterRemoveObserver(const void* observer, std::string_view name) override;

 private:
  struct Registration {
    const void* address;
    std::string name;
    std::weak_ptr<void> observer;
    platform::KBNotificationCallback callback;
  };

  EventQueue& _queue;
  platform::Mutex _mutex;
  // Guarded by _mutex.
  std::vector<std::shared_ptr<const Registration>> _observers;
  std::vector<std::string> _names;  // a token is a place here
  std::map<int, std::uint64_t> _states;
};

}  // namespace tiny
