#pragma once

#include <optional>

#include "tsd/CommonOptions.h"
#include "tsd/history/KeptRun.h"
#include "tsd/terminal/Console.h"

namespace tsd {

/// What a command runs with. Every command throws a `CommandError` when it cannot go on, writes data to standard
/// output (one JSON document when asked for) and everything else to the console.
struct CommandContext {
  const CommonOptions& options;
  Console& console;
  /// The run that the device keeps of a command that drives the plug-in or stands for somebody on the device; made when
  /// the command opens the device. Outlives the command.
  std::optional<KeptRun>& kept;
};

}  // namespace tsd
