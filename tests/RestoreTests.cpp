#include <gtest/gtest.h>

#include <algorithm>

#include "platform/InstallCoordination.h"
#include "plist/PropertyList.h"
#include "tests/ScenarioTable.h"

namespace tests {
namespace {

using Entry = RestoreApp::Entry;
using Kind = platform::RVCoordinatorKind;
using Lines = std::vector<std::string>;

Bytes list(const Value& value) { return plist::writeXML(value).value(); }

TEST(Restore, EveryAppIsWhatItWas) {
  RestoreScenario scenario{
      .apps = {{.id = "app.plain", .metadata = {{"title", "T"}, {"itemName", "I"}, {"bundleVersion", "3.1"}}},
               {.id = "app.named", .metadata = {{"itemName", "I"}, {"launchProhibited", true}}},
               {.id = "app.hand", .demotedByHand = true, .metadata = {{"title", 5}}},
               {.id = "app.auto",
                .demotedAutomatically = true,
                .metadata = {{"OBApplicationLaunchProhibited", false}, {"launchProhibited", true}}},
               {.id = "app.both", .demotedAutomatically = true, .demotedByHand = true}}};
  PluginRig rig(optionsOf(scenario));
  rig.write(restoreLogPath, "an older list");
  auto outcome = run(rig, scenario);
  EXPECT_EQ(outcome.text(),
            "open [app.named restoring]; open [app.plain restoring]; app.auto is placeholder 7; app.both is "
            "placeholder 7; app.hand is placeholder 8; app.named is placeholder 2; app.plain is placeholder 2; waited "
            "0; filed away; ");
  EXPECT_EQ(rig.device().status().home.size(), 5u);
  EXPECT_EQ(rig.device().status().syncing, 1u);

  // The list is used once.
  EXPECT_TRUE(rig.reconcileRestore(2));
  EXPECT_EQ(rig.countOf("tessaroShouldCreateAppPlaceholdersWithError"), 2u);
  EXPECT_EQ(rig.countOf("makeAppPlaceholder"), 5u);
}

TEST(Restore, WhatIsAskedAndWhatIsThere) {
  const std::string one = "open [app.a restoring]; app.a is placeholder 2; waited 0; filed away; ";
  const Lines skipped = {"no harlune restore plist found - skipping processing of harlune restored apps"};
  expectRows<RestoreScenario>({
      {.given = {.name = "type 3", .apps = {{.id = "app.a"}}, .type = 3}, .outcome = one},
      {.given = {.name = "another type", .apps = {{.id = "app.a"}}, .type = 1, .settings = {{"backup-error", "yes"}}},
       .outcome = "waited 0; ",
       .says = {"reconcileRestoreOfType 1"},
       .neverSays = {"Will not*", "*harlune*"}},
      {.given = {.name = "the backup service declines",
                 .apps = {{.id = "app.a"}},
                 .type = 3,
                 .settings = {{"backup-placeholders", "no"}}},
       .outcome = "waited 0; ",
       .says = {"Will not reconcile restore of type 3 - error (null)"}},
      {.given = {.name = "declines with an error",
                 .apps = {{.id = "app.a"}},
                 .type = 3,
                 .settings = {{"backup-placeholders", "no"}, {"backup-error", "yes"}}},
       .outcome = "waited 0; error BackupService; ",
       .says = {"Will not reconcile restore of type 3 - error BackupService *"}},
      {.given = {.name = "agrees with an error",
                 .apps = {{.id = "app.a"}},
                 .rules = {"tessaroShouldCreateAppPlaceholdersWithError=error"}},
       .outcome = one + "error Injection; "},
      {.given = {.name = "no list", .apps = {{.id = "app.a"}}, .hasList = false},
       .outcome = "waited 0; ",
       .says = skipped,
       .neverSays = {"Will wait*"}},
      {.given = {.name = "no property list", .rawList = "text"},
       .outcome = "waited 0; filed away; ",
       .says = {"processing harlune restore info", "failed to parse harlune app restore info. err=plist *"},
       .neverSays = {"Will wait*"}},
      {.given = {.name = "no dictionary", .rawList = list(arrayOf({"app.a"}))},
       .outcome = "waited 0; filed away; ",
       .says = {"failed to parse harlune app restore info. err=(null)"}},
      {.given = {.name = "unreadable",
                 .apps = {{.id = "app.a"}},
                 .failures = {{.point = "FileSystem.readFile", .match = 1, .path = restoreListPath}}},
       .outcome = "waited 0; filed away; ",
       .says = {"failed to read harlune app restore info. err=Injection 1: *"},
       .neverSays = {"processing harlune restore info"}},
      {.given = {.name = "cannot be filed away",
                 .apps = {{.id = "app.a"}},
                 .failures = {{.point = "FileSystem.moveItem", .path = restoreLogPath}}},
       .outcome = "open [app.a restoring]; app.a is placeholder 2; waited 0; ",
       .says = {"Finished waiting for placeholder installs", "failed to copy harlune metadata. err=Injection 1: *"}},
      {.given = {.name = "an empty list", .apps = {}},
       .outcome = "waited 0; filed away; ",
       .says = {"Will wait for 0 seconds for 0 placeholders to install"}},
      {.given = {.name = "demoted apps in no list",
                 .apps = {{.id = "app.a", .demotedByHand = true}},
                 .rawDemotedList = "text"},
       .outcome = one,
       .says = {"E couldn't parse demoted apps list", "[15] Demoted Apps: (null)"}},
      {.given = {.name = "demoted apps in an array",
                 .apps = {{.id = "app.a", .demotedByHand = true}},
                 .rawDemotedList = list(arrayOf({"app.a"}))},
       .outcome = one,
       .says = {"E demoted apps list is not a dictionary"}},
      {.given = {.name = "demoted apps in an empty file", .apps = {{.id = "app.a"}}, .rawDemotedList = ""},
       .outcome = one,
       .says = {"[15] Demoted Apps: (null)"},
       .neverSays = {"E *"}},
      {.given = {.name = "entries of every shape",
                 .apps = {{.id = "app.a", .entry = Entry::notADictionary},
                          {.id = "app.b", .entry = Entry::noMetadata},
                          {.id = "app.c", .entry = Entry::metadataIsNoList},
                          {.id = "app.d", .demotedByHand = true, .entry = Entry::metadataIsNoDictionary},
                          {.id = "app.e", .hasIcon = false, .hasRights = false}}},
       .outcome = "open [app.e restoring]; app.e is placeholder 2; waited 0; filed away; ",
       .says = {"no harlune restore info for 'app.a' - skipping", "no HarluneMetadata for 'app.b' - ignoring",
                "E failed to parse harlune metadata for 'app.c'. err=plist *",
                "processing app restore for app.c finished with status 0 error plist *",
                "E failed to parse harlune metadata for 'app.d'. err=*",
                "processing app restore for demoted app app.d finished with status 0 error *",
                "E no icon data for 'app.e'", "set placeholder configuration complete for app.e"},
       .neverSays = {"set SINF*", "Added icon promise*", "Cancelling*"}},
  });
}

TEST(Restore, TheWaitEndsWithTheLastReportOrTheDeadline) {
  expectRows<RestoreScenario>({
      {.given = {.name = "one is never installed",
                 .apps = {{.id = "app.a"}, {.id = "app.b", .neverReported = true}, {.id = "app.c"}}},
       .outcome = "open [app.a restoring]; open [app.b restoring]; open [app.c restoring]; app.a is placeholder 2; "
                  "app.b is placeholder 2; app.c is placeholder 2; waited 15; filed away; ",
       .says = {"Will wait for 15 seconds for 3 placeholders to install",
                "RC finished installing placeholder for app.c, _restoringPlaceholderCount 1",
                "Finished waiting for placeholder installs"}},
      {.given = {.name = "in the daemon's own process no report counts",
                 .apps = {{.id = "app.a"}},
                 .process = "com.vantor.tsd"},
       .outcome = "open [app.a restoring]; app.a is placeholder 2; waited 5; filed away; ",
       .says = {"coordinatorDidInstallPlaceholder for app.a with error (null)",
                "Finished waiting for placeholder installs"},
       .neverSays = {"RC finished*", "E Ignoring*"}},
  });
}

TEST(Restore, WhatIsLeftAwaitedIsFreedByACancellation) {
  RestoreScenario scenario{.apps = {{.id = "app.a", .neverReported = true}, {.id = "app.b", .neverReported = true}}};
  PluginRig rig(optionsOf(scenario));
  EXPECT_EQ(run(rig, scenario).waited, 10);
  EXPECT_TRUE(rig.device().cancelByPerson("app.a"));
  rig.deliver();
  // The other one still counts in the next restore of the process.
  RestoreScenario next{.apps = {{.id = "app.c"}}, .type = 3};
  EXPECT_EQ(run(rig, next).waited, 10);
  EXPECT_TRUE(
      inOrder(rig.messages(), {"RC cancelled coordinator for restoring app bundle app.a _restoringPlaceholderCount 1",
                               "Will wait for 10 seconds for 2 placeholders to install"}));
  for (const char* app : {"app.b", "app.c"}) EXPECT_TRUE(rig.device().cancelByPerson(app));
  rig.deliver();
  EXPECT_EQ(run(rig, RestoreScenario{}).waited, 0);
  rig.unload();
  EXPECT_FALSE(inOrder(rig.messages(), {"*getting dealloc'd*"}));
}

TEST(Restore, AnAppIsAwaitedOnceAtATime) {
  // Its coordinator has ended with its placeholder, but nobody told; the next restore attaches another one.
  RestoreScenario scenario{.apps = {{.id = "app.a", .demotedByHand = true, .neverReported = true}}};
  PluginRig rig(optionsOf(scenario));
  for (int i = 0; i < 2; ++i) EXPECT_EQ(run(rig, scenario).waited, 5);
  EXPECT_TRUE(inOrder(rig.messagesIn("reconcileRestoreOfType", 2), {"added placeholder promise for app.a"}));
  EXPECT_FALSE(inOrder(rig.messagesIn("reconcileRestoreOfType", 2), {"Shiftwell will wait*"}));
}

TEST(Restore, ReportsThatComeTooEarlyOrForNobody) {
  PluginRig rig({.process = "com.vantor.shiftwell", .rules = {"coordinatorDidInstallPlaceholder=none"}});
  auto delegate = std::dynamic_pointer_cast<platform::RVAppInstallObserverDelegate>(rig.client());
  auto early = rig.platform().installCoordination.coordinatorForAppWithBundleID(Kind::RVRestoringAppInstallCoordinator,
                                                                                "app.a", 3, true);
  delegate->coordinatorDidInstallPlaceholder(early);
  EXPECT_EQ(run(rig, RestoreScenario{.apps = {{.id = "app.a"}}}).waited, 5);
  delegate->coordinatorDidInstallPlaceholder(early);  // too late now
  delegate = nullptr;
  rig.unload();
  EXPECT_TRUE(inOrder(
      rig.messages(),
      {"E Ignoring notification from RC about installing placeholder for app.a",
       "Shiftwell will wait for RC to install placeholder for app.a, _restoringPlaceholderCount 1",
       "Finished waiting for placeholder installs", "coordinatorDidInstallPlaceholder for app.a with error (null)",
       "E <AppsClient> getting dealloc'd with {(app.a)}pending placeholder install complete "
       "notifications"}));
  EXPECT_FALSE(inOrder(rig.messages(), {"RC finished*"}));
}

TEST(Restore, ASecondRunUsesWhatTheFirstLeft) {
  // The first run leaves a demoted app without its placeholder, one app to nobody, and one to the store.
  RestoreScenario scenario{
      .apps = {{.id = "app.a"}, {.id = "app.d", .demotedByHand = true}, {.id = "app.p"}},
      .rules = {"setPlaceholderPromise:app.d@1=fail", "RVAppInstallCoordinator.cancelForReason:app.d@1=fail",
                "setAppAssetPromiseResponsibleClient:app.p@1=fail",
                "RVAppInstallCoordinator.cancelForReason:app.p@1=fail"}};
  PluginRig rig(optionsOf(scenario));
  run(rig, scenario);
  writeRestoreLists(rig, scenario);
  EXPECT_TRUE(rig.reconcileRestore(2));
  auto messages = rig.messagesIn("reconcileRestoreOfType", 2);
  EXPECT_TRUE(inOrder(
      messages,
      {"App asset DRI for app.a is set to 1 - nothing more for tsd to do",
       "Coordinator for app.d has a valid user data promise", "added placeholder promise for app.d",
       "Coordinator for app.p has a valid user data promise", "Coordinator for app.p has a valid placeholder promise",
       "set RVClientMercato to satisfy app asset promise for app.p"}));
  EXPECT_FALSE(inOrder(messages, {"processing app restore for app.a finished*"}));
  EXPECT_TRUE(inOrder(rig.traceIn("reconcileRestoreOfType", "app.a", 2), {"step 2/1/1 y *", "step 2/1/2 y *"}));
}

TEST(Restore, WhatFailsCancelsWhatWasMade) {
  struct Failing {
    const char* point;
    const char* outcome;  // of an app that is not demoted
    Lines says;
  };
  const std::string error = "Injection 1: *";
  const Lines gaveUp = {"processing app restore for app.a finished with status 0 error *",
                        "Cancelling coordinator for appBundleIdentifier:app.a"};
  const char* coordinator = "cancelled [coordinator app.a TSError 29]; waited 0; filed away; ";
  const char* both =
      "cancelled [coordinator app.a TSError 29]; cancelled [placeholder app.a TSError 29]; waited 0; filed away; ";
  const Failing rows[] = {
      {"InstallCoordination.coordinatorForAppWithBundleID",
       "waited 0; filed away; ",
       {"E Error " + error + " creating restore coordinator for app.a", gaveUp[0]}},
      {"RVAppInstallCoordinator.setUserDataPromise",
       coordinator,
       {"E Error " + error + " adding out of band data promise for 'app.a'", gaveUp[0], gaveUp[1]}},
      {"InstallCoordination.makeAppPlaceholder",
       coordinator,
       {"Created placeholder (null) for 'app.a' of type 2",
        "processing app restore for app.a finished with status 0 error (null)", gaveUp[1]}},
      {"RVPlaceholder.setIconPromise",
       "cancelled [coordinator app.a TSError 29]; cancelled [placeholder app.a TSError 29]; cancelled [promise app.a "
       "TSError 29]; waited 0; filed away; ",
       {"E Error " + error + " adding icon promise to placeholder for 'app.a'", gaveUp[0]}},
      {"RVPlaceholder.setPlaceholderAttributes",
       both,
       {"E Error " + error + " setting placeholder attributes for 'app.a'", gaveUp[0]}},
      {"RVPlaceholder.setMetadata", both, {"E Error " + error + " setting store metadata for 'app.a'", gaveUp[0]}},
      {"RVPlaceholder.setSinfData", both, {"E Error " + error + " setting SINF data for 'app.a'", gaveUp[0]}},
      {"RVPlaceholder.setConfigurationCompleteWithError",
       both,
       {"E Error " + error + " setting placeholder configuration as complete for 'app.a'", gaveUp[0]}},
      {"RVAppInstallCoordinator.setPlaceholderPromise",
       both,
       {"E Error " + error + " setting placeholder promise for 'app.a'", gaveUp[0], gaveUp[1],
        "Cancelling placeholder for appBundleIdentifier:app.a"}},
      {"RVAppInstallCoordinator.setAppAssetPromiseResponsibleClient",
       coordinator,
       {"added placeholder promise for app.a",
        "E Error " + error + " setting RVClientMercato to satisfy app data promise for 'app.a'", gaveUp[0], gaveUp[1],
        "Shiftwell cancelled coordinator for restoring app bundle app.a _restoringPlaceholderCount 0"}},
  };
  std::vector<ScenarioRow<RestoreScenario>> table;
  for (const auto& row : rows) {
    table.push_back(
        {.given = {.name = row.point, .apps = {{.id = "app.a"}}, .failures = {{.point = row.point, .app = "app.a"}}},
         .outcome = row.outcome,
         .says = row.says});
  }
  expectRows(table);
}

TEST(Restore, ALongListTakesOneWait) {
  RestoreScenario scenario;
  for (int i = 0; i < 1000; ++i) scenario.apps.push_back({.id = "app." + std::to_string(i)});
  PluginRig rig(optionsOf(scenario));
  EXPECT_EQ(run(rig, scenario).text(), predict(scenario).text());
  EXPECT_TRUE(inOrder(rig.messages(), {"Will wait for 5000 seconds for 1000 placeholders to install"}));
}

}  // namespace
}  // namespace tests
