#include "tests/RestoreScenario.h"

#include <gtest/gtest.h>

#include <chrono>

#include "platform/Clock.h"
#include "plist/PropertyList.h"

namespace tests {

PluginRig::Options optionsOf(const RestoreScenario& scenario) {
  PluginRig::Options options;
  options.process = scenario.process;
  options.rules = scenario.rules;
  for (const auto& failure : scenario.failures) options.rules.push_back(failure.rule());
  for (const auto& app : scenario.apps) {
    if (app.neverReported) options.rules.push_back("coordinatorDidInstallPlaceholder:" + app.id + "=none");
  }
  return options;
}

static Value metadataOf(const RestoreApp& app) {
  Value metadata = Value::makeDictionary();
  for (const auto& [key, value] : app.metadata) metadata.dictionary()->set(key, value);
  metadata = filledOut(metadata, app.content.metadataKeys, app.content.seed);
  switch (app.entry) {
    case RestoreApp::Entry::metadataIsNoList:
      return Value::makeData("no property list");
    case RestoreApp::Entry::metadataIsNoDictionary:
      return Value::makeData(binaryList(arrayOf({"title"})));
    default:
      return Value::makeData(plist::writeXML(metadata).value());
  }
}

static Value entryOf(const RestoreApp& app) {
  if (app.entry == RestoreApp::Entry::notADictionary) return "not a dictionary";
  Value entry = Value::makeDictionary();
  if (app.entry != RestoreApp::Entry::noMetadata) entry.dictionary()->set("HarluneMetadata", metadataOf(app));
  if (app.hasRights) entry.dictionary()->set("ApplicationSINF", Value::makeData("rights"));
  if (app.hasIcon) entry.dictionary()->set("PlaceholderIcon", Value::makeData(iconImage()));
  return filledOut(entry, app.content.entryKeys, app.content.seed);
}

void writeRestoreLists(PluginRig& rig, const RestoreScenario& scenario) {
  Value list = Value::makeDictionary();
  std::vector<std::string> automatic;
  std::vector<std::string> intentional;
  for (const auto& app : scenario.apps) {
    list.dictionary()->set(app.id, entryOf(app));
    if (app.demotedAutomatically) automatic.push_back(app.id);
    if (app.demotedByHand) intentional.push_back(app.id);
  }
  Value demoted = Value::makeDictionary();
  if (!automatic.empty()) demoted.dictionary()->set("AutomaticDowngrades", arrayOf(automatic));
  if (!intentional.empty()) demoted.dictionary()->set("IntentionalDowngrades", arrayOf(intentional));
  for (const char* earlier : {restoreListPath, restoreLogPath}) rig.device().files().removeItem(earlier);
  if (scenario.hasList) rig.write(restoreListPath, scenario.rawList ? *scenario.rawList : binaryList(list));
  rig.write(demotedAppsPath, scenario.rawDemotedList ? *scenario.rawDemotedList : plist::writeXML(demoted).value());
  rig.device().files().createDirectory("/var/mobile/Library/Logs/MediaServices", true, {});
}

RestoreOutcome run(PluginRig& rig, const RestoreScenario& scenario) {
  if (scenario.chooser) rig.events().setChooser(scenario.chooser);
  for (const auto& [key, value] : scenario.settings) EXPECT_TRUE(rig.device().set(key, value));
  writeRestoreLists(rig, scenario);
  rig.postStartup();

  RestoreOutcome outcome;
  ErrorRef error = platform::makeError("Test", 1, "an error from before the call");
  auto begin = rig.platform().clock.now();
  outcome.accepted = rig.daemon().reconcileRestoreOfType(scenario.type, &error);
  outcome.waited = std::chrono::duration_cast<std::chrono::seconds>(rig.platform().clock.now() - begin).count();
  rig.deliver();
  outcome.cancelled = cancellationsIn(rig.records());
  auto status = rig.device().status();
  outcome.open = openCoordinators(status);
  for (const auto& app : status.apps) {
    if (app.isOnDevice())
      outcome.present[app.id] = device::nameOfState(app.state) + (' ' + std::to_string(app.installType));
  }
  outcome.filedAway = rig.exists(restoreLogPath) && !rig.exists(restoreListPath);
  if (error) outcome.error = error->domain();
  return outcome;
}

std::string RestoreOutcome::text() const {
  std::string text;
  for (const auto& each : cancelled) text += "cancelled [" + each + "]; ";
  for (const auto& each : open) text += "open [" + each + "]; ";
  for (const auto& [app, state] : present) text += app + " is " + state + "; ";
  text += "waited " + std::to_string(waited) + "; ";
  if (!accepted) text += "not accepted; ";
  if (filedAway) text += "filed away; ";
  if (!error.empty()) text += "error " + error + "; ";
  return text;
}

}  // namespace tests
