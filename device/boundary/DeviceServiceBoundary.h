#pragma once

#include <functional>
#include <string>
#include <string_view>
#include <utility>

#include "device/boundary/Boundary.h"
#include "platform/TSDeviceService.h"

namespace device {

/// The daemon's device service as the plug-in reaches it: the one of the device's owner, behind the boundary. Without
/// one it has neither operation; and it lacks those that the device's settings take away.
class DeviceServiceBoundary final : public platform::TSDeviceService {
 public:
  using Setting = std::function<std::string(std::string_view key)>;

  /// `service` may be null; otherwise it outlives this.
  DeviceServiceBoundary(Boundary& boundary, Setting setting, platform::TSDeviceService* service)
      : _boundary(boundary), _setting(std::move(setting)), _service(service) {}

  bool respondsToPrioritizeAsset() const override;
  void prioritizeAsset(const platform::TSAssetRef& asset, std::function<void(platform::ErrorRef)> completion) override;
  bool respondsToCancelAssetTransferForFailedAsset() const override;
  void cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) override;

 private:
  Boundary& _boundary;
  const Setting _setting;
  platform::TSDeviceService* const _service;
};

}  // namespace device
