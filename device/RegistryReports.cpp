#include "device/RegistryReports.h"

namespace device {

namespace {

using Proxies = std::vector<platform::OBApplicationProxyRef>;

std::vector<std::string> identifiers(const Proxies& proxies) {
  std::vector<std::string> result;
  for (const auto& proxy : proxies) result.push_back(proxy->applicationIdentifier.value_or(""));
  return result;
}

}  // namespace

void RegistryReports::addObserver(const std::weak_ptr<Observer>& observer) {
  auto alive = observer.lock();
  if (!alive) return;
  _observers.add(observer);
  _events.post(Lane::registry, [this, address = alive.get()] {
    _observers.deliverTo(address, [this](Observer& each, const auto&) { report(each); });
  });
}

void RegistryReports::report(Observer& observer) {
  Proxies prioritized, paused;
  {
    platform::Mutex::Lock lock(_records.mutex);
    for (const auto& [id, app] : _records.state().apps) {
      if (app.progress) (app.progress->paused ? paused : prioritized).push_back(app.proxy);
    }
  }
  _boundary.enter({"AppsClient", "applicationInstallsArePrioritized"},
                  {{"prioritized", identifiers(prioritized)}, {"paused", identifiers(paused)}},
                  [&] { observer.applicationInstallsArePrioritized(prioritized, paused); });
}

void RegistryReports::installsChanged() {
  if (_reportPosted.exchange(true)) return;
  _events.post(Lane::registry, [this] {
    _reportPosted = false;
    _observers.deliver([this](Observer& each, const auto&) { report(each); });
  });
}

void RegistryReports::installCancelled(platform::OBApplicationProxyRef app) {
  _events.post(Lane::registry, [this, app = std::move(app)] {
    Proxies cancelled{app};
    _observers.deliver([&](Observer& each, const auto&) {
      _boundary.enter({"AppsClient", "applicationInstallsDidCancel", app->applicationIdentifier.value_or("")},
                      {{"applications", identifiers(cancelled)}},
                      [&] { each.applicationInstallsDidCancel(cancelled); });
    });
  });
}

void RegistryReports::appChanged(AppStatus status) {
  // The owner is no caller that has to get ready first, and is told in the order of the changes, whoever made them.
  EventQueue::OutsideCall outside;
  _events.post(Lane::registry, [this, status = std::move(status)] { _changed(status); });
}

}  // namespace device
