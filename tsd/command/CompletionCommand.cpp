#include "tsd/command/Commands.h"
#include "tsd/help/Completion.h"

namespace tsd {

ExitCode runCompletion(const CommandContext&, const OptionTable& table, const CompletionOptions& options) {
  writeOutput(options.shell == "bash"  ? bashCompletion(table)
              : options.shell == "zsh" ? zshCompletion(table)
                                       : fishCompletion(table));
  return ExitCode::done;
}

}  // namespace tsd
