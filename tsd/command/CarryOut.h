#pragma once

#include <functional>
#include <string>
#include <vector>

#include "tsd/CommonOptions.h"
#include "tsd/ExitCode.h"
#include "tsd/daemon/CommandContext.h"

namespace tsd {

/// A subcommand with its own options. May throw what any command throws.
using CommandRun = std::function<ExitCode(const CommandContext&)>;

/// Runs a subcommand. Every failure ends here, as a message and, when asked for, a document; a run that the device
/// keeps is ended with it. `rules` are the texts of the injection rules, which `options` get.
ExitCode carryOut(const CommandRun& run, const std::vector<std::string>& rules, CommonOptions& options,
                  Console& console);

}  // namespace tsd
