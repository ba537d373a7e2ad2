#include "tsd/daemon/AppWatch.h"

#include "tsd/terminal/Progress.h"

namespace tsd {

std::function<void(const device::AppStatus&)> AppWatch::listener() {
  return [this](const device::AppStatus& status) { changed(status); };
}

void AppWatch::restart() {
  platform::Mutex::Lock lock(_mutex);
  _placeholders.clear();
  _lastPlaceholder.reset();
}

std::optional<std::chrono::steady_clock::time_point> AppWatch::placeholderSeen(const std::string& id) const {
  platform::Mutex::Lock lock(_mutex);
  auto place = _placeholders.find(id);
  if (place == _placeholders.end()) return std::nullopt;
  return place->second;
}

std::optional<std::chrono::steady_clock::time_point> AppWatch::lastPlaceholderSeen() const {
  platform::Mutex::Lock lock(_mutex);
  return _lastPlaceholder;
}

std::uint64_t AppWatch::changes() const {
  platform::Mutex::Lock lock(_mutex);
  return _changes;
}

void AppWatch::changed(const device::AppStatus& status) {
  bool shown = status.state == device::AppState::placeholder || status.state == device::AppState::updating;
  {
    platform::Mutex::Lock lock(_mutex);
    ++_changes;
    if (shown) {
      auto [place, added] = _placeholders.try_emplace(status.id, std::chrono::steady_clock::now());
      if (added) _lastPlaceholder = place->second;
    }
  }
  if (shown) _progress.placeholderShown(status.id);
}

}  // namespace tsd
