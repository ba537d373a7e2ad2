#pragma once

#include <functional>

#include "device/Boundary.h"
#include "platform/TSDeviceService.h"

namespace device {

/// The daemon's device service as the plug-in reaches it: what the device's owner gave, behind the boundary. Without
/// one, a service that has neither operation.
class DeviceServiceBoundary final : public platform::TSDeviceService {
 public:
  /// `service` may be null; otherwise it outlives this.
  DeviceServiceBoundary(platform::TSDeviceService* service, Boundary& boundary)
      : _service(service), _boundary(boundary) {}

  bool respondsToPrioritizeAsset() const override;
  void prioritizeAsset(const platform::TSAssetRef& asset, std::function<void(platform::ErrorRef)> completion) override;
  bool respondsToCancelAssetTransferForFailedAsset() const override;
  void cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) override;

 private:
  platform::TSDeviceService* const _service;
  Boundary& _boundary;
};

}  // namespace device
