#include "core/AppsClient.h"
#include "core/Say.h"
#include "core/TransactionStep.h"

namespace appsync {

using namespace platform;

constexpr std::string_view description = "Uninstall app";

void AppsClient::uninstallAppUsingCoordination(std::string_view bundleIdentifier) {
  beginStep(_platform, TransactionStep::uninstall, bundleIdentifier, description);
  const bool asked = contained(_platform, "uninstallAppUsingCoordination", [&] {
    _platform.installCoordination.uninstallAppWithBundleID(
        bundleIdentifier, false,
        [self = shared_from_this(), identifier = std::string(bundleIdentifier)](const ErrorRef& error) {
          self->_uninstallEnded(identifier, error);
        });
  });
  if (!asked) endStep(_platform, TransactionStep::uninstall, false, bundleIdentifier, description);
}

void AppsClient::_uninstallEnded(std::string_view bundleIdentifier, const ErrorRef& error) {
  say(_platform, "Uninstall of %{public}@ with install coordinator succeeded wiht error %{public}@.", bundleIdentifier,
      error);
  endStep(_platform, TransactionStep::uninstall, !error, bundleIdentifier, description);
}

}  // namespace appsync
