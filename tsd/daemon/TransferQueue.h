#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "device/LocalDevice.h"
#include "platform/Clock.h"
#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/StringSet.h"
#include "platform/TSDeviceService.h"
#include "platform/ThreadSafety.h"
#include "tsd/daemon/AssetReport.h"
#include "tsd/daemon/PackageTransfer.h"

namespace tsd {

/// The daemon's transfers of packages, several at a time, each on a thread of its own ("transfer-1", …), and the
/// service through which the plug-in asks for one to come first or to end.
///
/// Made before the device, which passes the plug-in's requests on to it; serves the device as long as a `Serving`
/// lives. To be called from the daemon's thread; the plug-in's requests come from any.
class TransferQueue : public platform::TSDeviceService {
 public:
  using End = PackageTransfer::End;
  using Result = PackageTransfer::Result;
  struct Setup {
    std::string packagesFolder;  // on the host
    AssetReports reports;
    std::size_t inFlight = 1;
    /// So many packages at most wait on the device for the plug-in to hear of their outcomes, besides those that are
    /// on their way; the next ones wait on the host meanwhile. Enough for the device never to wait for a package, and
    /// few enough for what is left to be marked when the sync is stopped.
    std::size_t ahead = 32;
  };
  enum class Progression : std::uint8_t {
    ended,  // the last transfer has
    goesOn,
    waits,  // every thread, for outcomes of what has arrived
  };

  /// Starts its threads, so that none can be missing once something has begun. Throws a `CommandError` when the system
  /// has no thread left.
  TransferQueue(Setup setup, Progress& progress, StopSignal& stop);
  ~TransferQueue() override;
  TransferQueue(const TransferQueue&) = delete;
  TransferQueue& operator=(const TransferQueue&) = delete;

  /// The device that the queue serves, and the daemon that is told of the packages. At its end nothing more is taken,
  /// and the running transfers end.
  class Serving {
   public:
    Serving(TransferQueue& queue, device::LocalDevice& device, Daemon& daemon);
    ~Serving();
    Serving(const Serving&) = delete;
    Serving& operator=(const Serving&) = delete;

   private:
    TransferQueue& _queue;
  };

  /// A sync begins, and what the last one transferred is forgotten. Until `start`, requests are about transfers to
  /// come.
  void expect();
  /// Transfers the assets in this order, except that those asked for first meanwhile come first. Throws a
  /// `CommandError` when the directory for packages cannot be made; nothing has been transferred then.
  void start(const std::vector<platform::TSAssetRef>& assets);
  /// Waits until the last transfer has ended, at most to the deadline. How far they are then.
  Progression waitUntil(platform::Clock::Instant deadline);
  /// From now on, and until the next `start`, no transfer waits for outcomes.
  void stopWaitingForOutcomes();
  /// Takes no more and waits for the running transfers. Whoever asked for one that never came is told.
  void finish();

  Result result(const std::string& identifier) const;
  const AssetReport& report(const std::string& identifier) const;

  bool respondsToPrioritizeAsset() const override { return true; }
  void prioritizeAsset(const platform::TSAssetRef& asset, std::function<void(platform::ErrorRef)> completion) override;
  bool respondsToCancelAssetTransferForFailedAsset() const override { return true; }
  void cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) override;

 private:
  using TransferRef = std::shared_ptr<PackageTransfer>;
  using Completion = std::function<void(platform::ErrorRef)>;
  /// The request that a transfer to come goes first.
  struct Wish {
    std::string identifier;
    Completion completion;
  };

  void work(std::size_t number);
  void endThreads();
  /// Null when there is none left. Waits for room on the device.
  TransferRef takeNext();
  bool hasRoom() const REQUIRES(_mutex) { return _runsAhead || _unsettled < _setup.inFlight + _setup.ahead; }
  /// Gives back a transfer's room once the device has gone through what its end has led to.
  void settleLater(device::EventQueue& events);
  void settle();
  /// False when there is no such transfer, or it is over; a running one counts as first.
  bool moveToFront(const std::string& identifier) REQUIRES(_mutex);
  void answer(const Wish& wish, bool outstanding, device::LocalDevice& device) const;

  const Setup _setup;
  Progress& _progress;
  StopSignal& _stop;

  mutable platform::Mutex _mutex;
  platform::Condition _changed;
  device::LocalDevice* _device GUARDED_BY(_mutex) = nullptr;  // while it is served
  Daemon* _daemon GUARDED_BY(_mutex) = nullptr;               // the same
  bool _expects GUARDED_BY(_mutex) = false;                   // from `expect` to `start`
  std::vector<Wish> _wishes GUARDED_BY(_mutex);               // in the order in which they came
  platform::StringSet _unwanted GUARDED_BY(_mutex);           // cancelled before they came
  std::deque<TransferRef> _waiting GUARDED_BY(_mutex);
  std::map<std::string, TransferRef, std::less<>> _transfers GUARDED_BY(_mutex);
  std::map<std::string, Result, std::less<>> _results GUARDED_BY(_mutex);
  std::size_t _working GUARDED_BY(_mutex) = 0;    // threads that have not run out of transfers
  std::size_t _taking GUARDED_BY(_mutex) = 0;     // threads that take part
  std::uint64_t _round GUARDED_BY(_mutex) = 0;    // grows with every start
  std::size_t _unsettled GUARDED_BY(_mutex) = 0;  // transfers that have room on the device
  std::size_t _blocked GUARDED_BY(_mutex) = 0;    // threads that wait for room
  bool _runsAhead GUARDED_BY(_mutex) = false;     // whether there is room or not
  bool _over GUARDED_BY(_mutex) = false;          // the threads end
  std::vector<std::thread> _threads;
  StopSignal::Subscription _stopped;
};

}  // namespace tsd
