#include "core/AppsClient.h"
#include "core/CancellationReason.h"
#include "core/Say.h"
#include "core/TransactionStep.h"

namespace appsync {

using namespace platform;

static std::string promiseName(std::string_view bundleIdentifier, std::string_view suffix) {
  return std::string(bundleIdentifier).append(suffix);
}

static void fulfil(RVPromise& promise) {
  promise.setPercentComplete(1.0);
  promise.setComplete(true);
}

TransferPromiseRef AppsClient::_createAppAssetPromiseForBundleIdentifier(
    std::string_view bundleIdentifier, const std::optional<std::string>& atPath,
    const CoordinatorRef& andAddToCoordinatinator) {
  if (!andAddToCoordinatinator) return nullptr;
  const std::string name = promiseName(bundleIdentifier, "-Asset");
  auto& service = _platform.installCoordination;
  auto promise = atPath ? service.makePromisedTransferToPath(name, RVClientSync, *atPath, 0)
                        : service.makePromisedTransferToPathWithoutPath(name, RVClientSync, 0);
  if (!promise) {
    sayError(_platform, "Error creating asset promise for '%{public}@'", bundleIdentifier);
    return nullptr;
  }
  ErrorRef error;
  if (andAddToCoordinatinator->setAppAssetPromise(promise, &error)) {
    say(_platform, "Added app asset promise to coordinator for '%{public}@'", bundleIdentifier);
    return promise;
  }
  sayError(_platform, "Error %{public}@ adding app asset promise at %{public}@ to '%{public}@'", error, atPath,
           bundleIdentifier);
  sayError(_platform, "Cancelling asset promise for '%{public}@'", bundleIdentifier);
  promise->cancelForReason(cancellationReason(CancellationCode::packageUnavailable), RVClientSync);
  return nullptr;
}

TransferPromiseRef AppsClient::_createIconPromiseForBundleIdentifier(std::string_view bundleIdentifier,
                                                                     std::string_view transferPath,
                                                                     std::uint64_t diskSpaceNeeded,
                                                                     const PlaceholderRef& andAddToPlaceHolder,
                                                                     bool forAppInstall) {
  if (!andAddToPlaceHolder) {
    sayError(_platform, "Placeholder to add icon promise is nil for '%{public}@'", bundleIdentifier);
    return nullptr;
  }
  auto promise = _platform.installCoordination.makePromisedTransferToPath(promiseName(bundleIdentifier, "-Icon"),
                                                                          RVClientSync, transferPath, diskSpaceNeeded);
  if (!promise) return nullptr;
  fulfil(*promise);  // the file is in place already
  ErrorRef error;
  if (andAddToPlaceHolder->setIconPromise(promise, &error)) {
    say(_platform, "Added icon promise to placeholder for '%{public}@'", bundleIdentifier);
    return promise;
  }
  sayError(_platform, "Error %{public}@ adding icon promise to placeholder for '%{public}@'", error, bundleIdentifier);
  const auto code = forAppInstall ? CancellationCode::packageUnavailable : CancellationCode::restorePreparationFailed;
  promise->cancelForReason(cancellationReason(code), RVClientSync);
  return nullptr;
}

std::shared_ptr<RVPromisedOutOfBandTransfer> AppsClient::_userDataPromiseForBundleIdentifier(
    std::string_view bundleIdentifier) {
  auto promise = _platform.installCoordination.makePromisedOutOfBandTransfer(promiseName(bundleIdentifier, "-UserData"),
                                                                             RVClientSync, 0);
  if (promise) fulfil(*promise);
  return promise;
}

PlaceholderRef AppsClient::_placeHolderForBundleIdentifier(std::string_view bundleIdentifier, std::string_view name,
                                                           std::uint64_t installType) {
  StepScope transaction(_platform, TransactionStep::createPlaceholder, bundleIdentifier, "Create placeholder",
                        "Finished creating placeholder");
  auto placeholder =
      _platform.installCoordination.makeAppPlaceholder(name, bundleIdentifier, installType, RVClientSync);
  transaction.end(placeholder != nullptr);
  say(_platform, "Created placeholder %{public}@ for '%{public}@' of type %lu", placeholder, bundleIdentifier,
      installType);
  return placeholder;
}

}  // namespace appsync
