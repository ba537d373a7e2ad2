#include <set>

#include "tsd/command/Commands.h"
#include "tsd/daemon/Daemon.h"
#include "tsd/daemon/DeviceSession.h"
#include "tsd/terminal/Output.h"

namespace tsd {
namespace {

std::set<std::string> appsOn(device::LocalDevice& device) {
  std::set<std::string> ids;
  for (const auto& app : device.status().apps) {
    if (app.isOnDevice()) ids.insert(app.id);
  }
  return ids;
}

}  // namespace

ExitCode runClear(const CommandContext& context, const DeviceOnlyOptions& options) {
  DeviceSession session(context, {.folder = options.device, .use = DeviceUse::kept});
  Daemon daemon(session.device(), session.loadPlugin());
  daemon.postStartupNotification();
  auto before = appsOn(session.device());
  daemon.clearSyncData();
  session.settle();
  auto after = appsOn(session.device());
  std::vector<std::string> removed;
  for (const auto& id : before) {
    if (!after.count(id)) removed.push_back(id);
  }
  if (context.options.json) {
    auto document = startDocument(context.options.command);
    document.dictionary()->set("result", "done");
    document.dictionary()->set("removed", arrayOf(removed));
    writeDocument(document);
    return ExitCode::done;
  }
  for (const auto& id : removed) context.report("Removed the placeholder of " + printable(id) + "\n");
  context.report("All sync data is cleared.\n");
  return ExitCode::done;
}

}  // namespace tsd
