#include "device/services/SystemLogService.h"

#include <utility>

namespace device {

using platform::LogHandle;
using platform::LogLevel;

namespace {

constexpr std::size_t longestMessage = std::size_t{64} << 10;

/// The front, of whole characters, and how long it was.
std::string shortened(std::string_view message) {
  std::size_t end = longestMessage;
  while (end > 0 && (static_cast<unsigned char>(message[end]) & 0xc0) == 0x80) --end;
  return std::string(message.substr(0, end)) + "… (cut, of " + std::to_string(message.size()) + " bytes)";
}

}  // namespace

class SystemLogService::Handle final : public LogHandle {
 public:
  Handle(SystemLogService& log, std::string category) : _log(log), _category(std::move(category)) {}

  bool isEnabled(LogLevel) const override { return _log.hasListener(); }
  void write(LogLevel level, std::string_view message) override { _log.write(level, _category, message); }

 private:
  SystemLogService& _log;
  const std::string _category;
};

static InjectionPoint pointOfLevel(LogLevel level) {
  return level == LogLevel::error ? InjectionPoint("log", "error") : InjectionPoint("log", "default");
}

const char* SystemLogService::nameOfLevel(LogLevel level) { return pointOfLevel(level).operation(); }

std::shared_ptr<LogHandle> SystemLogService::createHandle(std::string_view subsystem, std::string_view category) {
  return _boundary.call(
      {{"SystemLog", "createHandle"}}, nullptr, {{"subsystem", subsystem}, {"category", category}},
      [&] { return makeHandle(std::string(category)); }, [&] { return makeHandle(std::string()); });
}

std::shared_ptr<LogHandle> SystemLogService::makeHandle(std::string category) {
  return std::make_shared<Handle>(*this, std::move(category));
}

void SystemLogService::write(LogLevel level, const std::string& category, std::string_view message) {
  std::string cut;
  if (message.size() > longestMessage) message = cut = shortened(message);
  Crossing crossing{pointOfLevel(level)};
  crossing.isMessage = true;
  _boundary.call(crossing, nullptr, {{"category", category}, {"text", message}}, [&] {
    if (!_listener) return;
    LogRecord record{level, category, std::string(message)};
    platform::Mutex::Lock lock(_mutex);
    _listener(record);
  });
}

}  // namespace device
