#include <new>

#include "core/AppsClient.h"
#include "core/Names.h"
#include "core/Say.h"
#include "platform/DPProfileConnection.h"
#include "platform/DeviceNames.h"
#include "platform/InstallTransactionLog.h"
#include "platform/Process.h"
#include "platform/SystemLog.h"

namespace appsync {

using namespace platform;

constexpr int restrictionForbids = 2;

static bool isDaemonProcess(const Platform& platform) {
  return platform.process.mainBundleIdentifier() == daemonBundleIdentifier;
}

AppsClient::AppsClient(const Platform& platform, Creation)
    : _platform(platform), _backupManager(platform.backup.makeBackupManager()) {}

std::shared_ptr<AppsClient> AppsClient::init(const Platform& platform) try {
  auto client = std::make_shared<AppsClient>(platform, Creation{});
  // Every field has its value before the first service may call back.
  platform.workspace.addObserver(std::weak_ptr<OBApplicationWorkspaceObserverProtocol>(client));
  platform.transactionLog.initializeWithLog(
      platform.systemLog.createHandle("com.vantor.appinstallation", "tsd.appsync"));
  if (!isDaemonProcess(platform)) return client;
  {
    SerialQueue::Block block(client->_restoreQueue, platform.clock);
    client->_finishedWaitingForPlaceHolderInstalls = true;
  }
  platform.notifications.KBNotificationCenterAddObserver(
      std::weak_ptr<void>(std::shared_ptr<void>(client)), _handleTSDStartupCompletedNotification,
      startupNotificationName, nullptr, KBNotificationSuspensionBehavior::drop);
  return client;
} catch (...) {
  swallowException(platform, "init");
  return nullptr;
}

AppsClient::~AppsClient() try {
  if (!_outstandingDuctoTransfers.empty()) {
    sayError(_platform, "%{public}@ getting dealloc'd with %lu outstanding Ducto transfers!", *this,
             _outstandingDuctoTransfers.size());
  }
  if (!_placeholdersForRestoringApps.empty()) {
    sayError(_platform,
             "%{public}@ getting dealloc'd with %{public}@pending placeholder install complete notifications", *this,
             _placeholdersForRestoringApps);
  }
  _outstandingDuctoTransfers.clear();
  _uninstalledApps.reset();
  _placeholdersForRestoringApps.clear();
  _platform.workspace.removeObserver(this);
  if (!isDaemonProcess(_platform)) return;
  _platform.notifications.KBNotificationCenterRemoveObserver(this, startupNotificationName);
  _appInstallObserver.reset();
} catch (...) {
  // A destructor has nobody to tell; the fields go all the same. Returning keeps the exception inside.
  return;
}

void _handleTSDStartupCompletedNotification(NotificationCenter&, void* observer, std::string_view, const void*,
                                            const Value&) {
  if (observer) static_cast<AppsClient*>(observer)->setupInstallCoordinatorObserver();
}

void AppsClient::setupInstallCoordinatorObserver() try {
  if (_observesInstalls.exchange(true)) return;
  _appInstallObserver = _platform.installCoordination.makeAppInstallObserver(installObserverServiceName, {RVClientSync},
                                                                             weak_from_this());
  if (!_appInstallObserver) _observesInstalls = false;  // the next notification tries again
} catch (...) {
  _observesInstalls = false;
  swallowException(_platform, "setupInstallCoordinatorObserver");
}

bool AppsClient::_appInstallationAllowed() const {
  return _platform.restrictions.effectiveBoolValueForSetting(DPFeatureAppInstallationAllowed) != restrictionForbids;
}

bool AppsClient::_appRemovalAllowed() const {
  return _platform.restrictions.effectiveBoolValueForSetting(DPFeatureAppRemovalAllowed) != restrictionForbids;
}

}  // namespace appsync
