#include "tsd/command/Commands.h"
#include "tsd/terminal/Output.h"

namespace tsd {

ExitCode runPoints(const CommandContext&, const OptionTable& table, const PointsOptions&) {
  std::string text;
  for (const auto& point : table.points) text += point + "\n";
  writeOutput(text);
  return ExitCode::done;
}

}  // namespace tsd
