#include "tsd/daemon/Daemon.h"

#include "platform/DeviceNames.h"
#include "platform/NotificationCenter.h"

namespace tsd {

using platform::ErrorRef;
using platform::TSAssetRef;

void Daemon::postStartupNotification() {
  _device.platform().notifications.notify_post(platform::startupNotificationName);
  _device.events().drain();
}

std::vector<std::string> Daemon::supportedDataclasses() {
  return enter("supportedDataclasses", {}, [&] { return _client.supportedDataclasses(); });
}

std::string Daemon::currentSyncAnchor() {
  return enter("currentSyncAnchor", {}, [&] { return _client.currentSyncAnchor(); });
}

bool Daemon::prepareForSync(std::string_view hostAnchor, ErrorRef* error) {
  return enterFallible("prepareForSyncWithHostAnchor", error, {{"hostAnchor", hostAnchor}}, [&] {
    return _client.prepareForSyncWithHostAnchor(
        hostAnchor, [](double) {}, error);
  });
}

platform::Value Daemon::installedAssets() {
  return enter("installedAssets", {}, [&] { return _client.installedAssets(); });
}

bool Daemon::reconcileSync(std::uint32_t syncType, std::string_view newAnchor, ErrorRef* error) {
  EarlyEnd::Operation operation(_earlyEnd);
  return enterFallible("reconcileSync", error, {{"syncType", syncType}, {"newAnchor", newAnchor}}, [&] {
    return _client.reconcileSync(
        syncType, newAnchor, [](double) {}, error);
  });
}

std::vector<TSAssetRef> Daemon::outstandingAssetTransfers() {
  EarlyEnd::Operation operation(_earlyEnd);
  return enter("outstandingAssetTransfers", {}, [&] { return _client.outstandingAssetTransfers(); });
}

void Daemon::assetTransferUpdatedProgress(const TSAssetRef& asset, double progress) {
  enter(
      "assetTransferUpdatedProgress", {{"asset", asset}, {"progress", progress}},
      [&] { _client.assetTransferUpdatedProgress(asset, progress); }, asset->identifier());
}

void Daemon::assetTransferSucceeded(const TSAssetRef& asset, bool succeeded, const ErrorRef& error) {
  enter(
      "assetTransferSucceeded", {{"asset", asset}, {"succeeded", succeeded}, {"error", error}},
      [&] { _client.assetTransferSucceeded(asset, succeeded, error); }, asset->identifier());
}

void Daemon::assetInstallSucceeded(const TSAssetRef& asset) {
  enter(
      "assetInstallSucceeded", {{"asset", asset}}, [&] { _client.assetInstallSucceeded(asset); }, asset->identifier());
}

void Daemon::assetInstallFailed(const TSAssetRef& asset, const ErrorRef& error) {
  enter(
      "assetInstallFailed", {{"asset", asset}, {"error", error}}, [&] { _client.assetInstallFailed(asset, error); },
      asset->identifier());
}

void Daemon::assetTransferEndedWithSuccess(bool success) {
  enter("assetTransferEndedWithSuccess", {{"success", success}},
        [&] { _client.assetTransferEndedWithSuccess(success); });
}

void Daemon::syncEndedWithSuccess(bool success) {
  enter("syncEndedWithSuccess", {{"success", success}}, [&] { _client.syncEndedWithSuccess(success); });
}

void Daemon::clearSyncData() {
  enter("clearSyncData", {}, [&] { _client.clearSyncData(); });
}

bool Daemon::reconcileRestoreOfType(std::int32_t type, ErrorRef* error) {
  EarlyEnd::Operation operation(_earlyEnd);
  return enterFallible("reconcileRestoreOfType", error, {{"type", type}},
                       [&] { return _client.reconcileRestoreOfType(type, error); });
}

platform::Value Daemon::installedAssetMetrics() {
  return enter("installedAssetMetrics", {}, [&] { return _client.installedAssetMetrics(); });
}

platform::StringSet Daemon::vantorIDsForAssets() {
  return enter("vantorIDsForAssets", {}, [&] { return _client.vantorIDsForAssets(); });
}

std::vector<std::shared_ptr<platform::TSMutableAccountInfo>> Daemon::accountsForAssets() {
  return enter("accountsForAssets", {}, [&] { return _client.accountsForAssets(); });
}

std::optional<platform::StringSet> Daemon::disabledAssetTypes() {
  return enter("disabledAssetTypes", {}, [&] { return _client.disabledAssetTypes(); });
}

void Daemon::prepareForBackup() {
  enter("prepareForBackup", {}, [&] { _client.prepareForBackup(); });
}

}  // namespace tsd
