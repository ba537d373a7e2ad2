#include <algorithm>
#include <cmath>

#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/daemon/DeviceView.h"
#include "tsd/history/InstallEnd.h"
#include "tsd/history/RunHistory.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

/// The canonical state: nothing in it differs between two devices with the same apps.
Value document(const device::DeviceStatus& status) {
  Value document = startDocument("");
  auto& entries = *document.dictionary();
  Value apps = Value::makeArray();
  for (const auto& app : status.apps) {
    if (!app.isOnDevice()) continue;
    auto& item = apps.array()->appendDictionary();
    item.set("id", app.id);
    item.set("version", app.version);
    item.set("state", device::nameOfState(app.state));
    item.set("installType", app.installType);
    item.set("type", app.type);
  }
  entries.set("apps", apps);
  Value coordinators = Value::makeArray();
  for (const auto& coordinator : status.coordinators) {
    auto& item = coordinators.array()->appendDictionary();
    item.set("app", coordinator.app);
    item.set("kind", device::shortNameOfKind(coordinator.kind));
    item.set("client", coordinator.client);
  }
  entries.set("coordinators", coordinators);
  entries.set("home", arrayOf(status.home));
  entries.set("syncing", status.syncing);
  return document;
}

std::string lastOutcomeText(const device::AppStatus& app) {
  return app.lastOutcome == device::InstallOutcome::none ? "" : wordsOf(endOf(app).outcome);
}

/// "placeholder, 43 %"
std::string stateText(const device::AppStatus& app) {
  if (!app.isOnDevice()) return "-";
  auto percent = static_cast<int>(std::floor(app.progress * 100));
  bool isMoving = app.state != device::AppState::installed && percent > 0;
  return std::string(device::nameOfState(app.state)) + (isMoving ? ", " + std::to_string(percent) + " %" : "");
}

/// Why the home screen shows a sync: it does so from the beginning of a restore until a sync has ended.
std::string syncingText(const std::vector<RunSummary>& runs) {
  constexpr const char* shown = "The home screen shows that a sync is running";
  auto last = std::find_if(runs.rbegin(), runs.rend(),
                           [](const auto& run) { return run.command == "sync" || run.command == "restore"; });
  if (last == runs.rend()) return std::string(shown) + ", but none is.";
  return std::string(shown) + ", but none is: " + (last->ended ? "" : "a killed ") + last->command + " " +
         std::to_string(last->number) + " left it so, until the next sync ends.";
}

std::string text(const DeviceView& view, const std::vector<RunSummary>& runs) {
  const device::DeviceStatus& status = view.status();
  std::string text;
  Table apps(
      {{"APP", 9, true}, {"NAME", 4}, {"VERSION", 4}, {"STATE", 9, false, true}, {"LAST OUTCOME", 6, false, true}});
  for (const auto& app : status.apps) {
    apps.add({app.id, app.name, app.version, stateText(app), lastOutcomeText(app)});
  }
  text += apps.empty() ? "No apps.\n" : apps.text();
  for (const auto& app : status.apps) {
    if (!app.lastReason.empty()) text += noteLine(printable(app.id) + ": ", endOf(app).reason);
  }
  if (!status.coordinators.empty()) {
    Table open({{"OPEN COORDINATOR", 12, true}, {"KIND"}, {"CLIENT"}});
    for (const auto& each : status.coordinators)
      open.add({each.app, device::shortNameOfKind(each.kind), std::to_string(each.client)});
    text += "\n" + open.text();
  }
  if (status.syncing != 0)
    text += "\n" + noteLine("", view.holder() ? "The home screen shows that a sync is running." : syncingText(runs));
  if (view.holder()) text += "\n" + view.holderText();
  return text;
}

}  // namespace

ExitCode runStatus(const CommandContext& context, const DeviceOnlyOptions& options) {
  DeviceView view(context, options.device);
  if (context.options.json) {
    Value answer = document(view.status());
    view.addHolder(answer);
    writeDocument(answer);
  } else {
    writeOutput(text(view, keptRuns(options.device, context.console.problems())));
  }
  return ExitCode::done;
}

}  // namespace tsd
