#include <algorithm>
#include <filesystem>

#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/conduit/WholeFile.h"
#include "tsd/daemon/DeviceView.h"
#include "tsd/history/RunHistory.h"
#include "tsd/report/RecordingDocument.h"
#include "tsd/report/ReportDocument.h"
#include "tsd/report/ReportPage.h"
#include "tsd/terminal/Output.h"

namespace tsd {
namespace {

/// The run of that number, or the last that was a sync or a restore, or else the last.
RunSummary chosenRun(const std::string& device, const std::vector<RunSummary>& runs, std::uint64_t number) {
  if (runs.empty()) throw CommandError(device + ": the device has no kept run to report on");
  auto fits = [&](const RunSummary& run) {
    return number ? run.number == number : run.command == "sync" || run.command == "restore";
  };
  auto found = std::find_if(runs.rbegin(), runs.rend(), fits);
  if (found != runs.rend()) return *found;
  if (!number) return runs.back();
  throw CommandError(device + ": there is no run " + std::to_string(number) + "; the kept runs are " +
                     std::to_string(runs.front().number) + " to " + std::to_string(runs.back().number));
}

/// `run` is zero for a recording.
void writePage(const CommandContext& context, const std::string& file, const platform::Value& report, std::uint64_t run,
               const std::string& what) {
  const std::string page = reportPage(report);
  if (file == "-") return writeOutput(page);
  writeWholeFile(file, page);
  if (context.options.json) {
    auto document = startDocument(context.options.command);
    document.dictionary()->set("result", "done");
    document.dictionary()->set("file", file);
    document.dictionary()->set("run", run ? platform::Value(run) : platform::Value());
    return writeDocument(document);
  }
  context.report(printable(file) + ": " + what + ".\n");
}

ExitCode reportRecording(const CommandContext& context, const ReportOptions& options) {
  if (options.run)
    throw CommandError(ExitCode::usage, "--run: " + options.device + " is a recording, which has no runs");
  const auto name = std::filesystem::path(options.device).filename().string();
  writePage(context, options.file, recordingDocument(name, readWholeFile(options.device), options.version), 0,
            "recording " + printable(name));
  return ExitCode::done;
}

}  // namespace

ExitCode runReport(const CommandContext& context, const ReportOptions& options) {
  std::error_code problem;
  if (std::filesystem::is_regular_file(options.device, problem)) return reportRecording(context, options);
  DeviceView view(context, options.device);
  auto runs = keptRuns(options.device, context.console.problems());
  ReportSubject subject;
  subject.run = chosenRun(options.device, runs, options.run);
  subject.isLast = subject.run.number == runs.back().number;
  subject.isRunning = view.holder().has_value();
  subject.now = view.status();
  subject.version = options.version;
  subject.deviceName = std::filesystem::weakly_canonical(options.device, problem).filename().string();
  if (subject.deviceName.empty()) subject.deviceName = options.device;
  writePage(context, options.file, reportDocument(subject, view.device()), subject.run.number,
            "run " + std::to_string(subject.run.number) + ", " + printable(subject.run.command));
  return ExitCode::done;
}

}  // namespace tsd
