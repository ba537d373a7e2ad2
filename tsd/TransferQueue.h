#pragma once

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "device/LocalDevice.h"
#include "platform/Clock.h"
#include "platform/TSDeviceService.h"
#include "tsd/AssetReport.h"
#include "tsd/Daemon.h"
#include "tsd/HostFile.h"
#include "tsd/Progress.h"
#include "tsd/StopSignal.h"

namespace tsd {

/// The daemon's transfers of packages, several in flight, each on a thread of its own ("transfer-1", …), and the
/// service through which the plug-in asks for one to come first or to end.
///
/// A package is written to "/var/mobile/Media/PublicStaging/Packages/<id>.pkg" and is on disk before its transfer is
/// reported complete. Every chunk is reported as progress, and no progress follows a completion. A transfer that stalls
/// or is interrupted by the stop signal is never reported complete.
///
/// Made before the device, as the device hands the plug-in's requests to it. Without a device it has nothing in its
/// queue.
class TransferQueue : public platform::TSDeviceService {
 public:
  enum class End : std::uint8_t { none, arrived, failed, cancelled, stalled, interrupted };
  struct Result {
    End end = End::none;
    platform::ErrorRef error;  // of a failed or cancelled one
    std::uint64_t bytes = 0;   // sent
  };
  struct Setup {
    std::string packagesFolder;  // on the host
    AssetReports reports;
    std::size_t inFlight = 1;
  };

  TransferQueue(Setup setup, Progress& progress, const StopSignal& stop);
  ~TransferQueue() override;

  /// Starts the transfers, in this order. The device and the daemon outlive `finish`.
  void start(device::LocalDevice& device, Daemon& daemon, const std::vector<platform::TSAssetRef>& assets);
  /// True when the last transfer has ended, false when the deadline came first.
  bool waitUntil(platform::Clock::Instant deadline);
  /// Waits for the threads' end.
  void finish();

  Result result(const std::string& identifier) const;
  const AssetReport& report(const std::string& identifier) const;

  bool respondsToPrioritizeAsset() const override { return true; }
  void prioritizeAsset(const platform::TSAssetRef& asset, std::function<void(platform::ErrorRef)> completion) override;
  bool respondsToCancelAssetTransferForFailedAsset() const override { return true; }
  void cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) override;

 private:
  struct Transfer {
    platform::TSAssetRef asset;
    std::atomic<bool> cancelled{false};
    Result result;  // guarded by _mutex
  };
  using TransferRef = std::shared_ptr<Transfer>;

  void work(std::size_t number);
  TransferRef takeNext();
  Result carry(Transfer& transfer);
  Result send(Transfer& transfer, HostFile& package, const std::string& path);
  Result sendChunks(Transfer& transfer, HostFile& package, device::FileWriter& target);
  Result complete(Transfer& transfer, const std::string& path, std::uint64_t bytes);
  Result fail(Transfer& transfer, End end, const platform::ErrorRef& error);

  const Setup _setup;
  Progress& _progress;
  const StopSignal& _stop;
  device::LocalDevice* _device = nullptr;  // set while there are transfers
  Daemon* _daemon = nullptr;
  std::vector<std::thread> _threads;

  mutable std::mutex _mutex;
  std::condition_variable _ended;
  // Guarded by _mutex.
  std::deque<TransferRef> _waiting;
  std::map<std::string, TransferRef, std::less<>> _transfers;
  std::size_t _working = 0;  // threads that have not run out of transfers
};

}  // namespace tsd
