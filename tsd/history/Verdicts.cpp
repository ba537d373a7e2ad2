#include "tsd/history/Verdicts.h"

namespace tsd {

using Kind = AppEvent::Kind;
using Lock = platform::Mutex::Lock;

std::optional<Outcome> outcomeOf(Kind kind) {
  switch (kind) {
    case Kind::removed:
      return Outcome::removed;
    case Kind::refused:
      return Outcome::refused;
    case Kind::skipped:
      return Outcome::skipped;
    case Kind::notAllowed:
    case Kind::removalsRestricted:
      return Outcome::notAllowed;
    case Kind::removalFailed:
    case Kind::preparationFailed:
    case Kind::restoreFailed:
      return Outcome::failed;
    default:
      return std::nullopt;
  }
}

Verdicts::Verdicts() : _story([this](const AppEvent& event) { _heard.push_back(event); }) {}

void Verdicts::hear(const device::CallRecord& record) {
  ++_count;
  _story.hear(record);
  bool declined = !record.app.empty() && device::Boundary::isDeclined(record.error);
  if (_heard.empty() && !declined) return;
  Lock lock(_mutex);
  if (declined) _declined.insert(record.app);
  for (const auto& event : _heard) take(event);
  _heard.clear();
}

void Verdicts::restart() {
  Lock lock(_mutex);
  _verdicts.clear();
  _removalsRestricted.clear();
  _restoreDeclined.reset();
  _endings.clear();
  _declined.clear();
}

Verdicts::Verdict Verdicts::of(const std::string& app) const {
  Lock lock(_mutex);
  auto found = _verdicts.find(app);
  return found == _verdicts.end() ? Verdict() : found->second;
}

std::string Verdicts::removalsRestricted() const {
  Lock lock(_mutex);
  return _removalsRestricted;
}

std::optional<AppEvent> Verdicts::restoreDeclined() const {
  Lock lock(_mutex);
  return _restoreDeclined;
}

std::vector<Verdicts::Ending> Verdicts::takeEndings() {
  Lock lock(_mutex);
  return std::exchange(_endings, {});
}

// NOLINTNEXTLINE(readability-function-size): one case for each kind
void Verdicts::take(const AppEvent& event) {
  switch (event.kind) {
    case Kind::removalsRestricted:
      _removalsRestricted = event.text;
      break;
    case Kind::chosen:
      _verdicts[event.app].exception = std::make_shared<const AppEvent>(event);
      break;
    case Kind::updates:
      _verdicts[event.app].updates = true;
      break;
    case Kind::pathRefused:
      _verdicts[event.app].pathRefused = std::make_shared<const AppEvent>(event);
      break;
    case Kind::markFailed:
      _verdicts[event.app].markFailed = std::make_shared<const AppEvent>(event);
      break;
    case Kind::restoreDeclined:
      _restoreDeclined = event;
      break;
    case Kind::awaited:
    case Kind::awaitEnded:
      _verdicts[event.app].isAwaited = event.kind == Kind::awaited;
      break;
    case Kind::prepared:
    case Kind::restored:
      _verdicts[event.app].last = std::make_shared<const AppEvent>(event);
      break;
    case Kind::transferFailed:
      _endings.push_back({event.app, Outcome::failed, event.fact.empty() ? event.text : event.fact});
      break;
    case Kind::cancelled:
      _endings.push_back({event.app, Outcome::cancelled, event.line()});
      break;
    case Kind::removed:
    case Kind::removalFailed:
      if (!_declined.count(event.app)) _verdicts[event.app].removal = std::make_shared<const AppEvent>(event);
      break;
    default:
      // The plug-in takes it for a failure there, but its turn never came.
      if (_declined.count(event.app)) break;
      if (outcomeOf(event.kind)) _verdicts[event.app].last = std::make_shared<const AppEvent>(event);
  }
}

}  // namespace tsd
