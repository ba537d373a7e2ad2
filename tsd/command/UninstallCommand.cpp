#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/daemon/DeviceSession.h"
#include "tsd/terminal/Output.h"

namespace tsd {

ExitCode runUninstall(const CommandContext& context, const UninstallOptions& options) {
  DeviceSession session(context, {.folder = options.device, .use = DeviceUse::kept});
  platform::ErrorRef error;
  if (!session.device().uninstallByPerson(options.app, &error)) {
    throw CommandError(textOf(error));
  }
  session.settle();
  if (context.options.json) {
    auto document = startDocument(context.options.command);
    document.dictionary()->set("result", "done");
    document.dictionary()->set("app", options.app);
    writeDocument(document);
  } else {
    context.report(printable(options.app) + ": uninstalled by the person\n");
  }
  return ExitCode::done;
}

}  // namespace tsd
