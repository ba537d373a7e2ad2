#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/LocalDevice.h"
#include "platform/TSClient.h"
#include "tsd/stopping/EarlyEnd.h"

namespace tsd {

/// The sync daemon's calls into the plug-in, each through the device's boundary, so that they are journaled like
/// everything else that crosses. From the daemon's thread; progress and completion also from transfer threads.
class Daemon {
 public:
  /// With `earlyEnd` the operations that work through many apps end early when a stop is wanted.
  Daemon(device::LocalDevice& device, platform::TSClient& client, EarlyEnd* earlyEnd = nullptr)
      : _device(device), _client(client), _earlyEnd(earlyEnd) {}

  /// Tells the system that the daemon has started, and waits until everybody knows.
  void postStartupNotification();

  std::vector<std::string> supportedDataclasses();
  std::string currentSyncAnchor();
  bool prepareForSync(std::string_view hostAnchor, platform::ErrorRef* error);
  platform::Value installedAssets();
  bool reconcileSync(std::uint32_t syncType, std::string_view newAnchor, platform::ErrorRef* error);
  std::vector<platform::TSAssetRef> outstandingAssetTransfers();
  void assetTransferUpdatedProgress(const platform::TSAssetRef& asset, double progress);
  void assetTransferSucceeded(const platform::TSAssetRef& asset, bool succeeded, const platform::ErrorRef& error);
  void assetInstallSucceeded(const platform::TSAssetRef& asset);
  void assetInstallFailed(const platform::TSAssetRef& asset, const platform::ErrorRef& error);
  void assetTransferEndedWithSuccess(bool success);
  void syncEndedWithSuccess(bool success);
  void clearSyncData();
  bool reconcileRestoreOfType(std::int32_t type, platform::ErrorRef* error);
  platform::Value installedAssetMetrics();
  platform::StringSet vantorIDsForAssets();
  std::vector<std::shared_ptr<platform::TSMutableAccountInfo>> accountsForAssets();
  std::optional<platform::StringSet> disabledAssetTypes();
  void prepareForBackup();

 private:
  template <class Body>
  auto enter(const device::InjectionPoint& point, device::CallArguments arguments, Body&& body,
             std::string_view app = {}) {
    return _device.boundary().enter({point, app}, arguments, body);
  }
  template <class Body>
  auto enterFallible(const device::InjectionPoint& point, platform::ErrorRef* error, device::CallArguments arguments,
                     Body&& body) {
    return _device.boundary().enter({point}, error, arguments, body);
  }

  device::LocalDevice& _device;
  platform::TSClient& _client;
  EarlyEnd* const _earlyEnd;
};

}  // namespace tsd
