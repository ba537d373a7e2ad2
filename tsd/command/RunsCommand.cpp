#include <algorithm>

#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/daemon/DeviceView.h"
#include "tsd/history/RunHistory.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

std::string endText(const RunSummary& run) {
  std::string text = endOf(run);
  if (!run.ended) return text;
  std::string counts = run.counts.text();
  if (!counts.empty()) text += ": " + counts;
  return run.message.empty() ? text : text + ": " + run.message;
}

Value document(const CommandContext& context, const std::vector<RunSummary>& runs) {
  Value document = startDocument(context.options.command);
  document.dictionary()->set("result", "done");
  Value array = Value::makeArray();
  for (const auto& run : runs) {
    auto& item = array.array()->appendDictionary();
    item.set("number", run.number);
    item.set("command", run.command);
    item.set("arguments", arrayOf(run.arguments));
    item.set("began", run.began);
    if (run.ended) {
      item.set("ended", *run.ended);
      item.set("result", run.result);
      if (run.exitCode) item.set("exitCode", *run.exitCode);
      item.set("counts", run.counts.document());
    }
    if (!run.message.empty()) item.set("message", run.message);
  }
  document.dictionary()->set("runs", array);
  return document;
}

std::string text(const std::vector<RunSummary>& runs) {
  if (runs.empty()) return "No runs.\n";
  std::string text;
  for (const auto& run : runs) {
    std::string number = std::to_string(run.number);
    text += noteLine(std::string(4 - std::min<std::size_t>(4, number.size()), ' ') + number + "  " +
                         dayAndTime(run.began) + "  " + fitted(run.command, 9) + "  ",
                     endText(run));
  }
  return text;
}

}  // namespace

ExitCode runRuns(const CommandContext& context, const DeviceOnlyOptions& options) {
  DeviceLock::requireDevice(options.device);
  auto runs = runsOfDevice(options.device, context.console.problems());
  if (context.options.json)
    writeDocument(document(context, runs));
  else
    writeOutput(text(runs));
  return ExitCode::done;
}

}  // namespace tsd
