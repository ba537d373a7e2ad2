#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Error.h"
#include "platform/StringSet.h"
#include "platform/TSAccountInfo.h"
#include "platform/TSAsset.h"
#include "platform/Value.h"

namespace platform {

/// Takes the fraction of the work that is done, from 0 to 1.
using TSProgressCallback = std::function<void(double)>;

/// What the sync daemon asks of a plug-in for one data class. The daemon calls from its own threads; progress
/// and completion of different packages may arrive at the same time, everything else one call at a time.
/// No operation throws.
class TSClient {
 public:
  virtual ~TSClient() = default;

  virtual std::vector<std::string> supportedDataclasses() = 0;
  virtual std::string currentSyncAnchor() = 0;
  virtual bool prepareForSyncWithHostAnchor(std::string_view hostAnchor, const TSProgressCallback& progressCallback,
                                            ErrorRef* error = nullptr) = 0;
  virtual bool reconcileSync(std::uint32_t syncType, std::string_view newAnchor,
                             const TSProgressCallback& progressCallback, ErrorRef* error = nullptr) = 0;
  virtual void syncEndedWithSuccess(bool success) = 0;

  /// A dictionary of lists of assets; what each key means is the data class's.
  virtual Value installedAssets() = 0;
  /// The packages the host must still send, in the order in which they are wanted. The records are shared with
  /// the caller, who reports on them below.
  virtual std::vector<TSAssetRef> outstandingAssetTransfers() = 0;
  virtual void assetTransferUpdatedProgress(const TSAssetRef& asset, double progress) = 0;
  virtual void assetTransferSucceeded(const TSAssetRef& asset, bool succeeded, const ErrorRef& error) = 0;
  virtual void assetInstallSucceeded(const TSAssetRef& asset) = 0;
  virtual void assetInstallFailed(const TSAssetRef& asset, const ErrorRef& error) = 0;
  virtual void assetTransferEndedWithSuccess(bool success) = 0;
  virtual void clearSyncData() = 0;

  virtual bool reconcileRestoreOfType(std::int32_t type, ErrorRef* error = nullptr) = 0;

  virtual Value installedAssetMetrics() = 0;
  virtual StringSet vantorIDsForAssets() = 0;
  virtual std::vector<std::shared_ptr<TSMutableAccountInfo>> accountsForAssets() = 0;
  /// Nothing when no asset type is disabled.
  virtual std::optional<StringSet> disabledAssetTypes() = 0;
  virtual void prepareForBackup() = 0;
};

}  // namespace platform
