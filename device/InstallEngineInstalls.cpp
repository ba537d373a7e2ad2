#include <set>
#include <utility>

#include "device/InstallEngine.h"
#include "device/LocalCoordinator.h"
#include "device/LocalPromise.h"
#include "device/Package.h"
#include "device/ServiceErrors.h"
#include "device/TemporaryFiles.h"
#include "plist/PropertyList.h"

// From a package that lies somewhere to an app in the registry, and what an interrupted process leaves of that.

namespace device {

namespace {

using platform::ErrorRef;
using platform::RVCoordinatorKind;
using platform::setError;
using Lock = platform::Mutex::Lock;

/// The bundle's name for people: the manifest's, else its folder's.
std::string displayName(const UnpackedPackage& package) {
  auto name = (*package.manifest.dictionary())["KBBundleDisplayName"].string();
  return name ? std::string(*name) : package.bundle.substr(0, package.bundle.size() - 4);
}

}  // namespace

void InstallEngine::beginInstall(const CoordinatorRef& coordinator) {
  ChangeSet changes;
  changes.put(coordinator->state.record);
  if (const auto* app = _records.state().app(coordinator->app); app && app->progress) {
    auto installing = *app;
    installing.progress->phase = 1;
    installing.progress->fraction = 1;
    changes.put(std::move(installing));
  }
  // Should the store refuse, the install's own commit tells.
  _records.write(std::move(changes));
  coordinator->state.fractionUnsaved = false;
  _events.post(Lane::coordination, [this, coordinator] { installAppAsset(coordinator); });
  _registry.installsChanged();
  tellChanged(coordinator->app);
}

void InstallEngine::installAppAsset(const CoordinatorRef& coordinator) {
  InstallRequest request;
  request.app = coordinator->app;
  bool hasPath = false;
  {
    Lock lock(_records.mutex);
    const auto& state = coordinator->state;
    if (state.ended || !state.record.appAsset) return;
    hasPath = state.record.appAsset->path.has_value();
    request.packagePath = state.record.appAsset->path.value_or("");
    request.options = state.record.options;
    if (state.record.placeholder) request.metadata = state.record.placeholder->metadata;
  }
  if (hasPath) {
    install(coordinator, request, nullptr);
    return;
  }
  failInstall(
      coordinator, coordinator->app,
      coordinationError(CoordinationError::notDelivered, "the package of " + coordinator->app + " has no path"));
}

std::optional<AppRecord> InstallEngine::unpack(const InstallRequest& request, ErrorRef* error) {
  auto container = _containers.makeFresh(error);
  if (!container) return std::nullopt;
  auto giveUp = [&] {
    _containers.remove(*container);
    return std::nullopt;
  };
  auto package = unpackPackage(_files, request.packagePath, *container, {}, error);
  if (!package) return giveUp();
  if (!request.app.empty() && package->identifier != request.app) {
    setError(error, platform::makeError("Package", 1,
                                        "package \"" + request.packagePath + "\" holds the app \"" +
                                            package->identifier + "\", not \"" + request.app + '"'));
    return giveUp();
  }
  if (!isAppIdentifier(package->identifier)) {
    setError(error,
             platform::makeError("Package", 1,
                                 "package \"" + request.packagePath + "\" holds an app that nothing can be called by"));
    return giveUp();
  }
  AppRecord app;
  app.id = package->identifier;
  app.container = *container;
  app.bundle = package->bundle;
  app.name = displayName(*package);
  if (auto version = (*package->manifest.dictionary())["KBBundleVersion"].string()) app.version = std::string(*version);
  app.launchProhibited = (*package->manifest.dictionary())["OBApplicationLaunchProhibited"].boolValue();
  app.staticUsage = package->bytes;

  const auto& metadata =
      request.options && !request.options->metadata.isAbsent() ? request.options->metadata : request.metadata;
  std::string previous;
  {
    Lock lock(_records.mutex);
    if (const auto* existing = _records.state().app(app.id)) previous = existing->container;
  }
  bool done = true;
  if (!metadata.isAbsent())
    done = _containers.writeMetadata(app.container, metadata, error);
  else if (!previous.empty())
    done = _containers.copyMetadata(previous, app.container, error);
  if (!done || !_containers.sync(app.container, error)) return giveUp();
  return app;
}

bool InstallEngine::install(const CoordinatorRef& coordinator, const InstallRequest& request, ErrorRef* error) {
  setError(error, nullptr);
  ErrorRef reason;
  auto app = unpack(request, &reason);
  if (!app) {
    if (!request.app.empty()) failInstall(coordinator, request.app, reason);
    return fail(error, reason);
  }
  std::string id = app->id;
  std::string abandoned = app->container;
  bool finished = false;
  bool ended = false;
  {
    Lock lock(_records.mutex);
    ended = coordinator && coordinator->state.ended;
    if (ended)
      reason = coordinationError(CoordinationError::ended, "the install of " + id + " was cancelled");
    else
      finished = finishInstall(coordinator, std::move(*app), request, abandoned, &reason);
  }
  if (!abandoned.empty()) _containers.remove(abandoned);
  if (!finished) {
    if (!ended && !request.app.empty()) failInstall(coordinator, id, reason);
    return fail(error, reason);
  }
  removePackage(request.packagePath);
  return true;
}

bool InstallEngine::finishInstall(const CoordinatorRef& coordinator, AppRecord installed, const InstallRequest& request,
                                  std::string& abandoned, ErrorRef* error) {
  auto app = installed.id;
  if (!coordinator && _open.count(app))
    return fail(error, localDeviceError(LocalDeviceError::busyApp, "an install of " + app + " is under way"));
  std::string superfluous;
  if (const auto* existing = _records.state().app(app)) {
    if (existing->container != installed.container) superfluous = existing->container;
    installed.applicationType = existing->applicationType;
    installed.systemBundle = existing->systemBundle;
    installed.homeOrder = existing->homeOrder;
    installed.installType = existing->installType;
    if (coordinator && !existing->isPlaceholder && coordinator->state.record.placeholder)
      installed.installType = coordinator->state.record.placeholder->installType;
  }
  if (request.options) installed.installType = request.options->installType;
  installed.isPlaceholder = false;
  installed.progress.reset();
  ChangeSet changes;
  changes.put(std::move(installed));
  changes.removeUninstalled(app);
  changes.setOutcome(app, {"INSTALLED", ""});
  if (coordinator) changes.removeCoordinator(app);
  if (!request.packagePath.empty()) changes.addLeftover(request.packagePath);
  if (!_records.commit(std::move(changes), error)) return false;
  abandoned = std::move(superfluous);
  if (coordinator) close(*coordinator);
  if (!_tells) return true;
  if (coordinator) _coordination.didComplete(coordinator);
  _registry.installsChanged();
  tellChanged(app);
  return true;
}

void InstallEngine::failInstall(const CoordinatorRef& coordinator, const std::string& app, const ErrorRef& reason) {
  auto failure = coordinationError(CoordinationError::installFailed,
                                   reason ? reason->description() : "the package cannot be installed", reason);
  std::string abandoned;
  {
    Lock lock(_records.mutex);
    if (coordinator && coordinator->state.ended) return;
    if (coordinator) coordinator->state.failure = failure;
    // A store that takes nothing any more must not leave the caller waiting: the coordinator ends for this process.
    if (!endInstall(coordinator, app, Ending::failed, failure, 0, abandoned, nullptr) && coordinator)
      close(*coordinator);
    if (coordinator && _tells) _coordination.didComplete(coordinator);
  }
  if (!abandoned.empty()) _containers.remove(abandoned);
}

void InstallEngine::removePackage(const std::string& path) {
  if (path.empty()) return;
  _files.removeItem(path);
  ChangeSet changes;
  changes.removeLeftover(path);
  Lock lock(_records.mutex);
  _records.commitLater(std::move(changes));
}

bool InstallEngine::beginStoreInstall(std::string_view id, const StoreInstall& install, ErrorRef* error) {
  setError(error, nullptr);
  std::string app(id);
  if (!isAppIdentifier(app))
    return fail(error, localDeviceError(LocalDeviceError::failed, "no app can be called \"" + app + '"'));
  auto busy = [&]() REQUIRES(_records.mutex) {
    if (!install.createsCoordinator || !_open.count(app)) return false;
    setError(error, localDeviceError(LocalDeviceError::busyApp, app + " has a coordinator already"));
    return true;
  };
  bool isNew = false;
  {
    Lock lock(_records.mutex);
    if (busy()) return false;
    isNew = !_records.state().app(app);
  }
  PlaceholderRecord placeholder;
  placeholder.app = app;
  placeholder.installType = install.installType;
  placeholder.client = platform::RVClientMercato;
  std::optional<AppRecord> written;
  if (isNew && !(written = writePlaceholder(placeholder, error))) return false;
  Lock lock(_records.mutex);
  if (busy()) return false;
  const auto* existing = _records.state().app(app);
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
  if (!_records.commit(std::move(changes), error)) return false;
  if (install.createsCoordinator) adopt(std::move(coordinator));
  _registry.installsChanged();
  tellChanged(app);
  return true;
}

bool InstallEngine::finishStoreInstall(std::string_view id, std::string_view packagePath, ErrorRef* error) {
  setError(error, nullptr);
  InstallRequest request;
  request.app = std::string(id);
  request.packagePath = std::string(packagePath);
  CoordinatorRef coordinator;
  std::optional<AppRecord> app;
  {
    Lock lock(_records.mutex);
    auto open = _open.find(id);
    if (open != _open.end()) coordinator = open->second;
    if (const auto* record = _records.state().app(id)) app = *record;
    if (!app)
      return fail(error, localDeviceError(LocalDeviceError::noSuchApp, "there is no install of " + request.app));
    if (coordinator) {
      const auto& held = coordinator->state.record;
      if (held.creator != platform::RVClientMercato && held.responsibleClient != platform::RVClientMercato)
        return fail(error, localDeviceError(LocalDeviceError::busyApp,
                                            "the install of " + request.app + " is not the store's"));
      request.options = held.options;
      if (held.placeholder) request.metadata = held.placeholder->metadata;
    }
  }
  if (!request.packagePath.empty()) return install(coordinator, request, error);
  // A placeholder's files need not last; those of an app do.
  if (app->isPlaceholder && !_containers.sync(app->container, error)) return false;
  std::string abandoned;
  Lock lock(_records.mutex);
  if (coordinator && coordinator->state.ended)
    return fail(error, coordinationError(CoordinationError::ended, "the install of " + request.app + " was cancelled"));
  return finishInstall(coordinator, std::move(*app), request, abandoned, error);
}

bool InstallEngine::installFromPackage(std::string_view packagePath, ErrorRef* error) {
  InstallRequest request;
  request.packagePath = std::string(packagePath);
  return install(nullptr, request, error);
}

void InstallEngine::removeLostPlaceholders() {
  std::vector<AppRecord> placeholders;
  {
    Lock lock(_records.mutex);
    for (const auto& [id, app] : _records.state().apps) {
      if (app.isPlaceholder) placeholders.push_back(app);
    }
  }
  for (const auto& app : placeholders) {
    auto bytes = _files.readFile(app.bundlePath() + "/Info.plist");
    bool isWhole = app.filesSum == 0 || app.filesSum == _containers.placeholderSum(app.container, app.bundle);
    if (isWhole && bytes && plist::read(std::move(*bytes)).dictionary()) continue;
    std::string abandoned;
    {
      Lock lock(_records.mutex);
      auto open = _open.find(app.id);
      bool isIts = open != _open.end() && open->second->state.record.placeholder;
      endInstall(isIts ? open->second : nullptr, app.id, Ending::failed,
                 coordinationError(CoordinationError::installFailed, "the placeholder's files were lost"), 0, abandoned,
                 nullptr);
    }
    if (!abandoned.empty()) _containers.remove(abandoned);
  }
}

void InstallEngine::recover(AppRecords::Loaded loaded) {
  std::vector<CoordinatorRef> interrupted;
  std::set<std::string> containers;
  {
    Lock lock(_records.mutex);
    for (auto& record : loaded.coordinators) {
      for (const auto& promise : {record.appAsset, record.userData}) {
        if (promise) _nextPromise = std::max(_nextPromise, promise->identifier + 1);
      }
      auto coordinator = adopt(std::move(record));
      const auto& appAsset = coordinator->state.record.appAsset;
      if (appAsset && appAsset->complete) interrupted.push_back(coordinator);
    }
    for (const auto& [id, app] : _records.state().apps) containers.insert(app.container);
  }
  _containers.removeAllBut(containers);
  removeTemporaryFiles(_files);
  for (const auto& path : loaded.leftovers) removePackage(path);
  for (const auto& coordinator : interrupted) installAppAsset(coordinator);
  removeLostPlaceholders();
  Lock lock(_records.mutex);
  _tells = true;
}

}  // namespace device
