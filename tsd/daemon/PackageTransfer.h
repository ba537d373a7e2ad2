#pragma once

#include <atomic>
#include <cstdint>
#include <string>

#include "device/LocalDevice.h"
#include "platform/TSAsset.h"
#include "tsd/conduit/HostFile.h"
#include "tsd/daemon/AssetReport.h"
#include "tsd/daemon/Daemon.h"
#include "tsd/stopping/StopSignal.h"
#include "tsd/terminal/Progress.h"

namespace tsd {

/// One package's way from the host onto the device. Carried once, on one thread; cancelled from any.
///
/// The package is written to "/var/mobile/Media/PublicStaging/Packages/<id>.pkg" and is on disk before its transfer is
/// reported complete. Every chunk is reported as progress, and no progress follows a completion, which is reported once
/// at most: never of a transfer that stalls or is interrupted by the stop signal.
class PackageTransfer {
 public:
  enum class End : std::uint8_t { none, arrived, failed, cancelled, stalled, interrupted };
  struct Result {
    End end = End::none;
    platform::ErrorRef error;  // of a failed or cancelled one
    std::uint64_t bytes = 0;   // sent
  };
  /// Where packages come from and what they pass through. All of it outlives the transfer.
  struct Way {
    const std::string& packagesFolder;  // on the host
    device::LocalDevice& device;
    Daemon& daemon;
    Progress& progress;
    const StopSignal& stop;
  };

  /// `reported` is what the daemon says of the asset; it outlives the transfer.
  PackageTransfer(platform::TSAssetRef asset, const AssetReport& reported)
      : _asset(std::move(asset)), _reported(reported) {}

  const std::string& identifier() const { return _asset->identifier(); }
  /// Ends the transfer as cancelled at its next chunk; if it has not begun, nothing is sent.
  void cancel() { _cancelled = true; }
  /// Throws nothing: running out of memory is the transfer's failure.
  Result carry(const Way& way);

 private:
  Result carryInOrder(const Way& way);
  Result send(const Way& way, HostFile& package, const std::string& path);
  Result sendChunks(const Way& way, HostFile& package, device::FileWriter& target);
  Result complete(const Way& way, const std::string& path, std::uint64_t bytes);
  Result fail(const Way& way, End end, const platform::ErrorRef& error);

  const platform::TSAssetRef _asset;
  const AssetReport& _reported;
  std::atomic<bool> _cancelled{false};
  bool _completed = false;  // the plug-in has been told of the end
};

}  // namespace tsd
