#include "device/install/PackageInstall.h"

#include <cerrno>
#include <new>

#include "device/DeviceErrors.h"
#include "device/install/AppIdentifier.h"
#include "device/install/CoordinationError.h"
#include "device/package/Package.h"

namespace device {

using platform::ErrorRef;
using platform::setError;
using Lock = AppRecords::Lock;

namespace {

/// The bundle's name for people: the manifest's, otherwise its folder's.
std::string displayName(const UnpackedPackage& package) {
  auto name = (*package.manifest.dictionary())["KBBundleDisplayName"].string();
  return name ? std::string(*name) : package.bundle.substr(0, package.bundle.size() - 4);
}

AppRecord recordOf(const UnpackedPackage& package, const std::string& container) {
  const auto& manifest = *package.manifest.dictionary();
  AppRecord app;
  app.id = package.identifier;
  app.container = container;
  app.bundle = package.bundle;
  app.name = displayName(package);
  if (auto version = manifest["KBBundleVersion"].string()) app.version = std::string(*version);
  app.launchProhibited = manifest["OBApplicationLaunchProhibited"].boolValue();
  app.staticUsage = package.bytes;
  return app;
}

}  // namespace

std::optional<AppRecord> PackageInstall::unpackFresh(ErrorRef* error) {
  auto container = _parts.containers.makeFresh(error);
  if (!container) return std::nullopt;
  AbandonedContainer abandoned(_parts.containers, *container);
  auto app = unpackInto(*container, error);
  if (app) abandoned.become("");
  return app;
}

std::optional<AppRecord> PackageInstall::unpackInto(const std::string& container, ErrorRef* error) {
  auto package = unpackPackage(_parts.files, _request.packagePath, container, {}, error);
  if (!package) return std::nullopt;
  auto refuse = [&](const std::string& what) {
    setError(error, platform::makeError("Package", 1, "package \"" + _request.packagePath + "\" holds " + what));
    return std::nullopt;
  };
  if (!_request.app.empty() && package->identifier != _request.app)
    return refuse("the app \"" + package->identifier + "\", not \"" + _request.app + '"');
  if (!isAppIdentifier(package->identifier)) return refuse("an app whose identifier cannot be used");
  auto app = recordOf(*package, container);
  const auto& metadata = _request.storeMetadata();
  std::string previous;
  {
    Lock lock(_parts.records);
    if (const auto* existing = _parts.records.state().app(app.id)) previous = existing->container;
  }
  bool done = true;
  if (!metadata.isAbsent())
    done = _parts.containers.writeMetadata(container, metadata, error);
  else if (!previous.empty())
    done = _parts.containers.copyMetadata(previous, container, error);
  if (!done || !_parts.containers.sync(container, error)) return std::nullopt;
  return app;
}

ErrorRef PackageInstall::outOfMemory() const {
  // A package that needs more memory than there is, which the next one may not.
  return platform::makeError("Package", ENOMEM, "package \"" + _request.packagePath + "\": out of memory");
}

UnpackedApp PackageInstall::unpack() {
  _parts.records.takeBackClosed();  // files come now that no record names
  UnpackedApp unpacked;
  try {
    unpacked.app = unpackFresh(&unpacked.reason);
  } catch (const std::bad_alloc&) {
    unpacked.reason = outOfMemory();
  }
  return unpacked;
}

bool PackageInstall::finish(UnpackedApp unpacked, ErrorRef* error) {
  setError(error, nullptr);
  ErrorRef reason = unpacked.reason;
  auto id = unpacked.app ? unpacked.app->id : _request.app;
  bool installed = false;
  try {
    installed = unpacked.app && record(std::move(*unpacked.app), &reason);
  } catch (const std::bad_alloc&) {
    reason = outOfMemory();
  }
  if (!installed) {
    if (!_request.app.empty()) fail(id, reason);
    return device::fail(error, reason);
  }
  removePackage(_parts, _request.packagePath);
  return true;
}

bool PackageInstall::record(AppRecord app, ErrorRef* reason) {
  AbandonedContainer abandoned(_parts.containers, app.container);
  Lock lock(_parts.records);
  if (auto ended = ending(app.id)) return device::fail(reason, ended);
  return recordInstalled(_parts, _coordinator, std::move(app), _request.options, _request.packagePath, abandoned,
                         reason);
}

ErrorRef PackageInstall::ending(const std::string& app) const {
  if (_coordinator && _coordinator->state.ended)
    return coordinationError(CoordinationError::ended, "the install of " + app + " was cancelled");
  if (!_request.continues) return nullptr;
  if (_parts.open.find(app))
    return localDeviceError(LocalDeviceError::busyApp, "an install of " + app + " is under way");
  const auto* existing = _parts.records.state().app(app);
  if (existing && existing->container == *_request.continues) return nullptr;
  return localDeviceError(LocalDeviceError::noSuchApp, app + " was removed meanwhile");
}

void PackageInstall::fail(const std::string& app, const ErrorRef& reason) {
  AbandonedContainer abandoned(_parts.containers);
  Lock lock(_parts.records);
  if (!ending(app)) failInstall(_parts, _coordinator, app, reason, abandoned);
}

std::optional<InstallRequest> requestOf(const InstallParts& parts, const CoordinatorRef& coordinator) {
  AbandonedContainer abandoned(parts.containers);
  Lock lock(parts.records);
  const auto& record = coordinator->state.record;
  if (coordinator->state.ended || !record.appAsset) return std::nullopt;
  if (!record.appAsset->path) {
    failInstall(
        parts, coordinator, coordinator->app,
        coordinationError(CoordinationError::notDelivered, "the package of " + coordinator->app + " has no path"),
        abandoned);
    return std::nullopt;
  }
  return requestIn(record);
}

InstallRequest requestIn(const CoordinatorRecord& record) {
  InstallRequest request;
  request.app = record.app;
  request.packagePath = *record.appAsset->path;
  request.options = record.options;
  if (record.placeholder) request.metadata = record.placeholder->metadata;
  return request;
}

void installAppAsset(const InstallParts& parts, const CoordinatorRef& coordinator) {
  if (auto request = requestOf(parts, coordinator))
    PackageInstall(parts, coordinator, std::move(*request)).run(nullptr);
}

void removePackage(const InstallParts& parts, const std::string& path) {
  if (path.empty()) return;
  parts.files.removeItem(path);
  ChangeSet changes;
  changes.removeLeftover(path);
  Lock lock(parts.records);
  parts.records.commitLater(std::move(changes));
}

}  // namespace device
