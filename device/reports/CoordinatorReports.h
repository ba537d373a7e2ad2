#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "device/boundary/Boundary.h"
#include "device/events/EventQueue.h"
#include "device/events/ObserverList.h"
#include "device/records/AppRecords.h"
#include "device/reports/Coordinator.h"
#include "platform/RVAppInstallCoordinator.h"
#include "platform/ThreadSafety.h"

namespace device {

/// What the install-coordination service tells about coordinators, on the coordination lane: to the coordinator's
/// observer while that is alive, otherwise to the install observers of its creator's client. Callable from any
/// thread, also under the records' guard: the operations only post.
class CoordinatorReports {
 public:
  using Delegate = platform::RVAppInstallObserverDelegate;

  CoordinatorReports(AppRecords& records, Boundary& boundary, EventQueue& events)
      : _records(records), _boundary(boundary), _events(events) {}

  std::unique_ptr<platform::RVAppInstallObserver> makeObserver(const std::vector<platform::RVClientIdentifier>& clients,
                                                               const std::weak_ptr<Delegate>& delegate);

  void promiseDidBeginFulfillment(const CoordinatorRef& coordinator, std::uint64_t promise);
  void didInstallPlaceholder(const CoordinatorRef& coordinator);
  void didComplete(const CoordinatorRef& coordinator);
  void shouldPrioritize(const CoordinatorRef& coordinator);
  void cancelled(const CoordinatorRef& coordinator, const platform::ErrorRef& reason,
                 platform::RVClientIdentifier client);

 private:
  struct Registration {
    std::uint64_t number;
    std::vector<platform::RVClientIdentifier> clients;
  };
  using Observers = ObserverList<Delegate, Registration>;
  class InstallObserver;

  void post(const CoordinatorRef& coordinator, std::function<void(Delegate&)> callback);
  /// The coordinator's own observer, if one was set and is alive.
  std::shared_ptr<Delegate> observerOf(const Coordinator& coordinator) EXCLUDES(recordsGuard);

  AppRecords& _records;
  Boundary& _boundary;
  EventQueue& _events;
  Observers _observers;
  std::atomic<std::uint64_t> _lastNumber{0};
};

}  // namespace device
