#include "device/InstallEngine.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "device/LocalCoordinator.h"
#include "device/LocalPromise.h"
#include "device/ServiceErrors.h"

namespace device {

namespace {

using platform::ErrorRef;
using platform::RVCoordinatorKind;
using platform::setError;
using Lock = platform::Mutex::Lock;

ErrorRef endedError(const std::string& app) {
  return coordinationError(CoordinationError::ended, "the coordinator of " + app + " has ended");
}

/// The placeholder's Info.plist.
platform::Value infoOf(const PlaceholderRecord& placeholder) {
  auto info = placeholder.configured && placeholder.manifest.dictionary() ? placeholder.manifest
                                                                          : platform::Value::makeDictionary();
  auto& entries = *info.dictionary();
  entries.remove("KBBundleIconFile");  // names a file of the package
  entries.set("KBBundleIdentifier", placeholder.app);
  if (!placeholder.configured) return info;
  if (placeholder.version) entries.set("KBBundleVersion", *placeholder.version);
  if (!placeholder.name.empty()) entries.set("KBBundleDisplayName", placeholder.name);
  if (placeholder.launchProhibited) entries.set("OBApplicationLaunchProhibited", true);
  return info;
}

}  // namespace

bool isAppIdentifier(std::string_view text) {
  // With ".app" behind it, it is the name of a placeholder's bundle.
  if (text.empty() || text == "." || text == ".." || text.size() > 251) return false;
  return std::none_of(text.begin(), text.end(), [](char c) {
    return c == '/' || c == '\\' || static_cast<unsigned char>(c) < 0x20 || c == 0x7f;
  });
}

InstallEngine::InstallEngine(AppRecords& records, FileTree& files, Boundary& boundary, EventQueue& events,
                             RegistryReports& registry, CoordinatorReports& coordination,
                             PlaceholderFailed placeholderFailed)
    : _records(records),
      _files(files),
      _boundary(boundary),
      _events(events),
      _registry(registry),
      _coordination(coordination),
      _containers(files),
      _placeholderFailed(std::move(placeholderFailed)) {}

InstallEngine::~InstallEngine() = default;

CoordinatorRef InstallEngine::adopt(CoordinatorRecord record) {
  auto coordinator = std::make_shared<LocalCoordinator>(*this, _boundary, std::move(record));
  auto& state = coordinator->state;
  if (state.record.appAsset) {
    state.record.appAsset->coordinator = coordinator;
    state.appAsset = std::make_shared<LocalTransferPromise>(*this, _boundary, state.record.appAsset);
  }
  _open.insert_or_assign(coordinator->app, coordinator);
  return coordinator;
}

void InstallEngine::close(LocalCoordinator& coordinator) {
  coordinator.state.ended = true;
  _open.erase(coordinator.app);
}

void InstallEngine::tellChanged(const std::string& app) {
  if (!_tells || !_registry.tellsOwner()) return;
  auto status = _records.state().status(app).value_or(AppStatus{});
  status.id = app;
  _registry.appChanged(std::move(status));
}

CoordinatorRef InstallEngine::coordinatorForApp(RVCoordinatorKind kind, std::string_view app,
                                                platform::RVClientIdentifier client, bool create, bool& created,
                                                ErrorRef* error) {
  created = false;
  setError(error, nullptr);
  auto refuse = [&](CoordinationError code, std::string text) {
    setError(error, coordinationError(code, std::move(text)));
    return nullptr;
  };
  if (!isAppIdentifier(app))
    return refuse(CoordinationError::invalid, "no app can be called \"" + std::string(app) + '"');
  Lock lock(_records.mutex);
  auto found = _open.find(app);
  if (found != _open.end()) {
    if (kind == RVCoordinatorKind::RVAppInstallCoordinator || kind == found->second->kind) return found->second;
    return refuse(CoordinationError::otherKind,
                  std::string(app) + " has a coordinator of another kind: " + nameOfKind(found->second->kind));
  }
  if (!create) return nullptr;
  if (kind == RVCoordinatorKind::RVAppInstallCoordinator)
    return refuse(CoordinationError::invalid, "a coordinator to be created for " + std::string(app) + " needs a kind");
  CoordinatorRecord record;
  record.app = std::string(app);
  record.kind = kind;
  record.creator = client;
  ChangeSet changes;
  changes.put(record);
  if (!_records.write(std::move(changes), error)) return nullptr;
  created = true;
  return adopt(std::move(record));
}

CoordinatorRef InstallEngine::openCoordinator(std::string_view app) {
  Lock lock(_records.mutex);
  auto found = _open.find(app);
  return found == _open.end() ? nullptr : found->second;
}

std::vector<CoordinatorStatus> InstallEngine::openCoordinators() {
  Lock lock(_records.mutex);
  std::vector<CoordinatorStatus> result;
  for (const auto& [app, coordinator] : _open) {
    const auto& held = coordinator->state.record;
    CoordinatorStatus status{app, shortNameOfKind(coordinator->kind), coordinator->creator};
    status.hasPlaceholder = held.placeholder.has_value();
    status.promisesPackage = held.appAsset || held.responsibleClient != 0;
    status.packageClient = held.responsibleClient != coordinator->creator ? held.responsibleClient : 0;
    if (held.appAsset) status.fraction = held.appAsset->fraction;
    result.push_back(std::move(status));
  }
  return result;
}

bool InstallEngine::change(LocalCoordinator& coordinator, const std::function<bool(CoordinatorRecord&)>& edit,
                           ErrorRef* error) {
  setError(error, nullptr);
  Lock lock(_records.mutex);
  if (coordinator.state.ended) return fail(error, endedError(coordinator.app));
  auto changed = coordinator.state.record;
  if (!edit(changed)) return false;
  ChangeSet changes;
  changes.put(changed);
  if (!_records.write(std::move(changes), error)) return false;
  coordinator.state.record = std::move(changed);
  return true;
}

bool InstallEngine::attachAppAsset(LocalCoordinator& coordinator, const std::shared_ptr<LocalTransferPromise>& promise,
                                   ErrorRef* error) {
  bool attached = change(
      coordinator,
      [&](CoordinatorRecord& record) {
        if (record.appAsset)
          return fail(error, coordinationError(CoordinationError::alreadySet,
                                               coordinator.app + " has an app asset promise already"));
        if (promise->record->cancelled)
          return fail(error, coordinationError(CoordinationError::ended, promise->record->name + " is cancelled"));
        if (!promise->record->coordinator.expired())
          return fail(error, coordinationError(CoordinationError::alreadySet,
                                               promise->record->name + " is attached to a coordinator already"));
        record.appAsset = promise->record;
        return true;
      },
      error);
  if (!attached) return false;
  Lock lock(_records.mutex);
  coordinator.state.appAsset = promise;
  promise->record->coordinator = coordinator.weak_from_this();
  if (promise->record->complete && !coordinator.state.ended) beginInstall(coordinator.shared_from_this());
  return true;
}

std::optional<AppRecord> InstallEngine::writePlaceholder(const PlaceholderRecord& placeholder, ErrorRef* error) {
  AppRecord app;
  app.id = placeholder.app;
  app.bundle = placeholder.app + ".app";
  app.isPlaceholder = true;
  app.installType = placeholder.installType;
  auto info = infoOf(placeholder);
  if (placeholder.configured) {
    app.name = placeholder.name;
    app.launchProhibited = placeholder.launchProhibited;
    if (auto version = (*info.dictionary())["KBBundleVersion"].string()) app.version = std::string(*version);
  }
  ErrorRef reason;
  if (auto container = _containers.makeFresh(&reason)) {
    app.container = *container;
    auto sum = _containers.writePlaceholder(app.container, app.bundle, std::move(info),
                                            placeholder.configured ? placeholder.iconPath : std::nullopt,
                                            placeholder.configured ? placeholder.metadata : platform::Value(), &reason);
    app.filesSum = sum.value_or(0);
    if (sum) return app;
    _containers.remove(app.container);
  }
  if (_placeholderFailed) _placeholderFailed(app.id, reason);
  setError(error, reason);
  return std::nullopt;
}

bool InstallEngine::attachPlaceholder(LocalCoordinator& coordinator, const PlaceholderRecord& placeholder,
                                      ErrorRef* error) {
  setError(error, nullptr);
  if (placeholder.app != coordinator.app)
    return fail(error, coordinationError(CoordinationError::invalid,
                                         "a placeholder of " + placeholder.app + " is not one of " + coordinator.app));
  bool isUpdate = false;
  {
    Lock lock(_records.mutex);
    auto& state = coordinator.state;
    if (state.ended) return fail(error, endedError(coordinator.app));
    if (state.takesPlaceholder || state.record.placeholder)
      return fail(error, coordinationError(CoordinationError::alreadySet,
                                           coordinator.app + " has a placeholder promise already"));
    state.takesPlaceholder = true;
    const auto* app = _records.state().app(coordinator.app);
    isUpdate = app && !app->isPlaceholder;
  }
  std::optional<AppRecord> written;
  if (!isUpdate) written = writePlaceholder(placeholder, error);
  std::string abandoned = written ? written->container : "";
  bool attached = false;
  {
    Lock lock(_records.mutex);
    coordinator.state.takesPlaceholder = false;
    if (isUpdate || written)
      attached = putPlaceholder(coordinator.shared_from_this(), placeholder, std::move(written), abandoned, error);
  }
  if (!abandoned.empty()) _containers.remove(abandoned);
  return attached;
}

bool InstallEngine::putPlaceholder(const CoordinatorRef& coordinator, const PlaceholderRecord& placeholder,
                                   std::optional<AppRecord> written, std::string& abandoned, ErrorRef* error) {
  if (coordinator->state.ended) return fail(error, endedError(coordinator->app));
  const auto* existing = _records.state().app(coordinator->app);
  bool isInstalled = existing && !existing->isPlaceholder;
  if (isInstalled == written.has_value())
    return fail(error, coordinationError(CoordinationError::invalid,
                                         coordinator->app + " was installed or removed by somebody else meanwhile"));
  auto app = written ? *written : *existing;
  std::string superfluous;
  if (existing && existing->isPlaceholder) {
    superfluous = existing->container;
    app.applicationType = existing->applicationType;
    app.systemBundle = existing->systemBundle;
    app.homeOrder = existing->homeOrder;
  }
  bool isDemoted = coordinator->kind == RVCoordinatorKind::RVRestoringDemotedAppInstallCoordinator;
  bool hadProgress = existing && existing->progress;
  app.progress.reset();
  if (!isDemoted) app.progress.emplace();
  if (!isDemoted && coordinator->state.record.appAsset)
    app.progress->fraction = coordinator->state.record.appAsset->fraction;
  auto record = coordinator->state.record;
  record.placeholder = placeholder;
  ChangeSet changes;
  changes.put(std::move(app));
  changes.removeOutcome(coordinator->app);
  if (isDemoted)
    changes.removeCoordinator(coordinator->app);
  else
    changes.put(record);
  bool kept =
      superfluous.empty() ? _records.write(std::move(changes), error) : _records.commit(std::move(changes), error);
  if (!kept) return false;
  abandoned = std::move(superfluous);
  coordinator->state.record = std::move(record);
  if (isDemoted) close(*coordinator);
  _coordination.didInstallPlaceholder(coordinator);
  if (!isDemoted || hadProgress) _registry.installsChanged();
  tellChanged(coordinator->app);
  return true;
}

bool InstallEngine::endInstall(const CoordinatorRef& coordinator, const std::string& app, Ending ending,
                               const ErrorRef& reason, platform::RVClientIdentifier client, std::string& abandoned,
                               ErrorRef* error) {
  const auto* record = _records.state().app(app);
  // A coordinator that never got a placeholder has changed nothing about its app.
  if (coordinator && !coordinator->state.record.placeholder) record = nullptr;
  platform::OBApplicationProxyRef cancelled = record && record->progress ? record->proxy : nullptr;
  std::string superfluous;
  ChangeSet changes;
  OutcomeRecord outcome{ending == Ending::failed ? "FAILED" : "CANCELED", reason ? reason->describe() : ""};
  if (record && record->isPlaceholder) {
    superfluous = record->container;
    // What an interrupted process lost is likely to be asked for again, and then to be where it was.
    changes.removeApp(app, !_tells);
    if (!_tells) outcome.homeOrder = record->homeOrder;
  } else if (record && record->progress) {
    auto kept = *record;
    kept.progress.reset();
    changes.put(std::move(kept));
  }
  changes.setOutcome(app, outcome);
  if (coordinator) changes.removeCoordinator(app);
  if (!_records.commit(std::move(changes), error)) return false;
  abandoned = std::move(superfluous);
  if (coordinator) close(*coordinator);
  if (!_tells) return true;
  if (cancelled && ending == Ending::cancelled) _registry.installCancelled(cancelled);
  if (cancelled) _registry.installsChanged();
  if (coordinator && ending == Ending::cancelled) _coordination.cancelled(coordinator, reason, client);
  tellChanged(app);
  return true;
}

bool InstallEngine::cancel(LocalCoordinator& coordinator, const ErrorRef& reason, platform::RVClientIdentifier client,
                           ErrorRef* error) {
  setError(error, nullptr);
  std::string abandoned;
  {
    Lock lock(_records.mutex);
    if (coordinator.state.ended) return fail(error, endedError(coordinator.app));
    if (!endInstall(coordinator.shared_from_this(), coordinator.app, Ending::cancelled, reason, client, abandoned,
                    error))
      return false;
  }
  if (!abandoned.empty()) _containers.remove(abandoned);
  return true;
}

PromiseRef InstallEngine::makePromise(std::string_view name, platform::RVClientIdentifier client,
                                      std::uint64_t diskSpaceNeeded, std::optional<std::string> path) {
  auto promise = std::make_shared<PromiseRecord>();
  promise->name = std::string(name);
  promise->client = client;
  promise->diskSpaceNeeded = diskSpaceNeeded;
  promise->path = std::move(path);
  Lock lock(_records.mutex);
  promise->identifier = _nextPromise++;
  return promise;
}

void InstallEngine::setFraction(PromiseRecord& promise, double fraction) {
  if (std::isnan(fraction)) return;
  Lock lock(_records.mutex);
  if (promise.complete || promise.cancelled) return;
  promise.fraction = std::clamp(fraction, 0.0, 1.0);
  auto coordinator = promise.coordinator.lock();
  if (!coordinator || coordinator->state.ended) return;
  coordinator->state.fractionUnsaved = true;
  _records.setFraction(coordinator->app, promise.fraction);
  if (!std::exchange(promise.begun, true)) _coordination.promiseDidBeginFulfillment(coordinator, promise.identifier);
  tellChanged(coordinator->app);
}

void InstallEngine::setPath(PromiseRecord& promise, std::string_view path) {
  Lock lock(_records.mutex);
  if (!promise.complete) promise.path = std::string(path);
}

bool InstallEngine::isComplete(PromiseRecord& promise) {
  Lock lock(_records.mutex);
  return promise.complete;
}

void InstallEngine::deliver(PromiseRecord& promise) {
  Lock lock(_records.mutex);
  if (promise.complete || promise.cancelled) return;
  promise.complete = true;
  promise.fraction = 1;
  auto coordinator = promise.coordinator.lock();
  if (coordinator && !coordinator->state.ended) beginInstall(coordinator);
}

bool InstallEngine::cancel(PromiseRecord& promise, const ErrorRef& reason, platform::RVClientIdentifier client,
                           ErrorRef* error) {
  setError(error, nullptr);
  CoordinatorRef coordinator;
  {
    Lock lock(_records.mutex);
    if (promise.complete || promise.cancelled)
      return fail(error, coordinationError(CoordinationError::ended, promise.name + " has ended"));
    promise.cancelled = true;
    coordinator = promise.coordinator.lock();
    if (!coordinator || coordinator->state.ended) return true;
  }
  // An install cannot go on without its package.
  return cancel(*coordinator, reason, client, error);
}

bool InstallEngine::uninstall(std::string_view app, ErrorRef* error) {
  setError(error, nullptr);
  std::string id(app), abandoned;
  {
    Lock lock(_records.mutex);
    const auto* record = _records.state().app(id);
    if (!record) return fail(error, coordinationError(CoordinationError::noSuchApp, "there is no app " + id));
    abandoned = record->container;
    auto cancelled = record->progress ? record->proxy : nullptr;
    auto open = _open.find(id);
    auto coordinator = open == _open.end() ? nullptr : open->second;
    auto facts = platform::Value::makeDictionary();
    facts.dictionary()->set("KBBundleIdentifier", id);
    if (record->version) facts.dictionary()->set("KBBundleVersion", *record->version);
    auto reason = coordinationError(CoordinationError::noSuchApp, id + " was uninstalled");
    ChangeSet changes;
    changes.removeApp(id);
    changes.addUninstalled(id, facts);
    if (coordinator) {
      changes.removeCoordinator(id);
      changes.setOutcome(id, {"CANCELED", reason->describe()});
    } else {
      changes.removeOutcome(id);
    }
    if (!_records.commit(std::move(changes), error)) return false;
    if (coordinator) close(*coordinator);
    if (cancelled) _registry.installCancelled(cancelled);
    if (cancelled) _registry.installsChanged();
    if (coordinator) _coordination.cancelled(coordinator, reason, 0);
    tellChanged(id);
  }
  _containers.remove(abandoned);
  return true;
}

bool InstallEngine::cancelByPerson(std::string_view app, ErrorRef* error) {
  auto coordinator = openCoordinator(app);
  if (!coordinator)
    return fail(error, localDeviceError(LocalDeviceError::noSuchApp,
                                        "there is no install of " + std::string(app) + " to be cancelled"));
  return cancel(*coordinator,
                coordinationError(CoordinationError::ended, std::string(app) + " was cancelled by the person"), 0,
                error);
}

bool InstallEngine::prioritizeByPerson(std::string_view app, ErrorRef* error) {
  setError(error, nullptr);
  auto coordinator = openCoordinator(app);
  if (!coordinator)
    return fail(error, localDeviceError(LocalDeviceError::noSuchApp,
                                        "there is no install of " + std::string(app) + " to be put first"));
  _coordination.shouldPrioritize(coordinator);
  return true;
}

void InstallEngine::flush() {
  Lock lock(_records.mutex);
  ChangeSet changes;
  bool any = false;
  for (const auto& [app, coordinator] : _open) {
    if (!std::exchange(coordinator->state.fractionUnsaved, false)) continue;
    changes.put(coordinator->state.record);
    if (const auto* record = _records.state().app(app)) changes.put(*record);
    any = true;
  }
  if (any) _records.commitLater(std::move(changes));
}

}  // namespace device
