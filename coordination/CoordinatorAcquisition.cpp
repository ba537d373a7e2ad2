#include "core/AppsClient.h"
#include "core/Say.h"
#include "core/TransactionStep.h"

namespace appsync {

using namespace platform;

CoordinatorRef AppsClient::_initiatingOrUpdatingAppInstallCoordinatorForBundleIdentifier(
    std::string_view bundleIdentifier, bool existingApp, bool createIfNotExisting, ErrorRef* error) {
  StepScope transaction(_platform, TransactionStep::createCoordinator, bundleIdentifier, "Create coordinator",
                        "Finished creating coordinator");
  const auto kind = existingApp ? RVCoordinatorKind::RVUpdatingAppInstallCoordinator
                                : RVCoordinatorKind::RVInitiatingAppInstallCoordinator;
  const char* word = existingApp ? "updating" : "initiating";
  bool created = false;
  ErrorRef serviceError;
  auto coordinator = _platform.installCoordination.coordinatorForAppWithBundleID(
      kind, bundleIdentifier, RVClientSync, createIfNotExisting, &created, &serviceError);
  if (coordinator) {
    const RVClientIdentifier creator = coordinator->creatorIdentifier();
    if (creator == RVClientSync) {
      say(_platform,
          "Created %s coordinator %{public}@ (createIfNotExisting:%d, existingApp:%d) for %{public}@ with error "
          "%{public}@",
          word, coordinator, createIfNotExisting, existingApp, bundleIdentifier, serviceError);
    } else {
      say(_platform,
          "RC returned %s coordinator %{public}@ (createIfNotExisting:%d, existingApp:%d, creatorIdentifier=%lu) for "
          "%{public}@ with error %{public}@ - Will not perform install/update for this bundle",
          word, coordinator, createIfNotExisting, existingApp, creator, bundleIdentifier, serviceError);
      coordinator = nullptr;
    }
  }
  setError(error, serviceError);
  transaction.end(coordinator != nullptr);
  return coordinator;
}

}  // namespace appsync
