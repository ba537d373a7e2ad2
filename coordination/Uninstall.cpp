#include "coordination/TransactionStep.h"
#include "core/AppsClient.h"
#include "core/Say.h"

namespace appsync {

using namespace platform;

void AppsClient::uninstallAppUsingCoordination(std::string_view bundleIdentifier) {
  beginStep(_platform.transactionLog, TransactionStep::uninstall, bundleIdentifier, "Uninstall app");
  _platform.installCoordination.uninstallAppWithBundleID(
      bundleIdentifier, false,
      [self = shared_from_this(), identifier = std::string(bundleIdentifier)](const ErrorRef& error) {
        say(self->_platform, "Uninstall of %{public}@ with install coordinator succeeded wiht error %{public}@.",
            identifier, error);
        endStep(self->_platform.transactionLog, TransactionStep::uninstall, !error, identifier, "Uninstall app");
      });
}

}  // namespace appsync
