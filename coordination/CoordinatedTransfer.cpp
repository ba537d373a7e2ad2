#include "core/AppsClient.h"
#include "core/CancellationReason.h"
#include "core/Say.h"

namespace appsync {

using namespace platform;

bool AppsClient::updateTransferProgressForApp(const TSAssetRef& asset, bool existingApp) {
  const std::string& identifier = asset->identifier();
  auto coordinator = _initiatingOrUpdatingAppInstallCoordinatorForBundleIdentifier(identifier, existingApp, false);
  if (!coordinator || coordinator->error()) return false;
  TransferPromiseRef promise = coordinator->appAssetPromiseWithError();
  if (promise && promise->isComplete()) {
    say(_platform, "Asset promise is already satisfied for %{public}@", identifier);
    return false;
  }
  if (!promise) promise = _createAppAssetPromiseForBundleIdentifier(identifier, asset->path(), coordinator);
  const double downloadProgress = asset->downloadProgress();
  const double installProgress = asset->installProgress();
  say(_platform, "Updating download progress: %f install progress:%f for %{public}@", downloadProgress, installProgress,
      identifier);
  if (promise) promise->setPercentComplete(downloadProgress);
  return true;
}

void AppsClient::transferCompleteForApp(const TSAssetRef& asset, const ErrorRef& withError, bool isExistingApp) {
  const std::string& identifier = asset->identifier();
  auto coordinator = _initiatingOrUpdatingAppInstallCoordinatorForBundleIdentifier(identifier, isExistingApp, false);
  if (!coordinator || coordinator->error()) return;
  if (withError) {
    coordinator->cancelForReason(_platform.installCoordination.RVCreateUserPresentableError(1, 0, withError),
                                 RVClientSync);
    return;
  }
  TransferPromiseRef promise = coordinator->appAssetPromiseWithError();
  if (promise && promise->isComplete()) {
    say(_platform, "Asset promise is already satisfied for %{public}@", identifier);
    return;
  }
  if (!promise) {
    promise = _createAppAssetPromiseForBundleIdentifier(identifier, asset->path(), coordinator);
  } else if (asset->path()) {
    promise->setTransferPath(*asset->path());
  }
  say(_platform, "Satisfying asset promise for %{public}@", identifier);
  if (!promise) return;
  promise->setPercentComplete(1.0);
  promise->setComplete(true);
}

void AppsClient::assetSyncFinishedWithStatus(bool status, const StringSet& outstandingItems) {
  for (const auto& identifier : outstandingItems.members()) {
    contained(_platform, "assetSyncFinishedWithStatus", [&] {
      // Whoever made the coordinator: the package it waits for will not come.
      auto coordinator = _platform.installCoordination.coordinatorForAppWithBundleID(
          RVCoordinatorKind::RVAppInstallCoordinator, identifier, RVClientSync, false);
      if (!coordinator || status) return;
      const ErrorRef reason = cancellationReason(CancellationCode::packageUnavailable);
      say(_platform, "Cancelling coordinator with error %{public}@ for %{public}@", reason, identifier);
      coordinator->cancelForReason(reason, RVClientSync);
    });
  }
}

}  // namespace appsync
