#include <chrono>

#include "core/AppsClient.h"
#include "core/Say.h"

namespace appsync {

using namespace platform;

constexpr std::int64_t secondsPerPlaceholder = 5;

bool AppsClient::_stopAwaitingPlaceholder(std::string_view bundleIdentifier) {
  if (!_placeholdersForRestoringApps.erase(bundleIdentifier)) return false;
  _restorePlaceHoldersWaitGroup.leave();
  --_restoringPlaceholderCount;
  return true;
}

void AppsClient::shiftwellSetPlaceHolderPromiseForRestoreAppBundle(std::string_view bundleIdentifier) {
  SerialQueue::Block block(_restoreQueue, _platform.clock);
  if (!_placeholdersForRestoringApps.insert(bundleIdentifier)) return;
  _restorePlaceHoldersWaitGroup.enter();
  ++_restoringPlaceholderCount;
  say(_platform, "Shiftwell will wait for RC to install placeholder for %{public}@, _restoringPlaceholderCount %lld",
      bundleIdentifier, _restoringPlaceholderCount.load());
}

void AppsClient::shiftwellCancelledCoordinatorForRestoreAppBundle(std::string_view bundleIdentifier) {
  SerialQueue::Block block(_restoreQueue, _platform.clock);
  if (!_stopAwaitingPlaceholder(bundleIdentifier)) return;
  say(_platform, "Shiftwell cancelled coordinator for restoring app bundle %{public}@ _restoringPlaceholderCount %lld",
      bundleIdentifier, _restoringPlaceholderCount.load());
}

void AppsClient::rcDidInstallPlaceHolderForAppBundle(std::optional<std::string_view> bundleIdentifier) {
  SerialQueue::Block block(_restoreQueue, _platform.clock);
  if (_finishedWaitingForPlaceHolderInstalls) return;
  if (bundleIdentifier && _stopAwaitingPlaceholder(*bundleIdentifier)) {
    say(_platform, "RC finished installing placeholder for %{public}@, _restoringPlaceholderCount %lld",
        bundleIdentifier, _restoringPlaceholderCount.load());
  } else {
    sayError(_platform, "Ignoring notification from RC about installing placeholder for %{public}@", bundleIdentifier);
  }
}

void AppsClient::_waitForPlaceholderInstalls() {
  contained(_platform, "_waitForPlaceholderInstalls", [this] {
    const std::int64_t seconds = _restoringPlaceholderCount.load() * secondsPerPlaceholder;
    const auto deadline = _platform.clock.now() + std::chrono::seconds(seconds);
    say(_platform, "Will wait for %lld seconds for %lld placeholders to install", seconds,
        _restoringPlaceholderCount.load());
    // Outside the queue, on which the reports run that it waits for.
    _restorePlaceHoldersWaitGroup.wait(_platform.clock, deadline);
  });
  SerialQueue::Block block(_restoreQueue, _platform.clock);
  say(_platform, "Finished waiting for placeholder installs");
  _finishedWaitingForPlaceHolderInstalls = true;
}

}  // namespace appsync
