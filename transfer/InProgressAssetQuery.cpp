#include "transfer/InProgressAssetQuery.h"

#include "core/Say.h"
#include "platform/OBNumbers.h"
#include "transfer/InstallNames.h"

namespace appsync {

using namespace platform;

void InProgressAssetQuery::currentInProgressAssetIDs(const Platform& platform, std::optional<Identifiers>& inProgress,
                                                     std::optional<Identifiers>& restoringAssetIDs) {
  inProgress.reset();
  restoringAssetIDs.reset();
  auto query = std::make_shared<InProgressAssetQuery>(platform);
  struct Observation {
    const Platform& platform;
    const InProgressAssetQuery* query;
    ~Observation() {
      contained(platform, "removeObserver", [this] { platform.workspace.removeObserver(query); });
    }
  };
  platform.workspace.addObserver(query);
  const Observation observation{platform, query.get()};
  if (!query->_fetchResults()) return;
  inProgress = query->inProgressAssetIDs();
  restoringAssetIDs = query->restoringAssetIDs();
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
  // The next report is taken instead of this one.
  _inProgressAssetIDs.reset();
  _restoringAssetIDs.reset();
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
  if (state != installState::active || !identifier) return;
  if ((type != installType::restore && phase == installPhase::installing) ||
      (type == installType::storeDownload && phase == installPhase::loading)) {
    _inProgressAssetIDs->push_back(*identifier);
  } else if (type == installType::restore && (phase == installPhase::loading || phase == installPhase::installing)) {
    _restoringAssetIDs->push_back(*identifier);
  }
}

}  // namespace appsync
