#include "core/AppsClient.h"
#include "core/CancellationReason.h"
#include "core/PathCheck.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/DevicePaths.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/TodoOperation.h"

namespace appsync {

using namespace platform;

void AppsClient::assetTransferUpdatedProgress(const TSAssetRef& asset, double progress) try {
  const std::string& identifier = asset->identifier();
  say(_platform, "finished transferring %lf for %{public}@", progress, identifier);
  bool existingApp = false;
  {
    SerialQueue::Block block(_accessQueue, _platform.clock);
    existingApp = _updatingApps.contains(identifier);
  }
  updateTransferProgressForApp(asset, existingApp);
  Mutex::Lock lock(_transferStateGuard);
  _outstandingDuctoTransfers.insert(identifier);
} catch (...) {
  swallowException(_platform, "assetTransferUpdatedProgress");
}

void AppsClient::assetTransferSucceeded(const TSAssetRef& asset, bool succeeded, const ErrorRef& error) try {
  const std::string& identifier = asset->identifier();
  bool existingApp = false;
  bool userCancelled = false;
  {
    SerialQueue::Block block(_accessQueue, _platform.clock);
    existingApp = _updatingApps.erase(identifier);
    userCancelled = _userCancelledApps.erase(identifier);
  }
  {
    Mutex::Lock lock(_transferStateGuard);
    _outstandingDuctoTransfers.erase(identifier);
  }
  say(_platform, "transfer for asset %{public}@ ended with success %c error %{public}@ existingApp:%d", asset,
      yesOrNo(succeeded), error, existingApp);
  if (succeeded) {
    _transferArrived(asset, existingApp);
  } else {
    _transferFailed(asset, error, existingApp, userCancelled);
  }
} catch (...) {
  swallowException(_platform, "assetTransferSucceeded");
}

void AppsClient::_transferArrived(const TSAssetRef& asset, bool existingApp) {
  const std::string& identifier = asset->identifier();
  say(_platform, "asset transfer succeeded for %{public}@", identifier);
  if (!asset->path()) {
    const auto version = stringOf(entryOf(asset->variantOptions(), "Version"));
    asset->setPath(stringOf(_restoreStatePropertyForKey("path", identifier, version)));
  } else if (!asset->path()->starts_with('/')) {
    asset->setPath(joinedPath(publicStagingDirectory, *asset->path()));
  }
  if (!isSafePathComponent(asset->path())) {
    say(_platform, "Ignoring invalid path: %{public}@", asset->path());
    return;
  }
  if (!asset->isDownload()) {
    changeAssetID(identifier, todo::sent);
    return;
  }
  say(_platform, "Received file at %{public}@", asset->path());
  changeAssetID(identifier, todo::downloaded);
  if (!asset->isRestore()) {
    say(_platform, "Installing synced asset %{public}@", asset);
    transferCompleteForApp(asset, nullptr, existingApp);
  } else if (asset->completedAssetParts() == kTSAssetPartApplicationData) {
    say(_platform, "Not processing kTSAssetPartApplicationData for restore asset %{public}@ as coordination is enabled",
        asset);
  } else {
    say(_platform, "Not processing restore asset %{public}@ as coordination is enabled", asset);
  }
}

void AppsClient::_transferFailed(const TSAssetRef& asset, const ErrorRef& error, bool existingApp, bool userCancelled) {
  const std::string& identifier = asset->identifier();
  const bool recoverable = _isRecoverableError(error);
  say(_platform, "failed to transfer asset %{public}@. err=%{public}@, recoverable=%d", identifier, error, recoverable);
  if (!_platform.workspace.applicationIsInstalled(identifier)) return;
  if (asset->isRestore()) return;
  say(_platform, "Uninstalling placeholder %{public}@", identifier);
  if (userCancelled) return;
  // A failure without a reason is a failure all the same: without an error the promise would be fulfilled.
  transferCompleteForApp(asset, error ? error : cancellationReason(CancellationCode::packageUnavailable), existingApp);
}

}  // namespace appsync
