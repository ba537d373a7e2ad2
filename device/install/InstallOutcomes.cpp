#include "device/install/InstallOutcomes.h"

#include <utility>

#include "device/DeviceErrors.h"
#include "device/install/CoordinationError.h"

namespace device {

using platform::ErrorRef;

namespace {

/// What is kept of the app that was there before, and of what was asked for it.
void keepOfExisting(AppRecord& installed, const AppRecord& existing, const CoordinatorRef& coordinator)
    REQUIRES(recordsGuard) {
  installed.applicationType = existing.applicationType;
  installed.systemBundle = existing.systemBundle;
  installed.homeOrder = existing.homeOrder;
  installed.installType = existing.installType;
  if (coordinator && !existing.isPlaceholder && coordinator->state.record.placeholder)
    installed.installType = coordinator->state.record.placeholder->installType;
}

}  // namespace

bool recordInstalled(const InstallParts& parts, const CoordinatorRef& coordinator, AppRecord installed,
                     const std::optional<InstallOptionsRecord>& options, const std::string& packagePath,
                     AbandonedContainer& abandoned, ErrorRef* error) {
  auto app = installed.id;
  if (!coordinator && parts.open.find(app))
    return fail(error, localDeviceError(LocalDeviceError::busyApp, "an install of " + app + " is under way"));
  std::string superfluous;
  if (const auto* existing = parts.records.state().app(app)) {
    if (existing->container != installed.container) superfluous = existing->container;
    keepOfExisting(installed, *existing, coordinator);
  }
  if (options) installed.installType = options->installType;
  installed.isPlaceholder = false;
  installed.progress.reset();
  ChangeSet changes;
  changes.put(std::move(installed));
  changes.removeUninstalled(app);
  changes.setOutcome(app, {InstallOutcome::installed, ""});
  if (coordinator) changes.removeCoordinator(app);
  // The package goes after the commit, as an install that is taken up again needs it; what a process that dies before
  // it is gone leaves is removed by the next one.
  if (!packagePath.empty()) changes.addLeftover(packagePath);
  if (!parts.records.commit(std::move(changes), error)) return false;
  // From here on nothing can fail: the old files go when nobody can find them any more, and whoever is told finds the
  // coordinator ended and the new app there.
  const auto tell = [&]() REQUIRES(recordsGuard) noexcept {
    abandoned.become(std::move(superfluous));
    if (coordinator) parts.open.close(*coordinator);
    parts.reports.installed(coordinator, app);
  };
  tell();
  return true;
}

bool recordEnded(const InstallParts& parts, const CoordinatorRef& coordinator, const std::string& app,
                 const InstallEnding& ending, AbandonedContainer& abandoned, ErrorRef* error) {
  const auto* record = parts.records.state().app(app);
  // A coordinator that never got a placeholder has changed nothing of its app.
  if (coordinator && !coordinator->state.record.placeholder) record = nullptr;
  platform::OBApplicationProxyRef shown = record && record->progress ? record->proxy : nullptr;
  std::string superfluous;
  ChangeSet changes;
  OutcomeRecord outcome{ending.outcome, ending.reason ? ending.reason->describe() : ""};
  if (record && record->isPlaceholder) {
    superfluous = record->container;
    // What an interrupted process lost is likely to be asked for again, and then to be where it was.
    bool isLost = !parts.reports.hasStarted();
    changes.removeApp(app, isLost);
    if (isLost) outcome.homeOrder = record->homeOrder;
  } else if (record && record->progress) {
    auto kept = *record;
    kept.progress.reset();
    changes.put(std::move(kept));
  }
  changes.setOutcome(app, outcome);
  if (coordinator) changes.removeCoordinator(app);
  if (!parts.records.commit(std::move(changes), error)) return false;
  // A refused commit leaves the install as it is, for another try; so its files go, and its coordinator ends, behind
  // it. The registry's observers hear of it before the coordinator's, who may begin the next install.
  abandoned.become(std::move(superfluous));
  if (coordinator) parts.open.close(*coordinator);
  if (ending.outcome == InstallOutcome::cancelled)
    parts.reports.cancelled(coordinator, app, shown, ending.reason, ending.client);
  else
    parts.reports.failed(app, shown != nullptr);
  return true;
}

void failInstall(const InstallParts& parts, const CoordinatorRef& coordinator, const std::string& app,
                 const ErrorRef& reason, AbandonedContainer& abandoned) {
  if (coordinator && coordinator->state.ended) return;
  auto failure = coordinationError(CoordinationError::installFailed,
                                   reason ? reason->description() : "the package cannot be installed", reason);
  if (coordinator) coordinator->state.failure = failure;
  bool recorded = recordEnded(parts, coordinator, app, {InstallOutcome::failed, failure}, abandoned, nullptr);
  if (!coordinator) return;
  // A store that takes nothing any more must not leave the caller waiting: the coordinator ends for this process.
  if (!recorded) parts.open.close(*coordinator);
  parts.reports.completedInError(coordinator);
}

}  // namespace device
