#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "device/LocalDevice.h"
#include "tsd/ExitCode.h"
#include "tsd/OptionTable.h"
#include "tsd/daemon/CommandContext.h"
#include "tsd/sample/SampleHost.h"
#include "tsd/sync/SyncOptions.h"

namespace tsd {

ExitCode runSample(const CommandContext& context, const SampleOptions& options);

struct HostOptions {
  std::string action;  // "new", "add", "remove" or "check"
  std::string host;
  std::vector<std::string> items;  // packages and folders of apps, or identifiers
  bool restore = false;
  std::string demoted;  // "by-hand", "automatically" or "both"; empty: not at all
  bool replace = false;
  bool uninstall = false;
};
ExitCode runHost(const CommandContext& context, const HostOptions& options);

struct PackOptions {
  std::string folder;
  std::string file;  // of the package
  bool replace = false;
};
ExitCode runPack(const CommandContext& context, const PackOptions& options);

struct DeviceOnlyOptions {
  std::string device;
};
ExitCode runInit(const CommandContext& context, const DeviceOnlyOptions& options);
ExitCode runRuns(const CommandContext& context, const DeviceOnlyOptions& options);
ExitCode runStatus(const CommandContext& context, const DeviceOnlyOptions& options);
ExitCode runBackup(const CommandContext& context, const DeviceOnlyOptions& options);
ExitCode runClear(const CommandContext& context, const DeviceOnlyOptions& options);

ExitCode runSync(const CommandContext& context, const SyncOptions& options);

struct ReplayOptions {
  std::string file;
  bool goOn = false;
  std::vector<std::string> ignored;  // "messages", "steps"
};
ExitCode runReplay(const CommandContext& context, const ReplayOptions& options);

struct RecordingOptions {
  std::string action;  // "show", "journal", "redact"
  std::string file;
  std::string output{};  // of redact
};
ExitCode runRecording(const CommandContext& context, const RecordingOptions& options);

struct PlanOptions {
  std::string device;
  std::string host;
};
ExitCode runPlan(const CommandContext& context, const PlanOptions& options);

struct WhyOptions {
  std::string device;
  std::string app;        // its identifier, name, or an unambiguous part of either
  std::uint64_t run = 0;  // the number of the run to tell of; 0: the last that mentions the app
  bool all = false;       // all runs that mention it
};
ExitCode runWhy(const CommandContext& context, const WhyOptions& options);

struct RestoreOptions {
  std::string device;
  std::string host;
  std::int32_t type = 2;
  bool inDaemon = false;
};
ExitCode runRestore(const CommandContext& context, const RestoreOptions& options);

struct HomeOptions {
  std::string device;
  std::string file;  // of the picture; "-" for standard output, empty for one of text
  bool dark = false;
};
ExitCode runHome(const CommandContext& context, const HomeOptions& options);

struct ReportOptions {
  std::string device;     // or a recording
  std::uint64_t run = 0;  // its number; 0: the last sync or restore
  std::string file;       // of the page; "-" for standard output
  std::string version;    // of the program
};
ExitCode runReport(const CommandContext& context, const ReportOptions& options);

struct WatchOptions {
  std::string device;
  bool untilIdle = false;
};
ExitCode runWatch(const CommandContext& context, const WatchOptions& options);

struct QueryOptions {
  std::string device;
  std::string question;  // "metrics", "accounts", "vantor-ids" or "disabled-asset-types"
};
ExitCode runQuery(const CommandContext& context, const QueryOptions& options);

struct SetOptions {
  std::string device;
  std::vector<std::string> settings;  // KEY=VALUE; none: the settings are only shown
};
std::vector<std::string> settingWords();
ExitCode runSet(const CommandContext& context, const SetOptions& options);

struct UninstallOptions {
  std::string device;
  std::string app;
};
ExitCode runUninstall(const CommandContext& context, const UninstallOptions& options);

struct StoreOptions {
  std::string device;
  std::string app;
  bool finish = false;
  std::string package;  // of --finish; empty: the store uses its own
  device::StoreInstall install;
};
ExitCode runStore(const CommandContext& context, const StoreOptions& options);

struct CompletionOptions {
  std::string shell;  // "bash", "zsh" or "fish"
};
ExitCode runCompletion(const CommandContext& context, const OptionTable& table, const CompletionOptions& options);

struct PointsOptions {};
ExitCode runPoints(const CommandContext& context, const OptionTable& table, const PointsOptions& options);

struct ManualOptions {
  std::string folder;
};
ExitCode runManual(const CommandContext& context, const OptionTable& table, const ManualOptions& options);

}  // namespace tsd
