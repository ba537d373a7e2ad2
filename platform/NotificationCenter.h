#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "platform/Value.h"

namespace platform {

class NotificationCenter;

/// What happens to notifications that arrive while an observer is suspended.
enum class KBNotificationSuspensionBehavior : std::uint8_t { drop, coalesce, hold, deliverImmediately };

using KBNotificationCallback = void (*)(NotificationCenter& center, void* observer, std::string_view name,
                                        const void* object, const Value& userInfo);

/// System-wide notifications: named, each with a 64-bit state. Callable from any thread.
class NotificationCenter {
 public:
  virtual ~NotificationCenter() = default;

  /// A token for the name; 0 on success.
  virtual std::uint32_t notify_register_check(std::string_view name, int& token) = 0;
  virtual std::uint32_t notify_set_state(int token, std::uint64_t state) = 0;
  virtual std::uint32_t notify_post(std::string_view name) = 0;

  /// Held weakly, known by its address; the callback gets that address and runs on the center's thread with the
  /// observer kept alive. A null object means: no filter.
  virtual void KBNotificationCenterAddObserver(std::weak_ptr<void> observer, KBNotificationCallback callback,
                                               std::string_view name, const void* object,
                                               KBNotificationSuspensionBehavior suspension) = 0;
  /// When this has returned, no callback to the observer for the name runs or starts; called from the thread
  /// that is delivering to it, it returns without waiting for itself.
  virtual void KBNotificationCenterRemoveObserver(const void* observer, std::string_view name) = 0;
};

}  // namespace platform
