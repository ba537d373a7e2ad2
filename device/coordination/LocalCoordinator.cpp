#include "device/coordination/LocalCoordinator.h"

#include "device/DeviceErrors.h"
#include "device/coordination/LocalInstallOptions.h"
#include "device/coordination/LocalPlaceholder.h"
#include "device/coordination/LocalPromise.h"
#include "device/install/CoordinationError.h"

namespace device {

namespace {

using platform::ErrorRef;
using Lock = AppRecords::Lock;

constexpr const char* className = "RVAppInstallCoordinator";

ErrorRef notOurs(const std::string& app, const char* what) {
  return coordinationError(CoordinationError::invalid, std::string("no ") + what + " of this service for " + app);
}

}  // namespace

std::optional<std::string> LocalCoordinator::bundleID() {
  return _boundary.call({{className, "bundleID"}, app}, nullptr, {}, [&] { return std::optional<std::string>(app); });
}

platform::RVClientIdentifier LocalCoordinator::creatorIdentifier() {
  return _boundary.call({{className, "creatorIdentifier"}, app}, nullptr, {}, [&] { return creator; });
}

ErrorRef LocalCoordinator::error() {
  return _boundary.call({{className, "error"}, app}, nullptr, {}, [&] {
    Lock lock(_engine.records());
    return state.failure;
  });
}

void LocalCoordinator::setObserver(std::weak_ptr<platform::RVAppInstallObserverDelegate> observer) {
  auto alive = observer.lock();
  _boundary.call({{className, "setObserver"}, app}, nullptr, {{"observer", alive}}, [&] {
    Lock lock(_engine.records());
    state.observer = observer;
  });
}

bool LocalCoordinator::holds(const InjectionPoint& point, bool (*piece)(const CoordinatorRecord&)) {
  return _boundary.call({point, app}, nullptr, {}, [&] {
    Lock lock(_engine.records());
    return piece(state.record);
  });
}

bool LocalCoordinator::hasAppAssetPromise() {
  return holds({className, "hasAppAssetPromise"}, [](const auto& record) { return record.appAsset != nullptr; });
}
bool LocalCoordinator::hasInitialZDRAssetPromises() {
  return holds({className, "hasInitialZDRAssetPromises"},
               [](const auto& record) { return record.hasInitialZDRAssetPromises; });
}
bool LocalCoordinator::hasInstallOptions() {
  return holds({className, "hasInstallOptions"}, [](const auto& record) { return record.options.has_value(); });
}
bool LocalCoordinator::hasPlaceholderPromise() {
  return holds({className, "hasPlaceholderPromise"}, [](const auto& record) { return record.placeholder.has_value(); });
}
bool LocalCoordinator::hasUserDataPromise() {
  return holds({className, "hasUserDataPromise"}, [](const auto& record) { return record.userData != nullptr; });
}

std::shared_ptr<platform::RVPromisedTransferToPath> LocalCoordinator::appAssetPromiseWithError(ErrorRef* error) {
  return _boundary.call(
      {{className, "appAssetPromiseWithError"}, app}, error, {},
      [&]() -> std::shared_ptr<platform::RVPromisedTransferToPath> {
        Lock lock(_engine.records());
        const auto& held = state.record.appAsset;
        if (held && !state.appAsset) state.appAsset = std::make_shared<LocalTransferPromise>(_engine, _boundary, held);
        platform::setError(
            error,
            state.appAsset ? nullptr : coordinationError(CoordinationError::notSet, app + " has no app asset promise"));
        return state.appAsset;
      });
}

bool LocalCoordinator::setAppAssetPromise(const std::shared_ptr<platform::RVPromisedTransferToPath>& promise,
                                          ErrorRef* error) {
  return _boundary.call({{className, "setAppAssetPromise"}, app}, error, {{"promise", promise}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalTransferPromise>(promise);
    if (!ours) return fail(error, notOurs(app, "app asset promise"));
    return _engine.attachAppAsset(*this, ours->record, ours, error);
  });
}

bool LocalCoordinator::setPlaceholderPromise(const std::shared_ptr<platform::RVPlaceholder>& placeholder,
                                             ErrorRef* error) {
  return _boundary.call({{className, "setPlaceholderPromise"}, app}, error, {{"placeholder", placeholder}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalPlaceholder>(placeholder);
    if (!ours) return fail(error, notOurs(app, "placeholder"));
    return ours->attachTo(*this, error);
  });
}

bool LocalCoordinator::setUserDataPromise(const std::shared_ptr<platform::RVPromisedOutOfBandTransfer>& promise,
                                          ErrorRef* error) {
  return _boundary.call({{className, "setUserDataPromise"}, app}, error, {{"promise", promise}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalOutOfBandPromise>(promise);
    if (!ours) return fail(error, notOurs(app, "user-data promise"));
    auto attach = [&](CoordinatorRecord& record) {
      if (record.userData)
        return fail(error, coordinationError(CoordinationError::alreadySet, app + " already has a user-data promise"));
      record.userData = ours->record;
      return true;
    };
    return _engine.change(*this, attach, error);
  });
}

bool LocalCoordinator::setInitialZDRAssetPromises(const std::vector<std::shared_ptr<platform::RVPromise>>& promises,
                                                  ErrorRef* error) {
  return _boundary.call({{className, "setInitialZDRAssetPromises"}, app}, error, {{"count", promises.size()}}, [&] {
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
  return _boundary.call({{className, "setInstallOptions"}, app}, error, {{"options", options}}, [&] {
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
  return _boundary.call({{className, "appAssetPromiseResponsibleClientWithError"}, app}, error, {}, [&] {
    platform::setError(error, nullptr);
    Lock lock(_engine.records());
    return state.record.responsibleClient;
  });
}

bool LocalCoordinator::setAppAssetPromiseResponsibleClient(platform::RVClientIdentifier client, ErrorRef* error) {
  return _boundary.call({{className, "setAppAssetPromiseResponsibleClient"}, app}, error, {{"client", client}}, [&] {
    auto name = [&](CoordinatorRecord& record) {
      record.responsibleClient = client;
      return true;
    };
    return _engine.change(*this, name, error);
  });
}

bool LocalCoordinator::cancelForReason(const ErrorRef& reason, platform::RVClientIdentifier client, ErrorRef* error) {
  return _boundary.call({{className, "cancelForReason"}, app}, error, {{"reason", reason}, {"client", client}},
                        [&] { return _engine.cancel(*this, reason, client, error); });
}

std::string LocalCoordinator::describe() const {
  return std::string("<") + nameOfKind(kind) + ' ' + app + " client " + std::to_string(creator) + '>';
}

}  // namespace device
