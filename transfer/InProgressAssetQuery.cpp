#include "transfer/InProgressAssetQuery.h"

#include "core/Paths.h"
#include "core/Say.h"
#include "transfer/InstallNames.h"

namespace appsync {

using namespace platform;

namespace {
constexpr std::uint64_t typeStoreDownload = 1;
constexpr std::uint64_t stateActive = 1;
constexpr std::uint64_t phaseLoading = 0;
constexpr std::uint64_t phaseInstalling = 1;
}  // namespace

void InProgressAssetQuery::currentInProgressAssetIDs(const Platform& platform, std::optional<Identifiers>& inProgress,
                                                     std::optional<Identifiers>& restoringAssetIDs) {
  inProgress.reset();
  restoringAssetIDs.reset();
  auto query = std::make_shared<InProgressAssetQuery>(platform);
  platform.workspace.addObserver(query);
  if (query->_fetchResults()) {
    inProgress = query->inProgressAssetIDs();
    restoringAssetIDs = query->restoringAssetIDs();
  }
  platform.workspace.removeObserver(query.get());
}

bool InProgressAssetQuery::_fetchResults() {
  say(_platform, "Waiting for -applicationInstallsArePrioritized:arePaused: to complete...");
  if (!_waitForInitialObservationData.wait(_platform.clock, _platform.clock.now() + timeout)) {
    sayError(_platform, "Query for in progress assets timed out");
    return false;
  }
  say(_platform, "Wait completed");
  return true;
}

void InProgressAssetQuery::applicationInstallsArePrioritized(const std::vector<OBApplicationProxyRef>& prioritized,
                                                             const std::vector<OBApplicationProxyRef>& arePaused) try {
  say(_platform, LogCategory::summary, "prioritized proxies %{public}@ paused proxies %{public}@", prioritized,
      arePaused);
  if (_inProgressAssetIDs) return;
  _inProgressAssetIDs.emplace();
  _restoringAssetIDs.emplace();
  if (prioritized.empty()) say(_platform, "No assets currently in progress.");
  for (const auto& proxy : prioritized) _sort(*proxy);
  say(_platform, "signaling semaphore");
  _waitForInitialObservationData.signal();
} catch (...) {
  swallowException(_platform, "applicationInstallsArePrioritized");
}

void InProgressAssetQuery::_sort(const OBApplicationProxy& proxy) {
  const auto& identifier = proxy.applicationIdentifier;
  if (!proxy.isPlaceholder) {
    say(_platform, "No placeholder for asset identifier %{public}@", identifier);
    return;
  }
  if (!proxy.installProgressSync) {
    say(_platform, "No install progress found for asset identifier %{public}@", identifier);
    return;
  }
  const std::uint64_t type = proxy.installType;
  const std::uint64_t state = proxy.installProgressSync->installState;
  const std::uint64_t phase = proxy.installProgressSync->installPhase;
  say(_platform, "Got install type=%{public}@ state=%{public}@ phase=%{public}@ for %{public}@",
      nameOfInstallType(type), nameOfInstallState(state), nameOfInstallPhase(phase), identifier);
  if (state != stateActive || !identifier) return;
  if ((type != installType::restore && phase == phaseInstalling) ||
      (type == typeStoreDownload && phase == phaseLoading)) {
    _inProgressAssetIDs->push_back(*identifier);
  } else if (type == installType::restore && (phase == phaseLoading || phase == phaseInstalling)) {
    _restoringAssetIDs->push_back(*identifier);
  }
}

}  // namespace appsync
