#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "tsd/ExitCode.h"
#include "tsd/daemon/AppWatch.h"
#include "tsd/daemon/CommandContext.h"
#include "tsd/daemon/Daemon.h"
#include "tsd/daemon/DeviceSession.h"
#include "tsd/daemon/TransferQueue.h"
#include "tsd/history/Verdicts.h"
#include "tsd/stopping/StopSignal.h"
#include "tsd/sync/SyncOptions.h"
#include "tsd/sync/SyncReport.h"
#include "tsd/terminal/Progress.h"

namespace tsd {

/// Everything that takes part in a sync. The parts outlive the run.
struct SyncParts {
  const CommandContext& context;
  const SyncOptions& options;
  DeviceSession& session;
  Daemon& daemon;
  TransferQueue& queue;
  AppWatch& watch;
  Verdicts& verdicts;
  Progress& progress;
  StopSignal& stop;
};

/// One sync from the host's files to its report, on the daemon's thread. Run once.
class SyncRun {
 public:
  /// `wanted` is the host's todo list, which outlives the run.
  SyncRun(const SyncParts& parts, const std::vector<TodoEntry>& wanted) : _parts(parts), _wanted(wanted) {}

  SyncReport run();

 private:
  bool pushHost();
  void sync();
  bool begin();
  void requestPackages();
  void recordPackagePaths();
  void transferPackages();
  bool transferPhaseSucceeded() const;
  /// In which a sign of life is to come, by what has been sent.
  std::chrono::seconds timeForOutcomes() const;
  void awaitOutcomes();
  void sendInstallReports();
  void removeLeftPackages();
  void fillReport();

  /// Reads the todo list again if anything changed since, and passes new outcomes to the display.
  std::uint64_t signsOfLife() const;
  void showOutcomes(bool always);
  std::string whyBroken() const;
  ExitCode code() const;
  std::set<std::string> appsOnDevice() const;

  const SyncParts _parts;
  const std::vector<TodoEntry>& _wanted;
  SyncReport _report;
  std::chrono::steady_clock::time_point _began;
  std::set<std::string> _before;  // apps on the device
  std::vector<platform::TSAssetRef> _assets;
  std::map<std::string, std::string> _reportedReasons;  // of installs that the daemon reported as failed
  std::vector<TodoEntry> _todo;                         // as it was read last
  std::uint64_t _signsShown = 0;                        // when the list was read last
  bool _isTaken = false;  // the host's list is on the device; before that, what lies there is from an earlier sync
  bool _deadlinePassed = false;
  bool _phase = false;  // how the transfer phase is reported to have ended
};

}  // namespace tsd
