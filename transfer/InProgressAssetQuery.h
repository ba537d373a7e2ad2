#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "platform/OBApplicationWorkspace.h"
#include "platform/Platform.h"
#include "platform/WaitGroup.h"

namespace appsync {

/// A snapshot of the installs that the application registry has under way: a short-lived observer of the
/// registry that sorts the first report of prioritised and paused installs and ignores the later ones.
class InProgressAssetQuery final : public platform::OBApplicationWorkspaceObserver {
 public:
  using Identifiers = std::vector<std::string>;

  /// Blocks until the registry has reported, or the time-out. Neither is set when it did not report in time.
  static void currentInProgressAssetIDs(const platform::Platform& platform, std::optional<Identifiers>& inProgress,
                                        std::optional<Identifiers>& restoringAssetIDs);

  explicit InProgressAssetQuery(const platform::Platform& platform) : _platform(platform) {}

  /// On the registry's thread.
  void applicationInstallsArePrioritized(const std::vector<platform::OBApplicationProxyRef>& prioritized,
                                         const std::vector<platform::OBApplicationProxyRef>& arePaused) override;

 private:
  /// Long enough for a busy registry, short enough for a daemon that waits.
  static constexpr std::chrono::seconds timeout{10};

  /// False on time-out. The two lists may be read only after it answered true.
  bool _fetchResults();
  const std::optional<Identifiers>& inProgressAssetIDs() const { return _inProgressAssetIDs; }
  const std::optional<Identifiers>& restoringAssetIDs() const { return _restoringAssetIDs; }
  void _sort(const platform::OBApplicationProxy& proxy);

  const platform::Platform& _platform;
  platform::Semaphore _waitForInitialObservationData;
  // Written by the registry's thread before it signals, read by the caller after its wait.
  std::optional<Identifiers> _inProgressAssetIDs;
  std::optional<Identifiers> _restoringAssetIDs;
};

}  // namespace appsync
