#include "platform/DevicePaths.h"
#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/conduit/FileConduit.h"
#include "tsd/daemon/DeviceSession.h"
#include "tsd/terminal/Output.h"

namespace tsd {
namespace {

bool hasOpenInstall(device::LocalDevice& device, const std::string& id) {
  auto app = device.app(id);
  if (app && (app->state == device::AppState::placeholder || app->state == device::AppState::updating)) return true;
  for (const auto& coordinator : device.status().coordinators) {
    if (coordinator.app == id) return true;
  }
  return false;
}

void finish(const CommandContext& context, DeviceSession& session, const StoreOptions& options) {
  std::string path;
  if (!options.package.empty()) {
    if (!isFileName(options.app)) throw CommandError(options.app + ": cannot be a package's name");
    path = std::string(platform::packagesDirectory) + "/" + options.app + ".pkg";
    FileConduit(session.files(), context.console).pushFile(options.package, path);
  }
  auto& device = session.device();
  platform::ErrorRef error;
  // An app that the store has not begun with is begun and finished in one go.
  bool begun = hasOpenInstall(device, options.app) || device.beginStoreInstall(options.app, options.install, &error);
  bool done = begun && device.finishStoreInstall(options.app, path, &error);
  device.events().drain();
  if (!path.empty() && session.files().fileExists(path)) session.files().removeItem(path);
  if (!done) throw CommandError(textOf(error));
}

}  // namespace

ExitCode runStore(const CommandContext& context, const StoreOptions& options) {
  DeviceSession session(context, {.folder = options.device, .use = DeviceUse::kept});
  auto& device = session.device();
  if (options.finish) {
    finish(context, session, options);
  } else {
    platform::ErrorRef error;
    if (!device.beginStoreInstall(options.app, options.install, &error)) {
      throw CommandError(textOf(error));
    }
  }
  session.settle();
  auto app = device.app(options.app);
  if (context.options.json) {
    auto document = startDocument(context.options.command);
    document.dictionary()->set("result", "done");
    document.dictionary()->set("app", options.app);
    document.dictionary()->set("state", device::nameOfState(app ? app->state : device::AppState::gone));
    document.dictionary()->set("version", app ? app->version : "");
    writeDocument(document);
  } else {
    context.report(printable(options.app) + ": the store has " + (options.finish ? "finished" : "started") +
                   " its install\n");
  }
  return ExitCode::done;
}

}  // namespace tsd
