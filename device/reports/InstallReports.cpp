#include "device/reports/InstallReports.h"

#include <utility>

namespace device {

void InstallReports::appChanged(const std::string& app) {
  if (!_tells || !_registry.tellsOwner()) return;
  auto status = _records.state().status(app).value_or(AppStatus{});
  status.id = app;
  _registry.appChanged(std::move(status));
}

void InstallReports::transferBegan(const CoordinatorRef& coordinator, std::uint64_t promise) {
  _coordination.promiseDidBeginFulfillment(coordinator, promise);
}

void InstallReports::installsChanged(const std::string& app) {
  _registry.installsChanged();
  appChanged(app);
}

void InstallReports::placeholderInstalled(const CoordinatorRef& coordinator, bool installsChanged) {
  _coordination.didInstallPlaceholder(coordinator);
  if (installsChanged) _registry.installsChanged();
  appChanged(coordinator->app);
}

void InstallReports::installed(const CoordinatorRef& coordinator, const std::string& app) {
  if (!_tells) return;
  if (coordinator) _coordination.didComplete(coordinator);
  _registry.installsChanged();
  appChanged(app);
}

void InstallReports::cancelled(const CoordinatorRef& coordinator, const std::string& app,
                               const platform::OBApplicationProxyRef& shown, const platform::ErrorRef& reason,
                               platform::RVClientIdentifier client) {
  if (!_tells) return;
  if (shown) _registry.installCancelled(shown);
  if (shown) _registry.installsChanged();
  if (coordinator) _coordination.cancelled(coordinator, reason, client);
  appChanged(app);
}

void InstallReports::failed(const std::string& app, bool wasShown) {
  if (!_tells) return;
  if (wasShown) _registry.installsChanged();
  appChanged(app);
}

void InstallReports::completedInError(const CoordinatorRef& coordinator) {
  if (_tells) _coordination.didComplete(coordinator);
}

}  // namespace device
