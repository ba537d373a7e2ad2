#include "Registry.h"

#include <algorithm>

namespace tiny {

using platform::OBApplicationProxy;
using platform::OBApplicationProxyRef;

OBApplicationProxyRef Registry::find(std::string_view app) {
  platform::Mutex::Lock lock(_mutex);
  auto found = _apps.find(app);
  return found == _apps.end() ? nullptr : found->second;
}

void Registry::put(OBApplicationProxy app) {
  app.appState = {app.isInstalled, app.isPlaceholder};
  platform::Mutex::Lock lock(_mutex);
  _apps.insert_or_assign(*app.applicationIdentifier, std::make_shared<const OBApplicationProxy>(app));
}

void Registry::remove(std::string_view app) {
  platform::Mutex::Lock lock(_mutex);
  auto found = _apps.find(app);
  if (found != _apps.end()) _apps.erase(found);
}

/// Calls whoever is registered under the address by then. Runs as an event: whoever takes the queue's lock after taking
/// the registration away knows that no report runs any more.
void Registry::tell(const Observer* address, const Report& report) {
  std::shared_ptr<Observer> observer;
  {
    platform::Mutex::Lock lock(_mutex);
    for (const auto& each : _observers) {
      if (each.address == address) observer = each.observer.lock();
    }
  }
  if (observer) report(*observer);
}

Registry::Report Registry::installsNow() {
  std::vector<OBApplicationProxyRef> running;
  platform::Mutex::Lock lock(_mutex);
  for (const auto& [id, app] : _apps) {
    if (app->installProgressSync) running.push_back(app);
  }
  return [running](Observer& observer) { observer.applicationInstallsArePrioritized(running, {}); };
}

void Registry::reportInstalls() {
  Report report = installsNow();
  platform::Mutex::Lock lock(_mutex);
  for (const auto& each : _observers) _queue.post([this, address = each.address, report] { tell(address, report); });
}

void Registry::reportCancelled(const OBApplicationProxyRef& app) {
  Report report = [app](Observer& observer) { observer.applicationInstallsDidCancel({app}); };
  platform::Mutex::Lock lock(_mutex);
  for (const auto& each : _observers) _queue.post([this, address = each.address, report] { tell(address, report); });
}

void Registry::addObserver(std::weak_ptr<Observer> observer) {
  const Observer* address = observer.lock().get();
  {
    platform::Mutex::Lock lock(_mutex);
    _observers.push_back({address, std::move(observer)});
  }
  _queue.post([this, address] { tell(address, installsNow()); });
}

void Registry::removeObserver(const Observer* observer) {
  {
    platform::Mutex::Lock lock(_mutex);
    _observers.erase(std::remove_if(_observers.begin(), _observers.end(),
                                    [observer](const auto& each) { return each.address == observer; }),
                     _observers.end());
  }
  EventQueue::NoneRuns noneRuns(_queue);
}

bool Registry::applicationIsInstalled(std::string_view bundleIdentifier) {
  auto app = find(bundleIdentifier);
  return app && app->isInstalled;
}

void Registry::enumerateBundlesOfType(
    std::uint64_t type, const std::function<void(const platform::OBBundleProxyRef& bundle, bool& stop)>& block) {
  if (type > 1) return;  // there are no system bundles here
  auto apps = [&] {
    platform::Mutex::Lock lock(_mutex);
    return _apps;
  }();
  bool stop = false;
  for (const auto& [id, app] : apps) {
    block(app, stop);
    if (stop) return;
  }
}

OBApplicationProxyRef Registry::applicationProxyForIdentifier(std::string_view bundleIdentifier, bool placeholder) {
  auto app = find(bundleIdentifier);
  return app && app->isPlaceholder == placeholder ? app : nullptr;
}

}  // namespace tiny
