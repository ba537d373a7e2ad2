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
        self->_uninstallEnded(identifier, error);
      });
}

void AppsClient::_uninstallEnded(std::string_view bundleIdentifier, const ErrorRef& error) try {
  say(_platform, "Uninstall of %{public}@ with install coordinator succeeded wiht error %{public}@.", bundleIdentifier,
      error);
  endStep(_platform.transactionLog, TransactionStep::uninstall, !error, bundleIdentifier, "Uninstall app");
} catch (...) {
  swallowException(_platform, "uninstallAppUsingCoordination");
}

}  // namespace appsync
