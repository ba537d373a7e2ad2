#pragma once

#include <functional>
#include <string>

#include "device/DeviceStatus.h"
#include "device/boundary/Boundary.h"
#include "platform/Mutex.h"
#include "platform/SystemLog.h"

namespace device {

/// The system log: every message goes to the device's owner, and to the call journal as the service "log". Handles
/// must not outlive it.
class SystemLogService final : public platform::SystemLog {
 public:
  using Listener = std::function<void(const LogRecord&)>;

  /// A null listener: messages go to the journal only, if there is one.
  SystemLogService(Boundary& boundary, Listener listener) : _boundary(boundary), _listener(std::move(listener)) {}

  std::shared_ptr<platform::LogHandle> createHandle(std::string_view subsystem, std::string_view category) override;
  /// A handle for the device's own use, made without crossing the boundary.
  std::shared_ptr<platform::LogHandle> makeHandle(std::string category);

  /// "default" or "error".
  static const char* nameOfLevel(platform::LogLevel level);

 private:
  class Handle;

  bool hasListener() const { return _listener || _boundary.hasJournal(); }
  void write(platform::LogLevel level, const std::string& category, std::string_view message);

  Boundary& _boundary;
  const Listener _listener;
  platform::Mutex _mutex;  // one message at a time
};

}  // namespace device
