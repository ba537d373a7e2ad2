#include "device/install/InstallRecovery.h"

#include <set>
#include <string>
#include <utility>
#include <vector>

#include "device/files/TemporaryFiles.h"
#include "device/install/CoordinationError.h"
#include "device/install/InstallOutcomes.h"
#include "device/install/PackageInstall.h"
#include "plist/PropertyList.h"

namespace device {

using Lock = AppRecords::Lock;

void InstallRecovery::run(AppRecords::Loaded loaded, bool recovers) {
  std::vector<CoordinatorRef> interrupted;
  std::set<std::string> containers;
  {
    Lock lock(_parts.records);
    for (auto& record : loaded.coordinators) {
      auto coordinator = _parts.open.open(std::move(record));
      const auto& appAsset = coordinator->state.record.appAsset;
      if (appAsset && appAsset->complete) interrupted.push_back(coordinator);
    }
    for (const auto& [id, app] : _parts.records.state().apps) containers.insert(app.container);
  }
  if (!recovers) return;
  if (!loaded.closed) {
    _parts.containers.removeAllBut(containers);
    removeTemporaryFiles(_parts.files);
  }
  for (const auto& path : loaded.leftovers) removePackage(_parts, path);
  for (const auto& coordinator : interrupted) installAppAsset(_parts, coordinator);
  if (!loaded.closed) removeLostPlaceholders();
}

bool InstallRecovery::isWhole(const AppRecord& placeholder) {
  auto bytes = _parts.files.readFile(placeholder.bundlePath() + "/Info.plist");
  if (placeholder.filesSum != 0 &&
      placeholder.filesSum != _parts.containers.placeholderSum(placeholder.container, placeholder.bundle))
    return false;
  return bytes && plist::read(std::move(*bytes)).dictionary();
}

void InstallRecovery::removeLostPlaceholders() {
  std::vector<AppRecord> placeholders;
  {
    Lock lock(_parts.records);
    for (const auto& [id, app] : _parts.records.state().apps) {
      if (app.isPlaceholder) placeholders.push_back(app);
    }
  }
  for (const auto& app : placeholders) {
    if (isWhole(app)) continue;
    AbandonedContainer abandoned(_parts.containers);
    Lock lock(_parts.records);
    auto coordinator = _parts.open.find(app.id);
    if (coordinator && !coordinator->state.record.placeholder) coordinator = nullptr;
    auto reason = coordinationError(CoordinationError::installFailed, "the placeholder's files were lost");
    recordEnded(_parts, coordinator, app.id, {InstallOutcome::failed, reason}, abandoned, nullptr);
  }
}

}  // namespace device
