#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "device/LocalDevice.h"
#include "tsd/AssetReport.h"
#include "tsd/CommonOptions.h"
#include "tsd/Console.h"
#include "tsd/ExitCode.h"
#include "tsd/KeptRun.h"
#include "tsd/OptionTable.h"

namespace tsd {

/// What a command runs with. Every command throws a `CommandError` when it cannot go on, writes data to standard
/// output (one JSON document when asked for) and all else to the console.
struct CommandContext {
  const CommonOptions& options;
  Console& console;
  /// The run that the device keeps of a command that drives the plug-in or stands for somebody on the device; made when
  /// the command opens the device. Outlives the command.
  std::optional<KeptRun>& kept;
};

struct SampleOptions {
  std::string host;
  std::size_t apps = 8;
  std::uint64_t packageSize = 262144;  // bytes of one package, about
  std::uint64_t seed = 1;
  bool demo = false;
};
ExitCode runSample(const CommandContext& context, const SampleOptions& options);

struct DeviceOnlyOptions {
  std::string device;
};
ExitCode runInit(const CommandContext& context, const DeviceOnlyOptions& options);
ExitCode runStatus(const CommandContext& context, const DeviceOnlyOptions& options);
ExitCode runBackup(const CommandContext& context, const DeviceOnlyOptions& options);
ExitCode runClear(const CommandContext& context, const DeviceOnlyOptions& options);

struct SyncOptions {
  std::string device;
  std::string host;
  AssetReports reports;
  std::optional<bool> endPhase;  // what the phase is said to have ended with; absent: what happened
  bool daemonReports = false;
  std::size_t repeat = 1;
  std::size_t transfers = 2;  // packages in flight
};
ExitCode runSync(const CommandContext& context, const SyncOptions& options);

struct PlanOptions {
  std::string device;
  std::string host;
};
ExitCode runPlan(const CommandContext& context, const PlanOptions& options);

struct WhyOptions {
  std::string device;
  std::string app;
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
  std::string file;  // of the picture
};
ExitCode runHome(const CommandContext& context, const HomeOptions& options);

struct QueryOptions {
  std::string device;
  std::string question;  // "metrics", "accounts", "vantor-ids" or "disabled-asset-types"
};
ExitCode runQuery(const CommandContext& context, const QueryOptions& options);

struct SetOptions {
  std::string device;
  std::vector<std::string> settings;  // KEY=VALUE
};
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
  std::string package;  // of --finish; empty: the store has one of its own
  device::StoreInstall install;
};
ExitCode runStore(const CommandContext& context, const StoreOptions& options);

struct CompletionOptions {
  std::string shell;  // "bash", "zsh" or "fish"
};
ExitCode runCompletion(const CommandContext& context, const OptionTable& table, const CompletionOptions& options);

struct ManualOptions {
  std::string folder;
};
ExitCode runManual(const CommandContext& context, const OptionTable& table, const ManualOptions& options);

}  // namespace tsd
