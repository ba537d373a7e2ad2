#pragma once

#include <functional>

#include "platform/Error.h"
#include "platform/TSAsset.h"

namespace platform {

/// The sync daemon's view of the device it serves: its transfer queue. A daemon may lack either operation, each
/// by itself, and says so; the operation is called only when the daemon has it. It finds the asset in its queue by
/// the record's identifier. Callable from any thread.
class TSDeviceService {
 public:
  virtual ~TSDeviceService() = default;

  virtual bool respondsToPrioritizeAsset() const = 0;
  /// Moves the asset to the front of the transfer queue. The completion runs later, on the service's thread.
  virtual void prioritizeAsset(const TSAssetRef& asset, std::function<void(ErrorRef)> completion) = 0;

  virtual bool respondsToCancelAssetTransferForFailedAsset() const = 0;
  /// Stops the transfer of the asset; the daemon reports its end in its own time.
  virtual void cancelAssetTransferForFailedAsset(const TSAssetRef& asset) = 0;
};

}  // namespace platform
