#include "device/LocalCoordinator.h"

#include "device/InstallEngine.h"
#include "device/LocalInstallOptions.h"
#include "device/LocalPlaceholder.h"
#include "device/LocalPromise.h"
#include "device/ServiceErrors.h"

namespace device {

namespace {

using platform::ErrorRef;
using Lock = platform::Mutex::Lock;

constexpr const char* className = "RVAppInstallCoordinator";

ErrorRef notOurs(const std::string& app, const char* what) {
  return coordinationError(CoordinationError::invalid, std::string("no ") + what + " of this service for " + app);
}

}  // namespace

const char* nameOfKind(platform::RVCoordinatorKind kind) {
  using Kind = platform::RVCoordinatorKind;
  switch (kind) {
    case Kind::RVAppInstallCoordinator:
      return "RVAppInstallCoordinator";
    case Kind::RVInitiatingAppInstallCoordinator:
      return "RVInitiatingAppInstallCoordinator";
    case Kind::RVUpdatingAppInstallCoordinator:
      return "RVUpdatingAppInstallCoordinator";
    case Kind::RVRestoringAppInstallCoordinator:
      return "RVRestoringAppInstallCoordinator";
    case Kind::RVRestoringDemotedAppInstallCoordinator:
      return "RVRestoringDemotedAppInstallCoordinator";
  }
  return "";
}

const char* shortNameOfKind(platform::RVCoordinatorKind kind) {
  constexpr const char* names[] = {"", "initiating", "updating", "restoring", "restoring-demoted"};
  return names[static_cast<std::size_t>(kind)];
}

LocalCoordinator::LocalCoordinator(InstallEngine& engine, Boundary& boundary, CoordinatorRecord record)
    : app(record.app), kind(record.kind), creator(record.creator), _engine(engine), _boundary(boundary) {
  state.record = std::move(record);
}

std::shared_ptr<platform::RVAppInstallObserverDelegate> LocalCoordinator::observer() const {
  Lock lock(_engine.records().mutex);
  return state.observer.lock();
}

std::optional<std::string> LocalCoordinator::bundleID() {
  return _boundary.call({className, "bundleID", app}, nullptr, {}, [&] { return std::optional<std::string>(app); });
}

platform::RVClientIdentifier LocalCoordinator::creatorIdentifier() {
  return _boundary.call({className, "creatorIdentifier", app}, nullptr, {}, [&] { return creator; });
}

ErrorRef LocalCoordinator::error() {
  return _boundary.call({className, "error", app}, nullptr, {}, [&] {
    Lock lock(_engine.records().mutex);
    return state.failure;
  });
}

void LocalCoordinator::setObserver(std::weak_ptr<platform::RVAppInstallObserverDelegate> observer) {
  auto alive = observer.lock();
  _boundary.call({className, "setObserver", app}, nullptr, {{"observer", alive}}, [&] {
    Lock lock(_engine.records().mutex);
    state.observer = observer;
  });
}

bool LocalCoordinator::holds(const char* operation, bool (*piece)(const CoordinatorRecord&)) {
  return _boundary.call({className, operation, app}, nullptr, {}, [&] {
    Lock lock(_engine.records().mutex);
    return piece(state.record);
  });
}

bool LocalCoordinator::hasAppAssetPromise() {
  return holds("hasAppAssetPromise", [](const auto& record) { return record.appAsset != nullptr; });
}
bool LocalCoordinator::hasInitialZDRAssetPromises() {
  return holds("hasInitialZDRAssetPromises", [](const auto& record) { return record.hasInitialZDRAssetPromises; });
}
bool LocalCoordinator::hasInstallOptions() {
  return holds("hasInstallOptions", [](const auto& record) { return record.options.has_value(); });
}
bool LocalCoordinator::hasPlaceholderPromise() {
  return holds("hasPlaceholderPromise", [](const auto& record) { return record.placeholder.has_value(); });
}
bool LocalCoordinator::hasUserDataPromise() {
  return holds("hasUserDataPromise", [](const auto& record) { return record.userData != nullptr; });
}

std::shared_ptr<platform::RVPromisedTransferToPath> LocalCoordinator::appAssetPromiseWithError(ErrorRef* error) {
  return _boundary.call(
      {className, "appAssetPromiseWithError", app}, error, {},
      [&]() -> std::shared_ptr<platform::RVPromisedTransferToPath> {
        Lock lock(_engine.records().mutex);
        platform::setError(
            error,
            state.appAsset ? nullptr : coordinationError(CoordinationError::notSet, app + " has no app asset promise"));
        return state.appAsset;
      });
}

bool LocalCoordinator::setAppAssetPromise(const std::shared_ptr<platform::RVPromisedTransferToPath>& promise,
                                          ErrorRef* error) {
  return _boundary.call({className, "setAppAssetPromise", app}, error, {{"promise", promise}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalTransferPromise>(promise);
    if (!ours) return fail(error, notOurs(app, "app asset promise"));
    return _engine.attachAppAsset(*this, ours, error);
  });
}

bool LocalCoordinator::setPlaceholderPromise(const std::shared_ptr<platform::RVPlaceholder>& placeholder,
                                             ErrorRef* error) {
  return _boundary.call({className, "setPlaceholderPromise", app}, error, {{"placeholder", placeholder}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalPlaceholder>(placeholder);
    if (!ours) return fail(error, notOurs(app, "placeholder"));
    return ours->attachTo(*this, error);
  });
}

bool LocalCoordinator::setUserDataPromise(const std::shared_ptr<platform::RVPromisedOutOfBandTransfer>& promise,
                                          ErrorRef* error) {
  return _boundary.call({className, "setUserDataPromise", app}, error, {{"promise", promise}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalOutOfBandPromise>(promise);
    if (!ours) return fail(error, notOurs(app, "user-data promise"));
    auto attach = [&](CoordinatorRecord& record) {
      if (record.userData)
        return fail(error, coordinationError(CoordinationError::alreadySet, app + " has a user-data promise already"));
      record.userData = ours->record;
      return true;
    };
    return _engine.change(*this, attach, error);
  });
}

bool LocalCoordinator::setInitialZDRAssetPromises(const std::vector<std::shared_ptr<platform::RVPromise>>& promises,
                                                  ErrorRef* error) {
  return _boundary.call({className, "setInitialZDRAssetPromises", app}, error, {{"count", promises.size()}}, [&] {
    std::vector<PromiseRef> records;
    for (const auto& promise : promises) {
      if (auto transfer = std::dynamic_pointer_cast<LocalTransferPromise>(promise))
        records.push_back(transfer->record);
      else if (auto outOfBand = std::dynamic_pointer_cast<LocalOutOfBandPromise>(promise))
        records.push_back(outOfBand->record);
      else
        return fail(error, notOurs(app, "initial asset promise"));
    }
    auto attach = [&](CoordinatorRecord& record) {
      record.hasInitialZDRAssetPromises = true;
      record.initialZDRAssetPromises = records;
      return true;
    };
    return _engine.change(*this, attach, error);
  });
}

bool LocalCoordinator::setInstallOptions(const std::shared_ptr<platform::CVInstallOptions>& options, ErrorRef* error) {
  return _boundary.call({className, "setInstallOptions", app}, error, {{"options", options}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalInstallOptions>(options);
    if (!ours) return fail(error, notOurs(app, "install options"));
    auto attach = [&](CoordinatorRecord& record) {
      record.options = ours->record();
      return true;
    };
    return _engine.change(*this, attach, error);
  });
}

platform::RVClientIdentifier LocalCoordinator::appAssetPromiseResponsibleClientWithError(ErrorRef* error) {
  return _boundary.call({className, "appAssetPromiseResponsibleClientWithError", app}, error, {}, [&] {
    platform::setError(error, nullptr);
    Lock lock(_engine.records().mutex);
    return state.record.responsibleClient;
  });
}

bool LocalCoordinator::setAppAssetPromiseResponsibleClient(platform::RVClientIdentifier client, ErrorRef* error) {
  return _boundary.call({className, "setAppAssetPromiseResponsibleClient", app}, error, {{"client", client}}, [&] {
    auto name = [&](CoordinatorRecord& record) {
      record.responsibleClient = client;
      return true;
    };
    return _engine.change(*this, name, error);
  });
}

bool LocalCoordinator::cancelForReason(const ErrorRef& reason, platform::RVClientIdentifier client, ErrorRef* error) {
  return _boundary.call({className, "cancelForReason", app}, error, {{"reason", reason}, {"client", client}},
                        [&] { return _engine.cancel(*this, reason, client, error); });
}

std::string LocalCoordinator::describe() const {
  return std::string("<") + nameOfKind(kind) + ' ' + app + " client " + std::to_string(creator) + '>';
}

}  // namespace device
