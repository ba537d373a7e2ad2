#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>

#include "device/LocalDevice.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace tsd {

class Progress;

/// What the device reports of its apps while something runs. Made before the device, which reports to it.
/// From any thread.
class AppWatch {
 public:
  explicit AppWatch(Progress& progress) : _progress(progress) {}

  /// What the device calls on each change.
  std::function<void(const device::AppStatus&)> listener();
  /// Forgets which placeholders were seen, for the next run.
  void restart();

  /// When the app's placeholder was first seen since `restart`; nothing if it was not.
  std::optional<std::chrono::steady_clock::time_point> placeholderSeen(const std::string& id) const;
  /// When the last placeholder was seen.
  std::optional<std::chrono::steady_clock::time_point> lastPlaceholderSeen() const;
  /// A count of the changes so far.
  std::uint64_t changes() const;

 private:
  void changed(const device::AppStatus& status);

  Progress& _progress;
  mutable platform::Mutex _mutex;
  std::map<std::string, std::chrono::steady_clock::time_point, std::less<>> _placeholders GUARDED_BY(_mutex);
  std::optional<std::chrono::steady_clock::time_point> _lastPlaceholder GUARDED_BY(_mutex);
  std::uint64_t _changes GUARDED_BY(_mutex) = 0;
};

}  // namespace tsd
