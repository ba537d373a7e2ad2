#include "device/boundary/DeviceServiceBoundary.h"

#include <string>
#include <utility>

namespace device {

namespace {
constexpr const char* className = "TSDeviceService";

std::string identifier(const platform::TSAssetRef& asset) { return asset ? asset->identifier() : std::string(); }
}  // namespace

bool DeviceServiceBoundary::respondsToPrioritizeAsset() const {
  return _boundary.call({{className, "respondsToPrioritizeAsset"}}, nullptr, {},
                        [&] { return _service && _prioritizes() && _service->respondsToPrioritizeAsset(); });
}

void DeviceServiceBoundary::prioritizeAsset(const platform::TSAssetRef& asset,
                                            std::function<void(platform::ErrorRef)> completion) {
  auto app = identifier(asset);
  // The completion comes on a thread of the daemon, and crosses the boundary in its turn.
  auto crossing = [this, app, completion = std::move(completion)](platform::ErrorRef error) {
    if (!completion) return;
    _boundary.enter({{"AppsClient", "prioritizeCompletion"}, app}, {{"error", error}}, [&] { completion(error); });
  };
  _boundary.call({{className, "prioritizeAsset"}, app}, nullptr, {{"asset", asset}}, [&] {
    if (_service) _service->prioritizeAsset(asset, std::move(crossing));
  });
}

bool DeviceServiceBoundary::respondsToCancelAssetTransferForFailedAsset() const {
  return _boundary.call({{className, "respondsToCancelAssetTransferForFailedAsset"}}, nullptr, {}, [&] {
    return _service && _cancels() && _service->respondsToCancelAssetTransferForFailedAsset();
  });
}

void DeviceServiceBoundary::cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) {
  _boundary.call({{className, "cancelAssetTransferForFailedAsset"}, identifier(asset)}, nullptr, {{"asset", asset}},
                 [&] {
                   if (_service) _service->cancelAssetTransferForFailedAsset(asset);
                 });
}

}  // namespace device
