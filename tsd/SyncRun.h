#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "platform/RVClient.h"
#include "tsd/AppWatch.h"
#include "tsd/Commands.h"
#include "tsd/Daemon.h"
#include "tsd/DeviceSession.h"
#include "tsd/Progress.h"
#include "tsd/StopSignal.h"
#include "tsd/SyncReport.h"
#include "tsd/TransferQueue.h"

namespace tsd {

/// Everything that takes part in a sync. The parts outlive the run.
struct SyncParts {
  const CommandContext& context;
  const SyncOptions& options;
  DeviceSession& session;
  Daemon& daemon;
  TransferQueue& queue;
  AppWatch& watch;
  Progress& progress;
  StopSignal& stop;
};

/// One sync from the host's files to its report, on the daemon's thread. Run once.
class SyncRun {
 public:
  explicit SyncRun(const SyncParts& parts) : _parts(parts) {}

  /// Throws a `CommandError` when the host's files cannot be pushed; the sync has not begun then.
  SyncReport run();

 private:
  bool begin();
  void requestPackages();
  void recordPackagePaths();
  void transferPackages();
  bool transferPhaseSucceeded() const;
  void awaitOutcomes();
  void sendInstallReports();
  void removeLeftPackages();
  void fillReport();

  /// Reads the todo list again when anything changed since, and tells the display of outcomes that are new.
  void showOutcomes(bool always);
  AppOutcome outcomeOf(const std::string& id, const std::string& mark) const;
  AppOutcome outcomeOfKept(const TodoEntry& entry) const;
  std::string reasonForSkipping(const std::string& id) const;
  std::set<std::string> appsOnDevice() const;

  const SyncParts _parts;
  SyncReport _report;
  std::chrono::steady_clock::time_point _began;
  std::set<std::string> _before;   // apps on the device
  std::vector<TodoEntry> _wanted;  // the todo list as the host gave it
  std::vector<platform::TSAssetRef> _assets;
  std::set<std::string> _requested;
  std::map<std::string, platform::RVClientIdentifier> _openInstalls;  // at the end, and whose they are
  std::map<std::string, std::string> _reportedReasons;                // of installs that the daemon reported as failed
  std::vector<TodoEntry> _todo;                                       // as it was read last
  std::uint64_t _changesRead = 0;                                     // of the watch, when the list was read last
  bool _deadlinePassed = false;
  bool _phase = false;  // what the transfer phase is said to have ended with
};

}  // namespace tsd
