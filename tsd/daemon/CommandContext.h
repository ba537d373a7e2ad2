#pragma once

#include <optional>
#include <string_view>

#include "tsd/CommonOptions.h"
#include "tsd/ExitCode.h"
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

  /// Writes what people read of something that was done, unless they want it quiet: what they asked for is written
  /// whatever they want.
  void report(std::string_view text) const {
    if (!options.quiet) writeOutput(text);
  }
  /// The same of something that may not have been done as it should: its last line is then told on the console at
  /// least.
  void report(std::string_view text, ExitCode code) const;
};

}  // namespace tsd
