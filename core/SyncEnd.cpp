#include "core/AppsClient.h"
#include "core/Say.h"
#include "platform/DevicePaths.h"
#include "platform/FileSystem.h"
#include "platform/Installer.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/Process.h"

namespace appsync {

using namespace platform;

void AppsClient::assetTransferEndedWithSuccess(bool success) try {
  say(_platform, "asset transfer ended withsuccess: %c", yesOrNo(success));
  contained(_platform, "_notifyPanello", [this] { _notifyPanello(_platform, false); });
  StringSet outstanding;
  {
    Mutex::Lock lock(_transferStateGuard);
    std::swap(outstanding, _outstandingDuctoTransfers);
  }
  if (outstanding.empty()) return;
  contained(_platform, "assetSyncFinishedWithStatus", [&] { assetSyncFinishedWithStatus(success, outstanding); });
  if (success) {
    sayError(_platform, "Called with success == YES but with %lu outstanding Ducto transfers!", outstanding.size());
  }
  {
    Mutex::Lock lock(_transferStateGuard);
    _outstandingDuctoTransfers.clear();
  }
  SerialQueue::Block block(_accessQueue, _platform.clock);
  _updatingApps.clear();
  _userCancelledApps.clear();
} catch (...) {
  swallowException(_platform, "assetTransferEndedWithSuccess");
}

static void touchPluginDirectory(const Platform& platform) {
  int errorNumber = 0;
  if (platform.fileSystem.utimes(pluginDirectory, errorNumber) == 0) return;
  sayError(platform, "Failed to update utimes of \"%s\": %s", pluginDirectory,
           platform.process.textOfErrorNumber(errorNumber));
}

void AppsClient::syncEndedWithSuccess(bool success) try {
  say(_platform, "sync ended with success: %c", yesOrNo(success));
  if (!success) return;
  touchPluginDirectory(_platform);
  std::optional<std::vector<std::string>> uninstalledApps;
  bool deletionsReported = true;
  {
    Mutex::Lock lock(_transferStateGuard);
    uninstalledApps = _uninstalledApps;
    deletionsReported = _deletionsReported;
  }
  if (uninstalledApps) {
    say(_platform, "clearing uninstalled apps: %{public}@", *uninstalledApps);
    if (_platform.installer.CorvaneClearUninstalled(*uninstalledApps) == 0) {
      Mutex::Lock lock(_transferStateGuard);
      _uninstalledApps.reset();
    } else {
      sayError(_platform, "Failed to clear uninstalled apps from Corvane.");
    }
  }
  if (deletionsReported) _platform.fileSystem.removeItem(lastSyncListPath);
} catch (...) {
  swallowException(_platform, "syncEndedWithSuccess");
}

static void clearUninstalledApps(const Platform& platform) {
  const Value uninstalled = platform.installer.CorvaneLookupUninstalled();
  if (!uninstalled.dictionary()) {
    sayError(platform, "Failed to fetch uninstalled apps list to clear it");
    return;
  }
  std::vector<std::string> identifiers;
  for (const auto& entry : *uninstalled.dictionary()) identifiers.emplace_back(entry.key);
  if (platform.installer.CorvaneClearUninstalled(identifiers) != 0) {
    sayError(platform, "Failed to clear uninstalled apps list");
  }
}

void AppsClient::clearSyncData() try {
  say(_platform, "blasting work area");
  {
    SerialQueue::Block block(_listFilesQueue, _platform.clock);
    _platform.fileSystem.removeItem(pluginDirectory);
  }
  say(_platform, "Uninstalling all placeholder apps");
  _enumeratePlaceholdersWithBlock([this](const OBApplicationProxy& proxy, bool&) {
    const bool removed = _platform.workspace.uninstallApplication(proxy.bundleIdentifier.value_or(""));
    say(_platform, "Uninstall %{public}@ = %c", proxy.bundleIdentifier, yesOrNo(removed));
  });
  clearUninstalledApps(_platform);
} catch (...) {
  swallowException(_platform, "clearSyncData");
}

}  // namespace appsync
