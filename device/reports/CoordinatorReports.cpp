#include "device/reports/CoordinatorReports.h"

#include <algorithm>

namespace device {

/// Ends the registration when it is destroyed.
class CoordinatorReports::InstallObserver final : public platform::RVAppInstallObserver {
 public:
  InstallObserver(Boundary& boundary, Observers& observers, const Delegate* delegate, std::uint64_t number)
      : _boundary(boundary), _observers(observers), _delegate(delegate), _number(number) {}
  ~InstallObserver() override {
    // A rule can keep the service from hearing of the release in time, but the delegate may be gone once this has
    // returned.
    auto release = [this] {
      _observers.removeIf(_delegate, [this](const Registration& each) { return each.number == _number; });
    };
    _boundary.call({{"InstallCoordination", "releaseAppInstallObserver"}}, nullptr, {}, release);
    release();
    _boundary.forgetObject(static_cast<platform::RVAppInstallObserver*>(this));
  }

 private:
  Boundary& _boundary;
  Observers& _observers;
  const Delegate* const _delegate;
  const std::uint64_t _number;
};

std::unique_ptr<platform::RVAppInstallObserver> CoordinatorReports::makeObserver(
    const std::vector<platform::RVClientIdentifier>& clients, const std::weak_ptr<Delegate>& delegate) {
  auto alive = delegate.lock();
  if (!alive) return nullptr;
  auto number = ++_lastNumber;
  _observers.add(delegate, {number, clients});
  return std::make_unique<InstallObserver>(_boundary, _observers, alive.get(), number);
}

std::shared_ptr<CoordinatorReports::Delegate> CoordinatorReports::observerOf(const Coordinator& coordinator) {
  AppRecords::Lock lock(_records);
  return coordinator.state.observer.lock();
}

void CoordinatorReports::post(const CoordinatorRef& coordinator, std::function<void(Delegate&)> callback) {
  _events.post(Lane::coordination, [this, coordinator, callback = std::move(callback)] {
    if (auto observer = observerOf(*coordinator)) return callback(*observer);
    auto isForClient = [&](const Registration& each) {
      return std::find(each.clients.begin(), each.clients.end(), coordinator->creator) != each.clients.end();
    };
    _observers.deliverIf(isForClient, [&](Delegate& each, const auto&) { callback(each); });
  });
}

void CoordinatorReports::promiseDidBeginFulfillment(const CoordinatorRef& coordinator, std::uint64_t promise) {
  post(coordinator, [this, coordinator, promise](Delegate& observer) {
    _boundary.enter({{"AppsClient", "promiseDidBeginFulfillmentWithIdentifier"}, coordinator->app},
                    {{"identifier", promise}}, [&] { observer.promiseDidBeginFulfillmentWithIdentifier(promise); });
  });
}

void CoordinatorReports::didInstallPlaceholder(const CoordinatorRef& coordinator) {
  post(coordinator, [this, coordinator](Delegate& observer) {
    _boundary.enter({{"AppsClient", "coordinatorDidInstallPlaceholder"}, coordinator->app},
                    {{"coordinator", coordinator}}, [&] { observer.coordinatorDidInstallPlaceholder(coordinator); });
  });
}

void CoordinatorReports::didComplete(const CoordinatorRef& coordinator) {
  post(coordinator, [this, coordinator](Delegate& observer) {
    _boundary.enter({{"AppsClient", "coordinatorDidCompleteSuccessfully"}, coordinator->app},
                    {{"coordinator", coordinator}}, [&] { observer.coordinatorDidCompleteSuccessfully(coordinator); });
  });
}

void CoordinatorReports::shouldPrioritize(const CoordinatorRef& coordinator) {
  post(coordinator, [this, coordinator](Delegate& observer) {
    _boundary.enter({{"AppsClient", "coordinatorShouldPrioritize"}, coordinator->app}, {{"coordinator", coordinator}},
                    [&] { observer.coordinatorShouldPrioritize(coordinator); });
  });
}

void CoordinatorReports::cancelled(const CoordinatorRef& coordinator, const platform::ErrorRef& reason,
                                   platform::RVClientIdentifier client) {
  post(coordinator, [this, coordinator, reason, client](Delegate& observer) {
    _boundary.enter({{"AppsClient", "coordinatorCanceledWithReason"}, coordinator->app},
                    {{"coordinator", coordinator}, {"reason", reason}, {"client", client}},
                    [&] { observer.coordinatorCanceledWithReason(coordinator, reason, client); });
  });
}

}  // namespace device
