#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/Value.h"

namespace platform {

/// Bits of `completedAssetParts`.
constexpr std::int64_t kTSAssetPartApplication = 1;
constexpr std::int64_t kTSAssetPartApplicationData = 2;

/// The sync daemon's description of one transferable item. The plug-in makes records for the packages it asks
/// the host for and gets records back with every progress report and outcome.
///
/// Not synchronised: whoever reports on an asset is the only one to touch its record meanwhile. Absent fields are
/// empty optionals (absent values).
class TSAsset {
 public:
  /// A download record with these three fields set. An absent pretty name stays absent.
  static std::shared_ptr<TSAsset> downloadAssetWithIdentifier(std::string_view identifier, std::string_view dataclass,
                                                              std::optional<std::string> prettyName);

  /// The app's bundle identifier; never changes.
  const std::string& identifier() const { return _identifier; }
  const std::string& dataclass() const { return _dataclass; }
  const std::optional<std::string>& prettyName() const { return _prettyName; }

  const std::optional<std::string>& assetType() const { return _assetType; }
  void setAssetType(std::optional<std::string> type) { _assetType = std::move(type); }
  /// Where the received package lies: absolute, or relative to the public staging directory.
  const std::optional<std::string>& path() const { return _path; }
  void setPath(std::optional<std::string> path) { _path = std::move(path); }
  bool isDownload() const { return _isDownload; }
  void setIsDownload(bool isDownload) { _isDownload = isDownload; }
  bool isRestore() const { return _isRestore; }
  void setIsRestore(bool isRestore) { _isRestore = isRestore; }
  /// Path of the icon image, of a file URL.
  const std::optional<std::string>& icon() const { return _icon; }
  void setIcon(std::optional<std::string> path) { _icon = std::move(path); }
  const std::optional<std::string>& infoPlist() const { return _infoPlist; }
  void setInfoPlist(std::optional<std::string> path) { _infoPlist = std::move(path); }
  const std::optional<std::string>& storePlist() const { return _storePlist; }
  void setStorePlist(std::optional<std::string> path) { _storePlist = std::move(path); }
  std::int64_t storePID() const { return _storePID; }
  void setStorePID(std::int64_t pid) { _storePID = pid; }
  /// A dictionary, or absent.
  const Value& variantOptions() const { return _variantOptions; }
  void setVariantOptions(Value options) { _variantOptions = std::move(options); }
  std::int64_t completedAssetParts() const { return _completedAssetParts; }
  void setCompletedAssetParts(std::int64_t parts) { _completedAssetParts = parts; }
  /// Fractions from 0 to 1.
  float downloadProgress() const { return _downloadProgress; }
  void setDownloadProgress(float fraction) { _downloadProgress = fraction; }
  float installProgress() const { return _installProgress; }
  void setInstallProgress(float fraction) { _installProgress = fraction; }

  /// One line for the log.
  std::string describe() const;

 private:
  std::string _identifier;
  std::string _dataclass;
  std::optional<std::string> _prettyName;
  std::optional<std::string> _assetType;
  std::optional<std::string> _path;
  std::optional<std::string> _icon;
  std::optional<std::string> _infoPlist;
  std::optional<std::string> _storePlist;
  Value _variantOptions;
  std::int64_t _storePID = 0;
  std::int64_t _completedAssetParts = 0;
  float _downloadProgress = 0;
  float _installProgress = 0;
  bool _isDownload = false;
  bool _isRestore = false;
};

using TSAssetRef = std::shared_ptr<TSAsset>;

}  // namespace platform
