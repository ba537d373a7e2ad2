#include <algorithm>
#include <cstdlib>

#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/conduit/FileConduit.h"
#include "tsd/sync/HostTodo.h"
#include "tsd/sync/SyncRun.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

/// The document of the last sync, and with several all of them under "runs".
Value document(const std::string& command, const std::vector<SyncReport>& reports) {
  Value document = reports.back().document(command);
  if (reports.size() == 1) return document;
  Value runs = Value::makeArray();
  for (const auto& report : reports) runs.array()->append(report.document(command));
  document.dictionary()->set("runs", runs);
  return document;
}

void show(const CommandContext& context, const std::vector<SyncReport>& reports) {
  for (const auto& report : reports) {
    if (!report.message.empty()) context.console.message(report.message);
  }
  if (context.options.json) return writeDocument(document(context.options.command, reports));
  for (std::size_t run = 0; run < reports.size(); ++run) {
    if (reports.size() > 1) context.report("Sync " + std::to_string(run + 1) + "\n");
    context.report(reports[run].text(), reports[run].code);
  }
}

/// Tells what was done, and how the first sync that was not done ended.
ExitCode conclude(const CommandContext& context, const std::vector<SyncReport>& reports) {
  context.kept->conclude(reports.back().apps, reports.back().message);
  show(context, reports);
  auto undone =
      std::find_if(reports.begin(), reports.end(), [](const auto& each) { return each.code != ExitCode::done; });
  const ExitCode code = undone == reports.end() ? ExitCode::done : undone->code;
  // A device that is not quiet by the deadline cannot be closed properly; the next process to open it tidies up.
  if (reports.back().code == ExitCode::deadline) {
    context.kept->end(code);
    std::_Exit(static_cast<int>(code));
  }
  return code;
}

}  // namespace

ExitCode runSync(const CommandContext& context, const SyncOptions& options) {
  requireHostFolder(options.host);
  const auto wanted = readHostTodoList(options.host, context.console);
  StopSignal stop;
  Progress progress(context.console, context.options.progress);
  StopSignal::Subscription told(stop, [&] {
    context.console.message("stopping; a second signal ends at once");
    progress.headline("Ending the sync in order");
  });
  AppWatch watch(progress);
  Verdicts verdicts;
  TransferQueue queue({options.host + "/Packages", options.reports, options.transfers}, progress, stop);
  EarlyEnd earlyEnd(stop);
  DeviceSession session(context, {.folder = options.device,
                                  .deviceService = &queue,
                                  .changed = watch.listener(),
                                  .use = DeviceUse::kept,
                                  .earlyEnd = &earlyEnd});
  session.device().boundary().addJournal(
      {[&verdicts](const device::CallRecord& record) { verdicts.hear(record); }, device::JournalDetail::brief});
  StopSignal::Subscription putsOff(stop, [&] { session.device().putOffInstalls(); });
  Daemon daemon(session.device(), session.loadPlugin(stop), &earlyEnd);
  TransferQueue::Serving serving(queue, session.device(), daemon);
  daemon.postStartupNotification();

  std::vector<SyncReport> reports;
  while (reports.size() < options.repeat) {
    const SyncParts parts{context, options, session, daemon, queue, watch, verdicts, progress, stop};
    reports.push_back(SyncRun(parts, wanted).run());
    if (reports.back().code == ExitCode::cancelled || reports.back().code == ExitCode::deadline) break;
  }
  stop.letFinish();
  return conclude(context, reports);
}

}  // namespace tsd
