#include "device/install/StoreInstalls.h"

#include <optional>
#include <string>
#include <utility>

#include "device/DeviceErrors.h"
#include "device/install/AppIdentifier.h"
#include "device/install/CoordinationError.h"
#include "device/install/PackageInstall.h"
#include "device/install/PlaceholderInstall.h"

namespace device {

using platform::ErrorRef;
using platform::RVCoordinatorKind;
using platform::setError;
using Lock = AppRecords::Lock;

bool StoreInstalls::isBusy(const std::string& app, const StoreInstall& install, ErrorRef* error) const {
  if (!install.createsCoordinator || !_parts.open.find(app)) return false;
  setError(error, localDeviceError(LocalDeviceError::busyApp, app + " already has a coordinator"));
  return true;
}

bool StoreInstalls::begin(std::string_view id, const StoreInstall& install, ErrorRef* error) {
  setError(error, nullptr);
  std::string app(id);
  if (!isAppIdentifier(app))
    return fail(error, localDeviceError(LocalDeviceError::failed, '"' + app + "\" cannot be an app's identifier"));
  bool isNew = false;
  {
    Lock lock(_parts.records);
    if (isBusy(app, install, error)) return false;
    isNew = !_parts.records.state().app(app);
  }
  PlaceholderRecord placeholder;
  placeholder.app = app;
  placeholder.installType = install.installType;
  placeholder.client = platform::RVClientMercato;
  std::optional<AppRecord> written;
  if (isNew && !(written = writePlaceholder(_parts, placeholder, error))) return false;
  AbandonedContainer abandoned(_parts.containers, written ? written->container : "");
  Lock lock(_parts.records);
  if (isBusy(app, install, error)) return false;
  bool takesWritten = written && !_parts.records.state().app(app);
  if (!record(app, install, std::move(placeholder), written ? &*written : nullptr, error)) return false;
  if (takesWritten) abandoned.become("");
  return true;
}

bool StoreInstalls::record(const std::string& app, const StoreInstall& install, PlaceholderRecord placeholder,
                           const AppRecord* written, ErrorRef* error) {
  const auto* existing = _parts.records.state().app(app);
  if (!existing && !written)
    return fail(error, localDeviceError(LocalDeviceError::noSuchApp, app + " was removed meanwhile"));
  auto record = existing ? *existing : *written;
  record.installType = install.installType;
  record.applicationType = install.applicationType;
  record.systemBundle = install.systemBundle;
  record.progress.reset();
  if (install.hasProgress)
    record.progress = InstallProgressRecord{install.installState, install.installPhase, install.paused, 0};
  CoordinatorRecord coordinator;
  coordinator.app = app;
  coordinator.kind = record.isPlaceholder ? RVCoordinatorKind::RVInitiatingAppInstallCoordinator
                                          : RVCoordinatorKind::RVUpdatingAppInstallCoordinator;
  coordinator.creator = coordinator.responsibleClient = platform::RVClientMercato;
  coordinator.placeholder = std::move(placeholder);
  ChangeSet changes;
  changes.put(std::move(record));
  changes.removeOutcome(app);
  if (install.createsCoordinator) changes.put(coordinator);
  if (!_parts.records.commit(std::move(changes), error)) return false;
  if (install.createsCoordinator) _parts.open.open(std::move(coordinator));
  _parts.reports.installsChanged(app);
  return true;
}

bool StoreInstalls::finish(std::string_view id, std::string_view packagePath, ErrorRef* error) {
  setError(error, nullptr);
  InstallRequest request;
  request.app = std::string(id);
  request.packagePath = std::string(packagePath);
  CoordinatorRef coordinator;
  std::string container;
  bool isPlaceholder = false;
  {
    Lock lock(_parts.records);
    coordinator = _parts.open.find(id);
    const auto* app = _parts.records.state().app(id);
    if (!app)
      return fail(error, localDeviceError(LocalDeviceError::noSuchApp, "there is no install of " + request.app));
    container = app->container;
    isPlaceholder = app->isPlaceholder;
    if (coordinator) {
      const auto& held = coordinator->state.record;
      if (held.creator != platform::RVClientMercato && held.responsibleClient != platform::RVClientMercato)
        return fail(error, localDeviceError(LocalDeviceError::busyApp,
                                            "the install of " + request.app + " is not the store's"));
      request.options = held.options;
      if (held.placeholder) request.metadata = held.placeholder->metadata;
    }
  }
  if (!packagePath.empty()) {
    if (!coordinator) request.continues = container;
    return PackageInstall(_parts, coordinator, std::move(request)).run(error);
  }
  // A placeholder's files need not be durable; those of an app must.
  if (isPlaceholder && !_parts.containers.sync(container, error)) return false;
  return finishAsItIs(coordinator, request.app, container, request.options, error);
}

bool StoreInstalls::finishAsItIs(const CoordinatorRef& coordinator, const std::string& id, const std::string& container,
                                 const std::optional<InstallOptionsRecord>& options, ErrorRef* error) {
  AbandonedContainer abandoned(_parts.containers);
  Lock lock(_parts.records);
  if (coordinator && coordinator->state.ended)
    return fail(error, coordinationError(CoordinationError::ended, "the install of " + id + " was cancelled"));
  // The record as it is now: what was read before the files were made to last may be of an app that is gone.
  const auto* app = _parts.records.state().app(id);
  if (!app || app->container != container)
    return fail(error, localDeviceError(LocalDeviceError::noSuchApp, id + " was removed meanwhile"));
  return recordInstalled(_parts, coordinator, *app, options, "", abandoned, error);
}

}  // namespace device
