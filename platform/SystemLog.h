#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

namespace platform {

enum class LogLevel : std::uint8_t { standard, error };

/// The writing end of one log category. Callable from any thread; never calls back.
class LogHandle {
 public:
  virtual ~LogHandle() = default;
  /// Whether anybody listens; a caller need not format what nobody reads.
  virtual bool isEnabled(LogLevel level) const = 0;
  /// One message, whole, without a line end.
  virtual void write(LogLevel level, std::string_view message) = 0;
};

/// The system log.
class SystemLog {
 public:
  virtual ~SystemLog() = default;
  /// A handle for the subsystem and category. Never null.
  virtual std::shared_ptr<LogHandle> createHandle(std::string_view subsystem, std::string_view category) = 0;
};

}  // namespace platform
