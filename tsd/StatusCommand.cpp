#include "tsd/CommandError.h"
#include "tsd/Commands.h"
#include "tsd/DeviceSession.h"
#include "tsd/Output.h"

namespace tsd {

using platform::Value;

namespace {

/// The canonical state: nothing in it differs between two devices with the same apps.
Value document(const device::DeviceStatus& status) {
  Value document = startDocument("");
  auto& entries = *document.dictionary();
  Value apps = Value::makeArray();
  for (const auto& app : status.apps) {
    if (app.state.empty()) continue;
    auto& item = apps.array()->appendDictionary();
    item.set("id", app.id);
    item.set("version", app.version);
    item.set("state", app.state);
    item.set("installType", app.installType);
    item.set("type", app.type);
  }
  entries.set("apps", apps);
  Value coordinators = Value::makeArray();
  for (const auto& coordinator : status.coordinators) {
    auto& item = coordinators.array()->appendDictionary();
    item.set("app", coordinator.app);
    item.set("kind", coordinator.kind);
    item.set("client", coordinator.client);
  }
  entries.set("coordinators", coordinators);
  entries.set("home", arrayOf(status.home));
  entries.set("syncing", status.syncing);
  return document;
}

std::string lastOutcomeText(const device::AppStatus& app) {
  if (app.lastOutcome == "INSTALLED") return "installed";
  if (app.lastOutcome == "FAILED") return "failed";
  if (app.lastOutcome == "CANCELED") return "cancelled";
  return app.lastOutcome;
}

std::string text(const device::DeviceStatus& status) {
  std::string text;
  Table apps({{"APP"}, {"NAME", 12}, {"VERSION", 7}, {"STATE"}, {"LAST OUTCOME"}});
  for (const auto& app : status.apps) {
    apps.add({app.id, app.name, app.version, app.state.empty() ? "-" : app.state, lastOutcomeText(app)});
  }
  text += apps.empty() ? "No apps.\n" : apps.text();
  for (const auto& app : status.apps) {
    if (!app.lastReason.empty()) text += printable(app.id) + ": " + printable(reasonForPeople(app.lastReason)) + "\n";
  }
  if (!status.coordinators.empty()) {
    Table open({{"OPEN COORDINATOR"}, {"KIND"}, {"CLIENT"}});
    for (const auto& each : status.coordinators) open.add({each.app, each.kind, std::to_string(each.client)});
    text += "\n" + open.text();
  }
  if (status.syncing != 0) text += "\nThe home screen shows that a sync is running.\n";
  return text;
}

}  // namespace

ExitCode runStatus(const CommandContext& context, const DeviceOnlyOptions& options) {
  DeviceSession session(context, {options.device, "com.vantor.tsd", nullptr, nullptr});
  auto status = session.device().status();
  if (context.options.json)
    writeDocument(document(status));
  else
    writeOutput(text(status));
  return ExitCode::done;
}

}  // namespace tsd
