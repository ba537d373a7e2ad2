#include "tsd/daemon/Daemon.h"

#include "platform/DeviceNames.h"
#include "platform/NotificationCenter.h"

namespace tsd {

using platform::ErrorRef;
using platform::TSAssetRef;

static constexpr const char* className = "AppsClient";

void Daemon::postStartupNotification() {
  _device.platform().notifications.notify_post(platform::startupNotificationName);
  _device.events().drain();
}

std::vector<std::string> Daemon::supportedDataclasses() {
  return enter({className, "supportedDataclasses"}, {}, [&] { return _client.supportedDataclasses(); });
}

std::string Daemon::currentSyncAnchor() {
  return enter({className, "currentSyncAnchor"}, {}, [&] { return _client.currentSyncAnchor(); });
}

bool Daemon::prepareForSync(std::string_view hostAnchor, ErrorRef* error) {
  return enterFallible({className, "prepareForSyncWithHostAnchor"}, error, {{"hostAnchor", hostAnchor}}, [&] {
    return _client.prepareForSyncWithHostAnchor(
        hostAnchor, [](double) {}, error);
  });
}

platform::Value Daemon::installedAssets() {
  return enter({className, "installedAssets"}, {}, [&] { return _client.installedAssets(); });
}

bool Daemon::reconcileSync(std::uint32_t syncType, std::string_view newAnchor, ErrorRef* error) {
  EarlyEnd::Operation operation(_earlyEnd);
  return enterFallible({className, "reconcileSync"}, error, {{"syncType", syncType}, {"newAnchor", newAnchor}}, [&] {
    return _client.reconcileSync(
        syncType, newAnchor, [](double) {}, error);
  });
}

std::vector<TSAssetRef> Daemon::outstandingAssetTransfers() {
  EarlyEnd::Operation operation(_earlyEnd);
  return enter({className, "outstandingAssetTransfers"}, {}, [&] { return _client.outstandingAssetTransfers(); });
}

void Daemon::assetTransferUpdatedProgress(const TSAssetRef& asset, double progress) {
  enter(
      {className, "assetTransferUpdatedProgress"}, {{"asset", asset}, {"progress", progress}},
      [&] { _client.assetTransferUpdatedProgress(asset, progress); }, asset->identifier());
}

void Daemon::assetTransferSucceeded(const TSAssetRef& asset, bool succeeded, const ErrorRef& error) {
  enter(
      {className, "assetTransferSucceeded"}, {{"asset", asset}, {"succeeded", succeeded}, {"error", error}},
      [&] { _client.assetTransferSucceeded(asset, succeeded, error); }, asset->identifier());
}

void Daemon::assetInstallSucceeded(const TSAssetRef& asset) {
  enter(
      {className, "assetInstallSucceeded"}, {{"asset", asset}}, [&] { _client.assetInstallSucceeded(asset); },
      asset->identifier());
}

void Daemon::assetInstallFailed(const TSAssetRef& asset, const ErrorRef& error) {
  enter(
      {className, "assetInstallFailed"}, {{"asset", asset}, {"error", error}},
      [&] { _client.assetInstallFailed(asset, error); }, asset->identifier());
}

void Daemon::assetTransferEndedWithSuccess(bool success) {
  enter({className, "assetTransferEndedWithSuccess"}, {{"success", success}},
        [&] { _client.assetTransferEndedWithSuccess(success); });
}

void Daemon::syncEndedWithSuccess(bool success) {
  enter({className, "syncEndedWithSuccess"}, {{"success", success}}, [&] { _client.syncEndedWithSuccess(success); });
}

void Daemon::clearSyncData() {
  enter({className, "clearSyncData"}, {}, [&] { _client.clearSyncData(); });
}

bool Daemon::reconcileRestoreOfType(std::int32_t type, ErrorRef* error) {
  EarlyEnd::Operation operation(_earlyEnd);
  return enterFallible({className, "reconcileRestoreOfType"}, error, {{"type", type}},
                       [&] { return _client.reconcileRestoreOfType(type, error); });
}

platform::Value Daemon::installedAssetMetrics() {
  return enter({className, "installedAssetMetrics"}, {}, [&] { return _client.installedAssetMetrics(); });
}

platform::StringSet Daemon::vantorIDsForAssets() {
  return enter({className, "vantorIDsForAssets"}, {}, [&] { return _client.vantorIDsForAssets(); });
}

std::vector<std::shared_ptr<platform::TSMutableAccountInfo>> Daemon::accountsForAssets() {
  return enter({className, "accountsForAssets"}, {}, [&] { return _client.accountsForAssets(); });
}

std::optional<platform::StringSet> Daemon::disabledAssetTypes() {
  return enter({className, "disabledAssetTypes"}, {}, [&] { return _client.disabledAssetTypes(); });
}

void Daemon::prepareForBackup() {
  enter({className, "prepareForBackup"}, {}, [&] { _client.prepareForBackup(); });
}

}  // namespace tsd
