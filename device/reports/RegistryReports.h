#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "device/DeviceStatus.h"
#include "device/boundary/Boundary.h"
#include "device/events/EventQueue.h"
#include "device/events/ObserverList.h"
#include "device/records/AppRecords.h"
#include "platform/OBApplicationWorkspace.h"

namespace device {

/// What the registry tells its observers, and the device its owner, on the registry lane. Callable from any thread,
/// also under the records' guard: the operations only post.
class RegistryReports {
 public:
  using Observer = platform::OBApplicationWorkspaceObserverProtocol;
  using Changed = std::function<void(const AppStatus&)>;

  RegistryReports(AppRecords& records, Boundary& boundary, EventQueue& events, Changed changed)
      : _records(records), _boundary(boundary), _events(events), _changed(std::move(changed)) {}

  void addObserver(const std::weak_ptr<Observer>& observer);
  void removeObserver(const Observer* observer) { _observers.remove(observer); }

  /// An install began, ended, was paused or entered another phase: observers get what runs and what is paused at the
  /// moment they are told. A report that is still pending includes later changes.
  void installsChanged();
  void installCancelled(platform::OBApplicationProxyRef app);
  /// Whether the owner wants to hear of apps.
  bool tellsOwner() const { return static_cast<bool>(_changed); }
  void appChanged(AppStatus status);

 private:
  using Proxies = std::vector<platform::OBApplicationProxyRef>;

  void report(Observer& observer);
  void bringUpToDate();

  AppRecords& _records;
  Boundary& _boundary;
  EventQueue& _events;
  const Changed _changed;
  ObserverList<Observer> _observers;
  std::atomic<bool> _reportPosted{false};
  // What runs and what is paused, in order of identifier: kept from report to report, as each install makes several of
  // them and there may be many installs. Only the registry lane touches them.
  Proxies _prioritized, _paused;
};

}  // namespace device
