#include "restore/CoordinatedRestore.h"

#include "coordination/CancellationReason.h"
#include "coordination/TransactionStep.h"
#include "core/Say.h"
#include "platform/PropertyListSerialization.h"
#include "restore/DemotionStatus.h"

namespace appsync {

using namespace platform;

constexpr std::string_view demotedDescription = "Restore demoted app";
constexpr std::string_view plainDescription = "Restore app";

bool AppsClient::prepareAppForRestoreUsingCoordination(const RestoreInput& input, std::uint64_t demotionStatus) {
  return demotionStatus != notDemoted ? _prepareDemotedAppForRestoreWithBundleId(input, demotionStatus)
                                      : _prepareNonDemotedAppForRestoreWithBundleId(input);
}

bool AppsClient::_prepareDemotedAppForRestoreWithBundleId(const RestoreInput& input, std::uint64_t demotionStatus) {
  return CoordinatedRestore(*this, input, demotionStatus).restoreDemotedApp();
}

bool AppsClient::_prepareNonDemotedAppForRestoreWithBundleId(const RestoreInput& input) {
  return CoordinatedRestore(*this, input, notDemoted).restoreApp();
}

AppsClient::CoordinatedRestore::CoordinatedRestore(AppsClient& client, const RestoreInput& input,
                                                   std::uint64_t demotionStatus)
    : _client(client),
      _platform(client._platform),
      _input(input),
      _demotionStatus(demotionStatus),
      _bundleIdentifier(input.bundleIdentifier) {}

bool AppsClient::CoordinatedRestore::restoreDemotedApp() {
  say(_platform, "processing app restore for demoted bundle '%{public}@' with install coordination", _bundleIdentifier);
  beginStep(_platform.transactionLog, TransactionStep::restore, _bundleIdentifier, demotedDescription);
  bool prepared = acquire(RVCoordinatorKind::RVRestoringDemotedAppInstallCoordinator);
  if (prepared) {
    _coordinator->setObserver(_client.weak_from_this());
    prepared = addUserDataPromise() && addPlaceholderPromise();
  }
  say(_platform, "processing app restore for demoted app %{public}@ finished with status %d error %{public}@",
      _bundleIdentifier, prepared, _error);
  endStep(_platform.transactionLog, TransactionStep::restore, prepared, _bundleIdentifier, demotedDescription);
  if (!prepared) cancel();
  return prepared;
}

bool AppsClient::CoordinatedRestore::restoreApp() {
  say(_platform, "processing app restore for non demoted bundle '%{public}@' with install coordination",
      _bundleIdentifier);
  beginStep(_platform.transactionLog, TransactionStep::restore, _bundleIdentifier, plainDescription);
  bool prepared = acquire(RVCoordinatorKind::RVRestoringAppInstallCoordinator);
  if (prepared && storeDeliversPackage()) {
    endStep(_platform.transactionLog, TransactionStep::restore, true, _bundleIdentifier, plainDescription);
    return true;
  }
  if (prepared) {
    _coordinator->setObserver(_client.weak_from_this());
    prepared = addUserDataPromise() && addPlaceholderPromise() && leavePackageToStore();
  }
  say(_platform, "processing app restore for %{public}@ finished with status %d error %{public}@", _bundleIdentifier,
      prepared, _error);
  endStep(_platform.transactionLog, TransactionStep::restore, prepared, _bundleIdentifier, plainDescription);
  if (!prepared) cancel();
  return prepared;
}

bool AppsClient::CoordinatedRestore::acquire(RVCoordinatorKind kind) {
  ErrorRef error;
  _metadata = _platform.propertyLists.propertyListWithData(Bytes(_input.harluneMetadata), &error);
  if (!_metadata.dictionary()) {
    _error = error;
    sayError(_platform, "failed to parse harlune metadata for '%{public}@'. err=%{public}@", _bundleIdentifier, _error);
    return false;
  }
  _coordinator = _platform.installCoordination.coordinatorForAppWithBundleID(kind, _bundleIdentifier, RVClientSync,
                                                                             true, nullptr, &error);
  if (!_coordinator) {
    _error = error;
    sayError(_platform, "Error %{public}@ creating restore coordinator for %{public}@", error, _bundleIdentifier);
  }
  return _coordinator != nullptr;
}

/// An earlier run of this restore handed the app over already.
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
  ErrorRef error;
  if (!_coordinator->setUserDataPromise(promise, &error)) {
    _error = error;
    sayError(_platform, "Error %{public}@ adding out of band data promise for '%{public}@'", error, _bundleIdentifier);
    return false;
  }
  say(_platform, "Added out of band user data promise for for %{public}@", _bundleIdentifier);
  return true;
}

bool AppsClient::CoordinatedRestore::addPlaceholderPromise() {
  if (_coordinator->hasPlaceholderPromise()) {
    say(_platform, "Coordinator for %{public}@ has a valid placeholder promise", _bundleIdentifier);
    return true;
  }
  _unattachedPlaceholder =
      _client._placeHolderForBundleIdentifierWithHarluneMetadata(_input, _metadata, _demotionStatus);
  if (!_unattachedPlaceholder) return false;
  ErrorRef error;
  if (!_coordinator->setPlaceholderPromise(_unattachedPlaceholder, &error)) {
    _error = error;
    sayError(_platform, "Error %{public}@ setting placeholder promise for '%{public}@'", error, _bundleIdentifier);
    return false;
  }
  _unattachedPlaceholder = nullptr;
  _client.shiftwellSetPlaceHolderPromiseForRestoreAppBundle(_bundleIdentifier);
  say(_platform, "added placeholder promise for %{public}@", _bundleIdentifier);
  return true;
}

bool AppsClient::CoordinatedRestore::leavePackageToStore() {
  ErrorRef error;
  if (!_coordinator->setAppAssetPromiseResponsibleClient(RVClientMercato, &error)) {
    _error = error;
    sayError(_platform, "Error %{public}@ setting RVClientMercato to satisfy app data promise for '%{public}@'", error,
             _bundleIdentifier);
    return false;
  }
  say(_platform, "set RVClientMercato to satisfy app asset promise for %{public}@", _bundleIdentifier);
  return true;
}

void AppsClient::CoordinatedRestore::cancel() {
  const ErrorRef reason = cancellationReason(CancellationCode::restorePreparationFailed);
  if (_coordinator) {
    say(_platform, "Cancelling coordinator for appBundleIdentifier:%{public}@", _bundleIdentifier);
    _coordinator->cancelForReason(reason, RVClientSync);
  }
  if (_unattachedPlaceholder) {
    say(_platform, "Cancelling placeholder for appBundleIdentifier:%{public}@", _bundleIdentifier);
    _unattachedPlaceholder->cancelForReason(reason, RVClientSync);
  }
  _client.shiftwellCancelledCoordinatorForRestoreAppBundle(_bundleIdentifier);
}

}  // namespace appsync
