#pragma once

#include <functional>
#include <utility>

#include "device/boundary/Boundary.h"
#include "platform/TSDeviceService.h"

namespace device {

/// The daemon's device service as the plug-in reaches it: the one of the device's owner, behind the boundary. Without
/// one it has neither operation; and it lacks those that the device's settings take away.
class DeviceServiceBoundary final : public platform::TSDeviceService {
 public:
  /// `service` may be null; otherwise it outlives this. The other two answer, at each call, whether the settings leave
  /// it the operation.
  DeviceServiceBoundary(Boundary& boundary, std::function<bool()> prioritizes, std::function<bool()> cancels,
                        platform::TSDeviceService* service)
      : _boundary(boundary), _prioritizes(std::move(prioritizes)), _cancels(std::move(cancels)), _service(service) {}

  bool respondsToPrioritizeAsset() const override;
  void prioritizeAsset(const platform::TSAssetRef& asset, std::function<void(platform::ErrorRef)> completion) override;
  bool respondsToCancelAssetTransferForFailedAsset() const override;
  void cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) override;

 private:
  Boundary& _boundary;
  const std::function<bool()> _prioritizes;
  const std::function<bool()> _cancels;
  platform::TSDeviceService* const _service;
};

}  // namespace device
