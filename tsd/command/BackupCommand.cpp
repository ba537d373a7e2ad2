#include "tsd/command/Commands.h"
#include "tsd/daemon/Daemon.h"
#include "tsd/daemon/DeviceSession.h"
#include "tsd/terminal/Output.h"

namespace tsd {

ExitCode runBackup(const CommandContext& context, const DeviceOnlyOptions& options) {
  DeviceSession session(context, {.folder = options.device, .use = DeviceUse::kept});
  Daemon daemon(session.device(), session.loadPlugin());
  daemon.postStartupNotification();
  daemon.prepareForBackup();
  session.settle();
  if (context.options.json) {
    auto document = startDocument(context.options.command);
    document.dictionary()->set("result", "done");
    writeDocument(document);
  } else {
    context.report(noteLine("", "The apps' store metadata is ready for a backup."));
  }
  return ExitCode::done;
}

}  // namespace tsd
