#include <algorithm>

#include "tsd/command/Commands.h"
#include "tsd/terminal/Output.h"
#include "tsd/terminal/TerminalText.h"

namespace tsd {

ExitCode runPoints(const CommandContext&, const OptionTable& table, const PointsOptions&) {
  std::size_t width = 0;
  for (const auto& point : table.calls) width = std::max(width, columnsOf(point.name));
  std::string text;
  for (const auto& point : table.calls) text += noteLine(fitted(point.name, width) + "  ", point.calls);
  writeOutput(text);
  return ExitCode::done;
}

}  // namespace tsd
