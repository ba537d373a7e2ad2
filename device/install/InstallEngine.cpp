#include "device/install/InstallEngine.h"

#include <algorithm>
#include <cmath>
#include <new>
#include <utility>

#include "device/DeviceErrors.h"
#include "device/install/AppIdentifier.h"
#include "device/install/CoordinationError.h"
#include "device/install/InstallAhead.h"
#include "device/install/InstallOutcomes.h"
#include "device/install/InstallRecovery.h"
#include "device/install/PackageInstall.h"
#include "device/install/PlaceholderInstall.h"
#include "device/install/StoreInstalls.h"
#include "platform/OBNumbers.h"

namespace device {

using platform::ErrorRef;
using platform::RVCoordinatorKind;
using platform::setError;
using Lock = AppRecords::Lock;

InstallEngine::InstallEngine(AppRecords& records, FileTree& files, EventQueue& events, RegistryReports& registry,
                             CoordinatorReports& coordination, OpenCoordinators::Make makeCoordinator,
                             PlaceholderFailed placeholderFailed)
    : _records(records),
      _containers(files),
      _open(std::move(makeCoordinator)),
      _reports(records, registry, coordination),
      _placeholderFailed(std::move(placeholderFailed)),
      _parts{
          .records = records,
          .files = files,
          .containers = _containers,
          .open = _open,
          .reports = _reports,
          .events = events,
          .placeholderFailed = _placeholderFailed,
      } {}

void InstallEngine::begin(AppRecords::Loaded loaded, bool recovers) {
  InstallRecovery(_parts).run(std::move(loaded), recovers);
  Lock lock(_records);
  _reports.start();
}

void InstallEngine::flush() {
  Lock lock(_records);
  ChangeSet changes;
  if (_open.putUnsaved(_records.state(), changes)) _records.commitLater(std::move(changes));
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
    return refuse(CoordinationError::invalid, '"' + std::string(app) + "\" cannot be an app's identifier");
  Lock lock(_records);
  if (auto found = _open.find(app)) {
    if (kind == RVCoordinatorKind::RVAppInstallCoordinator || kind == found->kind) return found;
    return refuse(CoordinationError::otherKind,
                  std::string(app) + " has a coordinator of another kind: " + nameOfKind(found->kind));
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
  return _open.open(std::move(record));
}

CoordinatorRef InstallEngine::openCoordinator(std::string_view app) {
  Lock lock(_records);
  return _open.find(app);
}

std::vector<CoordinatorStatus> InstallEngine::openCoordinators() {
  Lock lock(_records);
  return _open.statuses();
}

bool InstallEngine::change(Coordinator& coordinator, const std::function<bool(CoordinatorRecord&)>& edit,
                           ErrorRef* error) {
  setError(error, nullptr);
  Lock lock(_records);
  return this->edit(coordinator, edit, error);
}

bool InstallEngine::edit(Coordinator& coordinator, const std::function<bool(CoordinatorRecord&)>& edit,
                         ErrorRef* error) {
  if (coordinator.state.ended) return fail(error, endedError(coordinator.app));
  auto changed = coordinator.state.record;
  if (!edit(changed)) return false;
  ChangeSet changes;
  changes.put(changed);
  if (!_records.write(std::move(changes), error)) return false;
  coordinator.state.record = std::move(changed);
  return true;
}

bool InstallEngine::attachAppAsset(Coordinator& coordinator, const PromiseRef& promise,
                                   std::shared_ptr<platform::RVPromisedTransferToPath> handle, ErrorRef* error) {
  setError(error, nullptr);
  auto attach = [&](CoordinatorRecord& record) REQUIRES(recordsGuard) {
    if (record.appAsset)
      return fail(error, coordinationError(CoordinationError::alreadySet,
                                           coordinator.app + " already has an app asset promise"));
    if (promise->cancelled)
      return fail(error, coordinationError(CoordinationError::ended, promise->name + " is cancelled"));
    if (!promise->coordinator.expired())
      return fail(error, coordinationError(CoordinationError::alreadySet,
                                           promise->name + " is already attached to a coordinator"));
    record.appAsset = promise;
    return true;
  };
  // In one go under the guard: a promise that is cancelled or delivered meanwhile has to find its coordinator.
  Lock lock(_records);
  if (!edit(coordinator, attach, error)) return false;
  coordinator.state.appAsset = std::move(handle);
  promise->coordinator = coordinator.weak_from_this();
  if (promise->complete) beginInstall(coordinator.shared_from_this());
  return true;
}

bool InstallEngine::attachPlaceholder(Coordinator& coordinator, const PlaceholderRecord& placeholder, ErrorRef* error) {
  return PlaceholderInstall(_parts, coordinator.shared_from_this(), placeholder).run(error);
}

bool InstallEngine::cancel(Coordinator& coordinator, const ErrorRef& reason, platform::RVClientIdentifier client,
                           ErrorRef* error) {
  setError(error, nullptr);
  AbandonedContainer abandoned(_containers);
  Lock lock(_records);
  if (coordinator.state.ended) return fail(error, endedError(coordinator.app));
  return recordEnded(_parts, coordinator.shared_from_this(), coordinator.app,
                     {InstallOutcome::cancelled, reason, client}, abandoned, error);
}

PromiseRef InstallEngine::makePromise(std::string_view name, platform::RVClientIdentifier client,
                                      std::uint64_t diskSpaceNeeded, std::optional<std::string> path) {
  auto promise = std::make_shared<PromiseRecord>();
  promise->name = std::string(name);
  promise->client = client;
  promise->diskSpaceNeeded = diskSpaceNeeded;
  Lock lock(_records);
  promise->path = std::move(path);
  promise->identifier = _open.newPromiseNumber();
  return promise;
}

void InstallEngine::setFraction(PromiseRecord& promise, double fraction) {
  if (std::isnan(fraction)) return;
  Lock lock(_records);
  if (promise.complete || promise.cancelled) return;
  promise.fraction = std::clamp(fraction, 0.0, 1.0);
  auto coordinator = promise.coordinator.lock();
  if (!coordinator || coordinator->state.ended) return;
  coordinator->state.fractionUnsaved = true;
  _records.setFraction(coordinator->app, promise.fraction);
  if (!std::exchange(promise.begun, true)) _reports.transferBegan(coordinator, promise.identifier);
  _reports.appChanged(coordinator->app);
}

void InstallEngine::setPath(PromiseRecord& promise, std::string_view path) {
  Lock lock(_records);
  if (!promise.complete) promise.path = std::string(path);
}

bool InstallEngine::isComplete(const PromiseRecord& promise) {
  Lock lock(_records);
  return promise.complete;
}

std::optional<std::string> InstallEngine::deliveredPath(const PromiseRecord& promise) {
  Lock lock(_records);
  return promise.complete ? promise.path : std::nullopt;
}

void InstallEngine::deliver(PromiseRecord& promise) {
  Lock lock(_records);
  if (promise.complete || promise.cancelled) return;
  promise.complete = true;
  promise.fraction = 1;
  auto coordinator = promise.coordinator.lock();
  if (coordinator && !coordinator->state.ended) beginInstall(coordinator);
}

void InstallEngine::beginInstall(const CoordinatorRef& coordinator) {
  ChangeSet changes;
  changes.put(coordinator->state.record);
  if (const auto* app = _records.state().app(coordinator->app); app && app->progress) {
    auto installing = *app;
    installing.progress->phase = platform::installPhase::installing;
    installing.progress->fraction = 1;
    changes.put(std::move(installing));
  }
  // If the store refuses, the install's own commit tells.
  _records.write(std::move(changes));
  coordinator->state.fractionUnsaved = false;
  auto install = std::make_shared<InstallAhead>(_parts, coordinator, _unpackedAhead);
  _parts.events.post(Lane::coordination, [this, install] { _putsOff ? install->discard() : install->install(); });
  _reports.installsChanged(coordinator->app);
  unpackAhead(coordinator->state.record, install);
}

void InstallEngine::unpackAhead(const CoordinatorRecord& record, const std::shared_ptr<InstallAhead>& install) {
  if (!record.appAsset || !record.appAsset->path) return;
  try {
    auto request = requestIn(record);
    if (request.storeMetadata().isAbsent()) return;  // the app's own at that time, which are not known yet
    EventQueue::Event unpack = [this, install, request = std::move(request)]() mutable {
      if (!_putsOff) install->unpack(std::move(request));
    };
    _parts.events.workAside(unpack);
  } catch (const std::bad_alloc&) {
    // Its turn comes all the same.
  }
}

bool InstallEngine::cancel(PromiseRecord& promise, const ErrorRef& reason, platform::RVClientIdentifier client,
                           ErrorRef* error) {
  setError(error, nullptr);
  CoordinatorRef coordinator;
  {
    Lock lock(_records);
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
  std::string id(app);
  AbandonedContainer abandoned(_containers);
  Lock lock(_records);
  const auto* record = _records.state().app(id);
  if (!record) return fail(error, coordinationError(CoordinationError::noSuchApp, "there is no app " + id));
  auto container = record->container;
  auto shown = record->progress ? record->proxy : nullptr;
  auto coordinator = _open.find(id);
  auto facts = platform::Value::makeDictionary();
  facts.dictionary()->set("KBBundleIdentifier", id);
  if (record->version) facts.dictionary()->set("KBBundleVersion", *record->version);
  auto reason = coordinationError(CoordinationError::noSuchApp, id + " was uninstalled");
  ChangeSet changes;
  changes.removeApp(id);
  changes.addUninstalled(id, facts);
  if (coordinator) {
    changes.removeCoordinator(id);
    changes.setOutcome(id, {InstallOutcome::cancelled, reason->describe()});
  } else {
    changes.removeOutcome(id);
  }
  if (!_records.commit(std::move(changes), error)) return false;
  abandoned.become(std::move(container));
  if (coordinator) _open.close(*coordinator);
  _reports.cancelled(coordinator, id, shown, reason, 0);
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
  _reports.shouldPrioritize(coordinator);
  return true;
}

bool InstallEngine::beginStoreInstall(std::string_view app, const StoreInstall& install, ErrorRef* error) {
  return StoreInstalls(_parts).begin(app, install, error);
}

bool InstallEngine::finishStoreInstall(std::string_view app, std::string_view packagePath, ErrorRef* error) {
  return StoreInstalls(_parts).finish(app, packagePath, error);
}

bool InstallEngine::installFromPackage(std::string_view packagePath, ErrorRef* error) {
  InstallRequest request;
  request.packagePath = std::string(packagePath);
  return PackageInstall(_parts, nullptr, std::move(request)).run(error);
}

}  // namespace device
