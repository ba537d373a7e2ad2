#include "device/reports/RegistryReports.h"

#include <algorithm>

#include "device/boundary/JournalValue.h"

namespace device {

namespace {

using Proxies = std::vector<platform::OBApplicationProxyRef>;

/// Puts the app's proxy at its place by identifier, or removes the one that is there when the app has none.
void place(Proxies& proxies, const std::string& id, const platform::OBApplicationProxyRef& proxy) {
  auto at = std::lower_bound(proxies.begin(), proxies.end(), id, [](const auto& each, const std::string& identifier) {
    return *each->applicationIdentifier < identifier;
  });
  bool isThere = at != proxies.end() && *(*at)->applicationIdentifier == id;
  if (isThere && proxy)
    *at = proxy;
  else if (isThere)
    proxies.erase(at);
  else if (proxy)
    proxies.insert(at, proxy);
}

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

void RegistryReports::bringUpToDate() {
  AppRecords::Lock lock(_records);
  for (const auto& id : _records.takeChangedApps()) {
    const auto* app = _records.state().app(id);
    const auto* progress = app && app->progress ? &*app->progress : nullptr;
    place(_prioritized, id, progress && !progress->paused ? app->proxy : nullptr);
    place(_paused, id, progress && progress->paused ? app->proxy : nullptr);
  }
}

void RegistryReports::report(Observer& observer) {
  bringUpToDate();
  auto shown = [&](const Proxies& proxies) {
    if (!_boundary.hasJournal()) return platform::Value();
    // Of many apps only their number is shown, which is no reason to list them.
    const bool isListed = !_boundary.showsWhole() && proxies.size() <= longestShownList;
    return isListed ? journalValue(_boundary, identifiers(proxies)) : journalValue(_boundary, proxies);
  };
  _boundary.enter({{"AppsClient", "applicationInstallsArePrioritized"}},
                  {{"prioritized", shown(_prioritized)},
                   {"paused", shown(_paused)},
                   CallArgument::object("observer", "observer", wholeObject(&observer))},
                  [&] { observer.applicationInstallsArePrioritized(_prioritized, _paused); });
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
      _boundary.enter({{"AppsClient", "applicationInstallsDidCancel"}, app->applicationIdentifier.value_or("")},
                      {{"applications", identifiers(cancelled)}},
                      [&] { each.applicationInstallsDidCancel(cancelled); });
    });
  });
}

void RegistryReports::appChanged(AppStatus status) {
  // The owner, unlike a caller, need not get ready first; it is told in the order of the changes, whoever made them.
  EventQueue::OutsideCall outside;
  _events.post(Lane::registry, [this, status = std::move(status)] { _changed(status); });
}

}  // namespace device
