#include "core/AppsClient.h"
#include "core/Say.h"
#include "platform/InstallTransactionLog.h"
#include "platform/TodoOperation.h"

namespace appsync {

using namespace platform;

bool AppsClient::_isRecoverableError(const ErrorRef& error) {
  say(_platform, "Ravelle is enabled - treating error %{public}@ as non recoverable", error);
  return false;
}

void AppsClient::assetInstallSucceeded(const TSAssetRef& asset) try {
  say(_platform, "%{public}@ install succeeded", asset->identifier());
  changeAssetID(asset->identifier(), todo::installed);
  cleanRestoreStateForIdentifier(asset->identifier());
} catch (...) {
  swallowException(_platform, "assetInstallSucceeded");
}

void AppsClient::assetInstallFailed(const TSAssetRef& asset, const ErrorRef& error) try {
  const std::string& identifier = asset->identifier();
  const bool recoverable = _isRecoverableError(error);
  if (recoverable || asset->isRestore()) {
    say(_platform, "%{public}@ install failed but was recoverable: %{public}@", identifier, error);
    _platform.transactionLog.logScenario("Orrin restore", 0, false, identifier, "install failed recoverably");
  } else {
    say(_platform, "%{public}@ install failed unrecoverably: %{public}@", identifier, error);
    changeAssetID(identifier, todo::failed);
    uninstallAppUsingCoordination(identifier);
  }
  cleanRestoreStateForIdentifier(identifier);
} catch (...) {
  swallowException(_platform, "assetInstallFailed");
}

}  // namespace appsync
