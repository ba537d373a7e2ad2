#include "restore/CoordinatedRestore.h"

#include "core/CancellationReason.h"
#include "core/TransactionStep.h"
#include "platform/InstallCoordination.h"
#include "platform/PropertyListSerialization.h"
#include "restore/DemotionStatus.h"

namespace appsync {

using namespace platform;

bool AppsClient::prepareAppForRestoreUsingCoordination(const RestoreInput& input, std::uint64_t demotionStatus) {
  return demotionStatus != notDemoted ? _prepareDemotedAppForRestoreWithBundleId(input, demotionStatus)
                                      : _prepareNonDemotedAppForRestoreWithBundleId(input);
}

bool AppsClient::_prepareDemotedAppForRestoreWithBundleId(const RestoreInput& input, std::uint64_t demotionStatus) {
  return contained(_platform, "prepareAppForRestoreUsingCoordination",
                   [&] { return CoordinatedRestore(*this, input, demotionStatus).run(); });
}

bool AppsClient::_prepareNonDemotedAppForRestoreWithBundleId(const RestoreInput& input) {
  return contained(_platform, "prepareAppForRestoreUsingCoordination",
                   [&] { return CoordinatedRestore(*this, input, notDemoted).run(); });
}

AppsClient::CoordinatedRestore::CoordinatedRestore(AppsClient& client, const RestoreInput& input,
                                                   std::uint64_t demotionStatus)
    : _client(client),
      _platform(client._platform),
      _input(input),
      _demotionStatus(demotionStatus),
      _demoted(demotionStatus != notDemoted),
      _bundleIdentifier(input.bundleIdentifier),
      _cancellationReason(cancellationReason(CancellationCode::restorePreparationFailed)) {}

bool AppsClient::CoordinatedRestore::run() {
  const std::string_view description = _demoted ? "Restore demoted app" : "Restore app";
  sayBeginning();
  StepScope transaction(_platform, TransactionStep::restore, _bundleIdentifier, description, description);
  const bool prepared = contained(_platform, "prepareAppForRestoreUsingCoordination", [this] { return prepare(); });
  if (!_isStores) sayEnd(prepared);
  transaction.end(prepared);
  if (!prepared) cancel();
  return prepared;
}

void AppsClient::CoordinatedRestore::sayBeginning() const {
  if (_demoted) {
    say(_platform, "processing app restore for demoted bundle '%{public}@' with install coordination",
        _bundleIdentifier);
  } else {
    say(_platform, "processing app restore for non demoted bundle '%{public}@' with install coordination",
        _bundleIdentifier);
  }
}

void AppsClient::CoordinatedRestore::sayEnd(bool prepared) const {
  if (_demoted) {
    say(_platform, "processing app restore for demoted app %{public}@ finished with status %d error %{public}@",
        _bundleIdentifier, prepared, _error);
  } else {
    say(_platform, "processing app restore for %{public}@ finished with status %d error %{public}@", _bundleIdentifier,
        prepared, _error);
  }
}

bool AppsClient::CoordinatedRestore::prepare() {
  if (!acquire()) return false;
  if (!_demoted && storeDeliversPackage()) return _isStores = true;
  _coordinator->setObserver(_client.weak_from_this());
  return addUserDataPromise() && addPlaceholderPromise() && (_demoted || leavePackageToStore());
}

bool AppsClient::CoordinatedRestore::acquire() {
  ErrorRef error;
  _metadata = _platform.propertyLists.propertyListWithData(Bytes(_input.harluneMetadata), &error);
  if (!_metadata.dictionary()) {
    _error = error;
    sayError(_platform, "failed to parse harlune metadata for '%{public}@'. err=%{public}@", _bundleIdentifier, _error);
    return false;
  }
  const auto kind = _demoted ? RVCoordinatorKind::RVRestoringDemotedAppInstallCoordinator
                             : RVCoordinatorKind::RVRestoringAppInstallCoordinator;
  _coordinator = _platform.installCoordination.coordinatorForAppWithBundleID(kind, _bundleIdentifier, RVClientSync,
                                                                             true, nullptr, &error);
  if (!_coordinator) {
    _error = error;
    sayError(_platform, "Error %{public}@ creating restore coordinator for %{public}@", error, _bundleIdentifier);
  }
  return _coordinator != nullptr;
}

bool AppsClient::CoordinatedRestore::storeDeliversPackage() {
  const RVClientIdentifier client = _coordinator->appAssetPromiseResponsibleClientWithError();
  if (client != RVClientMercato) return false;
  say(_platform, "App asset DRI for %{public}@ is set to %lu - nothing more for tsd to do", _bundleIdentifier, client);
  return true;
}

bool AppsClient::CoordinatedRestore::addUserDataPromise() {
  if (_coordinator->hasUserDataPromise()) {
    say(_platform, "Coordinator for %{public}@ has a valid user data promise", _bundleIdentifier);
    return true;
  }
  auto promise = _client._userDataPromiseForBundleIdentifier(_bundleIdentifier);
  if (!promise) return true;
  return step([&](ErrorRef* error) { return _coordinator->setUserDataPromise(promise, error); },
              "Error %{public}@ adding out of band data promise for '%{public}@'",
              "Added out of band user data promise for for %{public}@");
}

bool AppsClient::CoordinatedRestore::addPlaceholderPromise() {
  if (_coordinator->hasPlaceholderPromise()) {
    say(_platform, "Coordinator for %{public}@ has a valid placeholder promise", _bundleIdentifier);
    return true;
  }
  _unattachedPlaceholder =
      _client._placeHolderForBundleIdentifierWithHarluneMetadata(_input, _metadata, _demotionStatus);
  if (!_unattachedPlaceholder) return false;
  return step(
      [this](ErrorRef* error) {
        if (!_coordinator->setPlaceholderPromise(_unattachedPlaceholder, error)) return false;
        _unattachedPlaceholder = nullptr;
        _client.shiftwellSetPlaceHolderPromiseForRestoreAppBundle(_bundleIdentifier);
        return true;
      },
      "Error %{public}@ setting placeholder promise for '%{public}@'", "added placeholder promise for %{public}@");
}

bool AppsClient::CoordinatedRestore::leavePackageToStore() {
  return step(
      [this](ErrorRef* error) { return _coordinator->setAppAssetPromiseResponsibleClient(RVClientMercato, error); },
      "Error %{public}@ setting RVClientMercato to satisfy app data promise for '%{public}@'",
      "set RVClientMercato to satisfy app asset promise for %{public}@");
}

void AppsClient::CoordinatedRestore::cancel() {
  if (_coordinator) {
    say(_platform, "Cancelling coordinator for appBundleIdentifier:%{public}@", _bundleIdentifier);
    contained(_platform, "cancelForReason",
              [this] { _coordinator->cancelForReason(_cancellationReason, RVClientSync); });
  }
  if (_unattachedPlaceholder) {
    say(_platform, "Cancelling placeholder for appBundleIdentifier:%{public}@", _bundleIdentifier);
    contained(_platform, "cancelForReason",
              [this] { _unattachedPlaceholder->cancelForReason(_cancellationReason, RVClientSync); });
  }
  _client.shiftwellCancelledCoordinatorForRestoreAppBundle(_bundleIdentifier);
}

}  // namespace appsync
