#include "core/AppsClient.h"
#include "core/Say.h"
#include "platform/DeviceNames.h"
#include "platform/TSDeviceService.h"
#include "platform/TodoOperation.h"

namespace appsync {

using namespace platform;

static TSAssetRef assetOf(std::string_view bundleIdentifier) {
  return TSAsset::downloadAssetWithIdentifier(bundleIdentifier, dataclassApplication, std::nullopt);
}

void AppsClient::promiseDidBeginFulfillmentWithIdentifier(std::uint64_t identifier) try {
  say(_platform, "promiseDidBeginFulfillmentWithIdentifier %lu", identifier);
} catch (...) {
  swallowException(_platform, "promiseDidBeginFulfillmentWithIdentifier");
}

void AppsClient::coordinatorDidInstallPlaceholder(const CoordinatorRef& coordinator) try {
  const auto bundleIdentifier = coordinator->bundleID();
  say(_platform, "coordinatorDidInstallPlaceholder for %{public}@ with error %{public}@", bundleIdentifier,
      coordinator->error());
  rcDidInstallPlaceHolderForAppBundle(bundleIdentifier);
} catch (...) {
  swallowException(_platform, "coordinatorDidInstallPlaceholder");
}

void AppsClient::coordinatorDidCompleteSuccessfully(const CoordinatorRef& coordinator) try {
  const auto bundleIdentifier = coordinator->bundleID();
  const ErrorRef error = coordinator->error();
  say(_platform, "coordinatorDidCompleteSuccessfully for %{public}@ with error %{public}@", bundleIdentifier, error);
  changeAssetID(bundleIdentifier, error ? todo::failed : todo::installed);
  cleanRestoreStateForIdentifier(bundleIdentifier);
} catch (...) {
  swallowException(_platform, "coordinatorDidCompleteSuccessfully");
}

void AppsClient::coordinatorShouldPrioritize(const CoordinatorRef& coordinator) try {
  const auto bundleIdentifier = coordinator->bundleID();
  if (!bundleIdentifier) return;
  say(_platform, "Prioritize %{public}@", *bundleIdentifier);
  if (!_platform.deviceService.respondsToPrioritizeAsset()) {
    sayError(_platform, "Cannot prioritize %{public}@ as it's not supported", *bundleIdentifier);
    return;
  }
  _platform.deviceService.prioritizeAsset(
      assetOf(*bundleIdentifier), [self = shared_from_this(), identifier = *bundleIdentifier](const ErrorRef& error) {
        self->_prioritizeEnded(identifier, error);
      });
} catch (...) {
  swallowException(_platform, "coordinatorShouldPrioritize");
}

void AppsClient::_prioritizeEnded(std::string_view bundleIdentifier, const ErrorRef& error) try {
  say(_platform, "Prioritize %{public}@ finished with error %{public}@", bundleIdentifier, error);
} catch (...) {
  swallowException(_platform, "coordinatorShouldPrioritize");
}

void AppsClient::coordinatorCanceledWithReason(const CoordinatorRef& coordinator, const ErrorRef&,
                                               RVClientIdentifier) try {
  const auto bundleIdentifier = coordinator->bundleID();
  if (!bundleIdentifier) return;
  bool alreadyCancelled = false;
  contained(_platform, "coordinatorCanceledWithReason", [&] {
    SerialQueue::Block block(_accessQueue, _platform.clock);
    alreadyCancelled = !_userCancelledApps.insert(*bundleIdentifier);
  });
  {
    SerialQueue::Block block(_restoreQueue, _platform.clock);
    if (_stopAwaitingPlaceholder(*bundleIdentifier)) {
      say(_platform, "RC cancelled coordinator for restoring app bundle %{public}@ _restoringPlaceholderCount %lld",
          *bundleIdentifier, _restoringPlaceholderCount.load());
    }
  }
  if (!alreadyCancelled && _platform.deviceService.respondsToCancelAssetTransferForFailedAsset()) {
    say(_platform, "Cancelling asset sync for %{public}@", *bundleIdentifier);
    _platform.deviceService.cancelAssetTransferForFailedAsset(assetOf(*bundleIdentifier));
  } else {
    sayError(_platform, "Cannot cancel %{public}@ as it's already cancelled %d OR the call is not supported",
             *bundleIdentifier, alreadyCancelled);
  }
} catch (...) {
  swallowException(_platform, "coordinatorCanceledWithReason");
}

void AppsClient::applicationInstallsDidCancel(const std::vector<OBApplicationProxyRef>&) try {
  say(_platform, "not handling applicationInstallsDidCancel because install coordination is enabled.");
} catch (...) {
  swallowException(_platform, "applicationInstallsDidCancel");
}

}  // namespace appsync
