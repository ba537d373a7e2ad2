#include <gtest/gtest.h>

#include <algorithm>

#include "platform/Describe.h"
#include "platform/InstallCoordination.h"
#include "platform/RVAppInstallCoordinator.h"
#include "plist/PropertyList.h"
#include "tests/Scenario.h"

namespace tests {
namespace {

using App = ScenarioApp;
using Lines = std::vector<std::string>;
using Kind = platform::RVCoordinatorKind;

constexpr char stagedIcon[] = "/var/mobile/tmp/com.vantor.tsd.Apps/app.a.app/Icon.png";

Lines with(const std::string& word, Lines lines) {
  for (auto& line : lines) {
    for (auto at = line.find('$'); at != line.npos; at = line.find('$')) line.replace(at, 1, word);
  }
  return lines;
}

/// What every look-up of the plug-in's own coordinator says, creating it or not.
Lines lookUp(const char* kind, int existing, int creating) {
  std::string flags = "(createIfNotExisting:" + std::to_string(creating) + ", existingApp:" + std::to_string(existing);
  return with(kind, {"step 3/1/1 y app.a Create coordinator",
                     "coordinatorForAppWithBundleID(RV*AppInstallCoordinator, app.a, 3, " + std::to_string(creating) +
                         ") = coordinator#1",
                     "creatorIdentifier() = 3", "Created $ coordinator <*> " + flags + ") for app.a with error (null)",
                     "step 3/1/2 y app.a Finished creating coordinator"});
}

Lines operator+(Lines one, const Lines& other) {
  one.insert(one.end(), other.begin(), other.end());
  return one;
}

/// Staged by the host and taken over; what the daemon asks for then.
std::vector<TSAssetRef> request(PluginRig& rig, const Scenario& scenario) {
  Value list = Value::makeArray();
  for (const auto& app : scenario.apps) {
    if (app.before == App::Before::installed) rig.install(app.id, "1.0");
    list.array()->append(entryOf(app, app.operation));
    std::string folder = std::string(stagingDirectory) + '/' + app.id;
    const Value manifest = dictionaryOf({{"KBBundleIdentifier", app.id},
                                         {"KBBundleDisplayName", "Title"},
                                         {"KBBundleIconFile", "icon.png"},
                                         {"OBApplicationLaunchProhibited", true}});
    rig.write(folder + "/Info.plist", binaryList(filledOut(manifest, app.content.manifestKeys, 1)));
    rig.write(folder + "/HarluneMetadata.plist", binaryList(filledOut(dictionaryOf({{"itemId", 5}}), 25, 2)));
    if (app.hasIcon) rig.write(folder + "/icon.png", iconImage());
  }
  rig.write(std::string(stagingDirectory) + "/ApplicationsSync.plist", binaryList(list));
  EXPECT_TRUE(rig.reconcileSync());
  rig.deliver();
  auto assets = rig.daemon().outstandingAssetTransfers();
  rig.deliver();
  return assets;
}

const Scenario oneApp{.apps = {{.id = "app.a", .hasIcon = true}}};
const Scenario oneUpdate{.apps = {{.id = "app.a", .before = App::Before::installed, .hasIcon = true}}};

/// The whole preparation of a new app, from the icon to the end.
Lines preparation(const std::string& opening, const char* kind, int existing) {
  return Lines{
             "[15] processing app install for bundle 'app.a', title Title assetplist {*; KBBundleIdentifier = app.a; "
             "KBBundleDisplayName = Title; KBBundleIconFile = icon.png; OBApplicationLaunchProhibited = 1; *}, version "
             "2.0 with install coordination",
             "step 1/1/1 y app.a " + opening} +
         lookUp(kind, existing, 1) +
         Lines{"setObserver(observer#*)",
               "hasInstallOptions() = 0",
               "setInstallOptions(options#1) = 1",
               "set install options on coordinator for app.a",
               "hasInitialZDRAssetPromises() = 0",
               "setInitialZDRAssetPromises(0) = 1",
               "set ZDR asset promise to install coordinator for app.a",
               "hasAppAssetPromise() = 0",
               "makePromisedTransferToPathWithoutPath(app.a-Asset, 3, 0) = promise#1",
               "setAppAssetPromise(promise#1) = 1",
               "Added app asset promise to coordinator for 'app.a'",
               "hasPlaceholderPromise() = 0",
               "createDirectory(/var/mobile/tmp/com.vantor.tsd.Apps/app.a.app, 1, {FXFileOwnerAccountName = mobile; "
               "FXFileGroupOwnerAccountName = mobile}) = 1",
               "Created app directory for 'app.a' at /var/mobile/tmp/com.vantor.tsd.Apps/app.a.app with err=(null)",
               "step 5/1/1 y app.a Copying icon",
               "copyItem(/var/mobile/Library/ApplicationSync/Icons/app.a.png, " + std::string(stagedIcon) + ") = 1",
               "attributesOfItem(" + std::string(stagedIcon) + ") = *",
               "icon for app.a at " + std::string(stagedIcon) + " has a size of *",
               "Copied icon from /var/mobile/Library/ApplicationSync/Icons/app.a.png to " + std::string(stagedIcon) +
                   " with error (null) for 'app.a', sizeOnDisk:*",
               "step 5/1/2 y app.a Copying icon",
               "step 4/1/1 y app.a Create placeholder",
               "makeAppPlaceholder(Title, app.a, 4, 3) = placeholder#1",
               "step 4/1/2 y app.a Finished creating placeholder",
               "Created placeholder <*> for 'app.a' of type 4",
               "makePromisedTransferToPath(app.a-Icon, 3, " + std::string(stagedIcon) + ", *) = promise#2",
               "setPercentComplete(1)",
               "setComplete(1)",
               "setIconPromise(promise#2) = 1",
               "Added icon promise to placeholder for 'app.a'",
               "makePlaceholderAttributesWithInfoPlistDictionary({*; KBBundleIdentifier = app.a; *}) = attributes#1",
               "setPlaceholderAttributes(attributes#1) = 1",
               "set <*> attributes on placeholder for app.a",
               "setMetadata(metadata#1) = 1",
               "set store metadata on placeholder for app.a",
               "setConfigurationCompleteWithError() = 1",
               "set placeholder configuration as complete for app.a",
               "setPlaceholderPromise(placeholder#1) = 1",
               "added placeholder promise to coordinator for app.a",
               "processing app install for bundle app.a finished with status 1 error (null)",
               "step 1/1/2 y app.a Install app"};
}

/// From where the preparation of the app's install begins.
Lines preparationIn(const PluginRig& rig, std::size_t nth = 1) {
  Lines lines = rig.traceIn("outstandingAssetTransfers", "app.a", nth);
  auto begin = std::find_if(lines.begin(), lines.end(), [](const std::string& line) {
    return matches("*processing app install for bundle '*", line);
  });
  return Lines(begin, lines.end());
}

TEST(SyncMessages, AnAppIsPreparedStepByStep) {
  PluginRig fresh;
  auto assets = request(fresh, oneApp);
  EXPECT_TRUE(exactly(preparationIn(fresh), preparation("Install App", "initiating", 0)));
  Lines calls = {"makeStoreMetadata({*; itemId = 5; *}) = metadata#1",
                 "makeInstallOptions() = options#1",
                 "setHarluneMetadata(metadata#1)",
                 "setObInstallType(4)",
                 "setInstallTargetType(1)",
                 "setLaunchProhibited(1)",
                 "setBundleVersion(2.0)"};
  Lines lines;
  for (const auto& record : fresh.records()) lines.push_back(lineOf(record));
  EXPECT_TRUE(inOrder(lines, calls));
  // Shown before its package is asked for.
  ASSERT_EQ(assets.size(), 1u);
  const auto& asset = *assets[0];
  EXPECT_EQ(fresh.device().status().home, Lines{"app.a"});
  EXPECT_EQ(asset.prettyName(), "Title");
  EXPECT_EQ(asset.dataclass(), "Application");
  EXPECT_EQ(asset.assetType(), "Application");
  EXPECT_EQ(asset.variantOptions(), dictionaryOf({{"AssetParts", 1}, {"Version", "2.0"}}));
  EXPECT_FALSE(asset.isRestore());

  PluginRig update;
  request(update, oneUpdate);
  EXPECT_TRUE(exactly(preparationIn(update), preparation("Update app", "updating", 1)));
}

TEST(SyncMessages, WhatIsPreparedAlreadyIsLeft) {
  PluginRig rig;
  request(rig, oneApp);
  // The same again: now as a placeholder of the device.
  EXPECT_EQ(rig.daemon().outstandingAssetTransfers().size(), 1u);
  EXPECT_TRUE(exactly(
      preparationIn(rig, 2),
      Lines{"[15] processing app install for bundle 'app.a', title * with install coordination",
            "step 1/1/1 y app.a Install App"} +
          lookUp("initiating", 0, 1) +
          Lines{"setObserver(observer#*)", "hasInstallOptions() = 1", "coordinator for app.a has install options",
                "hasInitialZDRAssetPromises() = 1", "coordinator for app.a has an ZDR app asset promise",
                "hasAppAssetPromise() = 1", "coordinator for app.a has an app asset promise",
                "hasPlaceholderPromise() = 1", "coordinator for app.a has a placeholder promise",
                "processing app install for bundle app.a finished with status 1 error (null)",
                "step 1/1/2 y app.a Install app"}));
}

TEST(SyncMessages, WhatFailsInAPreparationIsTold) {
  const std::string error = "Injection 1: injected at *";
  const std::string ends = "processing app install for bundle app.a finished with status 0 error " + error;
  const Lines cancels = {ends, "step 1/1/2 n app.a Install app", "Cancelling coordinator for appBundleIdentifier:app.a",
                         "cancelForReason({domain = TSError; code = 1}, 3) = 1"};
  const Lines attachedAnyway = {"setPlaceholderPromise(placeholder#1) = 1",
                                "processing app install for bundle app.a finished with status 1 error " + error};
  const Lines noIcon = {"step 5/1/2 y app.a Copying icon", "makeAppPlaceholder(*", "setPlaceholderAttributes(*"};
  struct Row {
    const char* point;
    Lines says;
    Lines never{};
  };
  const Row rows[] = {
      {"coordinatorForAppWithBundleID", {"step 3/1/2 n app.a Finished creating coordinator", ends}, {"*ancel*"}},
      {"setInstallOptions",
       Lines{"E Error " + error + " setting install options on coordinator for 'app.a'"} + cancels},
      {"setInitialZDRAssetPromises", Lines{"E Error " + error + " setting ZDR asset promise for 'app.a'"} + cancels},
      {"makePromisedTransferToPathWithoutPath",
       {"E Error creating asset promise for 'app.a'",
        "processing app install for bundle app.a finished with status 0 error (null)",
        "Cancelling coordinator for appBundleIdentifier:app.a"}},
      {"setAppAssetPromise",
       {"E Error " + error + " adding app asset promise at (null) to 'app.a'", "E Cancelling asset promise for 'app.a'",
        "cancelForReason({domain = TSError; code = 30}, 3) = 1", "*finished with status 0 error (null)",
        "cancelForReason({domain = TSError; code = 1}, 3) = 1"}},
      {"makeAppPlaceholder",
       Lines{"step 4/1/2 n app.a Finished creating placeholder", "Created placeholder (null) for 'app.a' of type 4",
             "setPlaceholderPromise() = 0 ! *", "E Error * adding placeholder promise to coordinator for 'app.a'",
             "Cancelling coordinator for appBundleIdentifier:app.a"},
       {"Cancelling placeholder*", "setIconPromise*"}},
      {"makePromisedTransferToPath",
       {"setPlaceholderPromise(placeholder#1) = 1"},
       {"setPlaceholderAttributes*", "E *"}},
      {"setIconPromise",
       {"E Error " + error + " adding icon promise to placeholder for 'app.a'",
        "cancelForReason({domain = TSError; code = 30}, 3) = *", "setPlaceholderPromise(placeholder#1) = 1",
        "*finished with status 1 error (null)"},
       {"setPlaceholderAttributes*"}},
      {"setPlaceholderAttributes",
       Lines{"E Error " + error + " setting attributes on placeholder for 'app.a'"} + attachedAnyway,
       {"setMetadata*"}},
      {"setMetadata",
       Lines{"E Error " + error + " setting store metadata on placeholder for 'app.a'"} + attachedAnyway,
       {"setConfigurationCompleteWithError*"}},
      {"setConfigurationCompleteWithError",
       Lines{"E Error " + error + " setting placeholder configuration as complete for 'app.a'"} + attachedAnyway},
      {"setPlaceholderPromise",
       {"E Error " + error + " adding placeholder promise to coordinator for 'app.a'", ends,
        "Cancelling placeholder for appBundleIdentifier:app.a", "cancelForReason({domain = TSError; code = 1}, 3) = 1",
        "Cancelling coordinator for appBundleIdentifier:app.a", "cancelForReason({domain = TSError; code = 1}, 3) = 1",
        "E Not requesting app asset for app.a", "Changing app.a from install to FAILED"}},
      {"copyItem",
       Lines{"Copied icon from * to * with error " + error + " for 'app.a', sizeOnDisk:0"} + noIcon,
       {"icon for app.a*", "setIconPromise*"}},
      {"copyItem=error",
       {"Copied icon from * to * with error " + error + " for 'app.a', sizeOnDisk:*", "setIconPromise(*",
        "processing app install for bundle app.a finished with status 1 error " + error}},
      {"attributesOfItem",
       Lines{"icon for app.a at * has a size of 0",
             "Copied icon from * to * with error " + error + " for 'app.a', sizeOnDisk:0"} +
           noIcon,
       {"setIconPromise*"}},
      {"createDirectory@3=error",
       {"scenario Harlune App Restore 0 n app.a Failed to create app directory",
        "Created app directory for 'app.a' at * with err=" + error, "step 5/1/1 y app.a Copying icon"}},
      {"createDirectory@3",
       {"scenario Harlune App Restore 0 n app.a Failed to create app directory",
        "Created app directory for 'app.a' at * with err=" + error, "makeAppPlaceholder(*",
        "setPlaceholderPromise(placeholder#1) = 1"},
       {"step 5/*", "setIconPromise*"}},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.point);
    std::string rule = row.point;
    PluginRig rig({.rules = {rule.find('=') == rule.npos ? rule + "=fail" : rule}});
    request(rig, oneApp);
    Lines lines = rig.traceIn("outstandingAssetTransfers", "app.a");
    EXPECT_TRUE(inOrder(lines, row.says));
    for (const auto& never : row.never) EXPECT_FALSE(inOrder(lines, {never})) << never;
  }
}

TEST(SyncMessages, AnIconThatCannotBeDrawnIsTheHostsArtwork) {
  const std::pair<const char*, const char*> rows[] = {
      {"KBURLCreateWithFileSystemPath=fail", "E couldn't create URL"},
      {"KBBundleCreate=fail", "E couldn't create bundle from URL"},
      {"GYCreateDeviceAppropriateHomeScreenIconImageFromBundle=fail", "E couldn't create PN icon from bundle"},
      {"QGImageDestinationCreateWithData=fail", "E couldn't create image"},
      {"QGImageDestinationFinalize=fail", "E Couldn't finalize image"},
      {"writeAtomically@2=fail", "E Couldn't save image file to /var/mobile/Library/ApplicationSync/Icons/app.a.png"},
      {"createDirectory@2=fail", "E Can't create icon scratch dir! Injection 1: *"},
  };
  for (const auto& [rule, message] : rows) {
    SCOPED_TRACE(rule);
    PluginRig rig({.rules = {rule}});
    auto assets = request(rig, oneApp);
    ASSERT_EQ(assets.size(), 1u);
    EXPECT_EQ(assets[0]->icon(), std::string(workArea) + "/app.a/HarluneArtwork");
    EXPECT_TRUE(inOrder(rig.messagesIn("outstandingAssetTransfers"), {message}));
    EXPECT_FALSE(rig.exists("/var/mobile/Library/ApplicationSync/Icons/app.a.png"));
  }
}

TEST(SyncMessages, ProgressAndPackageReachThePromise) {
  PluginRig rig;
  auto asset = request(rig, oneUpdate)[0];
  asset->setInstallProgress(0.125f);
  rig.progress(asset, 0.5);
  const Lines promise = {"error()", "appAssetPromiseWithError() = promise#1", "isComplete() = 0"};
  EXPECT_TRUE(exactly(rig.traceIn("assetTransferUpdatedProgress", "app.a"),
                      Lines{"finished transferring 0.500000 for app.a"} + lookUp("updating", 1, 0) + promise +
                          Lines{"Updating download progress: 0.500000 install progress:0.125000 for app.a",
                                "setPercentComplete(0.5)"}));

  asset->setPath(rig.receivePackage("app.a", packageOf("app.a", "2.0")));
  rig.transferEnded(asset, true);
  Lines lines = rig.traceIn("assetTransferSucceeded", "app.a");
  EXPECT_TRUE(
      inOrder(lines, Lines{"transfer for asset <TSAsset app.a*> ended with success y error (null) existingApp:1",
                           "asset transfer succeeded for app.a", "Received file at */app.a.pkg",
                           "Changing app.a from install to DOWNLOADED", "Installing synced asset <TSAsset *>"} +
                         lookUp("updating", 1, 0) + promise +
                         Lines{"setTransferPath(/var/mobile/Media/PublicStaging/Packages/app.a.pkg)",
                               "Satisfying asset promise for app.a", "setPercentComplete(1)", "setComplete(1)"}));

  // Once the package is handed over nothing reaches the promise any more; and a second end is of no update.
  rig.progress(asset, 0.75);
  EXPECT_TRUE(inOrder(rig.traceIn("assetTransferUpdatedProgress", "app.a", 2),
                      {"*Create coordinator", "step 3/1/2 n app.a Finished creating coordinator"}));
  EXPECT_EQ(rig.countOf("setPercentComplete", "app.a"), 3u);  // the icon's, too
  rig.transferEnded(asset, true);
  EXPECT_TRUE(
      inOrder(rig.messagesIn("assetTransferSucceeded", 2), {"*ended with success y error (null) existingApp:0"}));
  rig.deliver();
  EXPECT_EQ(rig.device().app("app.a")->version, "2.0");
}

TEST(SyncMessages, APromiseThatIsCompleteIsLeft) {
  PluginRig rig({.rules = {"isComplete=value=1"}});
  auto asset = request(rig, oneApp)[0];
  rig.progress(asset, 0.5);
  EXPECT_TRUE(
      inOrder(rig.messagesIn("assetTransferUpdatedProgress"), {"Asset promise is already satisfied for app.a"}));
  asset->setPath("/some/package");
  rig.transferEnded(asset, true);
  EXPECT_TRUE(inOrder(rig.messagesIn("assetTransferSucceeded"), {"Asset promise is already satisfied for app.a"}));
  EXPECT_EQ(rig.countOf("setTransferPath"), 0u);
}

TEST(SyncMessages, ACoordinatorInErrorIsLeft) {
  PluginRig rig({.rules = {"RVAppInstallCoordinator.error=error"}});
  auto asset = request(rig, oneApp)[0];
  rig.progress(asset, 0.5);
  rig.transferEnded(asset, true);
  EXPECT_EQ(rig.countOf("appAssetPromiseWithError"), 0u);
  EXPECT_TRUE(inOrder(rig.messages(), {"coordinatorDidInstallPlaceholder for app.a with error Injection 1: *"}));
}

TEST(SyncMessages, AnUpdateUnderWayIsNoPlaceholder) {
  PluginRig rig;
  rig.install("app.a", "1.0");
  EXPECT_TRUE(rig.device().beginStoreInstall("app.a", {}));
  EXPECT_TRUE(rig.daemon().outstandingAssetTransfers().empty());
  EXPECT_TRUE(inOrder(rig.messages(), {"[15] prioritized proxies (<OBApplicationProxy app.a>) paused proxies ()",
                                       "No placeholder for asset identifier app.a",
                                       "Assets already in progress (not returning these): ()"}));
}

TEST(SyncMessages, ReconciliationInOrder) {
  PluginRig rig;
  ErrorRef error;
  request(rig, {.apps = {{.id = "app.a", .operation = "remove"}}});
  EXPECT_TRUE(exactly(rig.messagesIn("reconcileSync"),
                      {"starting to reconcile sync with new anchor anchor", "app.a targeted for termination",
                       "performing 1 deletions", "Notifying PN we are starting syncing", "finished reconcile sync"}));
  EXPECT_EQ(rig.device().status().syncing, 1u);
  rig.daemon().assetTransferEndedWithSuccess(true);
  EXPECT_EQ(rig.device().status().syncing, 0u);

  const std::pair<const char*, Lines> rows[] = {
      {"createDirectory", {"can't create work area", "finished reconcile sync"}},
      {"moveItem", {"Can't move staging area", "finished reconcile sync"}},
  };
  for (const auto& [point, says] : rows) {
    PluginRig failing({.rules = {std::string(point) + "@1=fail"}});
    failing.write(std::string(stagingDirectory) + "/PanelloIconState.plist", "layout");
    EXPECT_FALSE(failing.reconcileSync(&error));
    EXPECT_EQ(error->domain(), "Injection");
    EXPECT_TRUE(exactly(failing.messagesIn("reconcileSync"),
                        Lines{"starting to reconcile sync with new anchor anchor"} + says));
    EXPECT_TRUE(failing.exists(stagingDirectory));
    EXPECT_EQ(failing.countOf("notify_post"), 0u);
  }

  PluginRig deaf({.rules = {"notify_register_check=value=9"}});
  deaf.write(std::string(stagingDirectory) + "/PanelloIconState.plist", "");
  EXPECT_TRUE(deaf.reconcileSync(&error));
  EXPECT_EQ(error->domain(), "FileSystem");  // of the list that is not there
  EXPECT_TRUE(exactly(deaf.messagesIn("reconcileSync"),
                      {"starting to reconcile sync with new anchor anchor", "Nothing to do from Harlune",
                       "Notifying PN we are starting syncing", "E Uh Oh...can't send notification to PN:9",
                       "finished reconcile sync"}));
  EXPECT_EQ(deaf.countOf("notify_post") + deaf.countOf("notify_set_state"), 0u);
}

TEST(SyncMessages, TheLayoutReachesTheHomeScreenUnchanged) {
  PluginRig rig;
  Bytes layout = plist::writeXML(arrayOf({"app.z", "app.y"})).value();
  rig.write(std::string(stagingDirectory) + "/PanelloIconState.plist", layout);
  EXPECT_TRUE(rig.reconcileSync());
  EXPECT_EQ(rig.device().status().home, (Lines{"app.z", "app.y"}));
  EXPECT_TRUE(inOrder(rig.messages(), {"Notifying PN we are starting syncing", "Sending iconlayout to PN"}));
  rig.daemon().outstandingAssetTransfers();
  EXPECT_EQ(rig.countOf("deallocateMemory"), 1u);
}

TEST(SyncMessages, TheEndOfASync) {
  PluginRig rig({.rules = {"CorvaneClearUninstalled@1=value=3", "utimes@2=fail"}});
  rig.install("app.lost", "1");
  EXPECT_TRUE(rig.device().uninstallByPerson("app.lost"));
  rig.write(lastSyncPath, binaryList(arrayOf({})));
  const std::string deleted = platform::describe(rig.daemon().installedAssets());
  EXPECT_EQ(deleted, "{_Deleted = ({KBBundleIdentifier = app.lost})}");
  rig.daemon().syncEndedWithSuccess(false);
  EXPECT_TRUE(exactly(rig.messagesIn("syncEndedWithSuccess"), {"sync ended with success: n"}));
  EXPECT_TRUE(rig.exists(lastSyncPath));
  EXPECT_EQ(platform::describe(rig.daemon().installedAssets()), deleted);

  rig.daemon().syncEndedWithSuccess(true);  // the installer does not forget
  EXPECT_TRUE(exactly(rig.messagesIn("syncEndedWithSuccess", 2),
                      {"sync ended with success: y", "clearing uninstalled apps: (app.lost)",
                       "E Failed to clear uninstalled apps from Corvane."}));
  EXPECT_FALSE(rig.exists(lastSyncPath));
  rig.daemon().syncEndedWithSuccess(true);  // is asked again
  EXPECT_TRUE(
      exactly(rig.messagesIn("syncEndedWithSuccess", 3),
              {"sync ended with success: y", "E Failed to update utimes of \"/var/mobile/Library/ApplicationSync\": *",
               "clearing uninstalled apps: (app.lost)"}));
  rig.daemon().syncEndedWithSuccess(true);  // and not again
  EXPECT_TRUE(exactly(rig.messagesIn("syncEndedWithSuccess", 4), {"sync ended with success: y"}));
  EXPECT_EQ(platform::describe(rig.daemon().installedAssets()), "{_Deleted = ()}");
}

TEST(SyncMessages, ClearingLeavesNothing) {
  PluginRig rig({.rules = {"uninstallApplication:app.stays=value=0", "CorvaneLookupUninstalled@2=none",
                           "CorvaneClearUninstalled@2=value=1"}});
  auto plain = App::plainPlaceholder();
  for (const char* id : {"app.goes", "app.stays"}) EXPECT_TRUE(rig.device().beginStoreInstall(id, plain));
  rig.install("app.installed", "1");
  rig.write(restoreStatePath, "anything");
  rig.daemon().clearSyncData();
  EXPECT_TRUE(exactly(rig.messagesIn("clearSyncData"), {"blasting work area", "Uninstalling all placeholder apps",
                                                        "Uninstall app.goes = y", "Uninstall app.stays = n"}));
  EXPECT_FALSE(rig.exists(pluginDirectory));
  EXPECT_FALSE(rig.device().app("app.goes") && rig.device().app("app.goes")->isOnDevice());
  EXPECT_EQ(rig.device().app("app.installed")->state, device::AppState::installed);
  rig.daemon().clearSyncData();
  EXPECT_TRUE(inOrder(rig.messagesIn("clearSyncData", 2), {"E Failed to fetch uninstalled apps list to clear it"}));
  rig.daemon().clearSyncData();
  EXPECT_TRUE(inOrder(rig.messagesIn("clearSyncData", 3), {"E Failed to clear uninstalled apps list"}));
}

TEST(SyncMessages, LifeAndDeath) {
  const std::string registers = "KBNotificationCenterAddObserver";
  {
    PluginRig rig;
    EXPECT_EQ(rig.countOf(registers), 1u);
    EXPECT_EQ(rig.countOf("makeAppInstallObserver"), 0u);
    for (int i = 0; i < 2; ++i) rig.postStartup();
    EXPECT_EQ(rig.countOf("makeAppInstallObserver"), 1u);
    const std::vector<TSAssetRef> assets = request(rig, {.apps = {{.id = "app.a"}, {.id = "app.b"}, {.id = "app.c"}}});
    for (const auto& asset : assets) {
      rig.progress(asset, 0.25);
      rig.progress(asset, 0.5);
    }
    EXPECT_EQ(rig.client()->supportedDataclasses(), Lines{"Application"});
    EXPECT_EQ(rig.client()->currentSyncAnchor(), "NO_APP_SYNC_ANCHOR");
    EXPECT_TRUE(rig.client()->prepareForSyncWithHostAnchor("x", nullptr));
    rig.unload();
    EXPECT_TRUE(inOrder(rig.messages(), {"E <AppsClient> getting dealloc'd with 3 outstanding Ducto transfers!"}));
    EXPECT_EQ(rig.countOf("cancelForReason"), 0u);
    EXPECT_EQ(rig.countOf("KBNotificationCenterRemoveObserver"), 1u);
    EXPECT_EQ(rig.countOf("releaseAppInstallObserver"), 1u);
    EXPECT_EQ(rig.countOf("removeObserver"), 2u);  // a snapshot's, too
    rig.postStartup();
    EXPECT_TRUE(rig.device().cancelByPerson("app.a"));
    rig.deliver();
  }
  // An observer that could not be had is asked for by the next notification.
  PluginRig twice({.rules = {"makeAppInstallObserver@1=none"}});
  for (std::size_t posted = 1; posted <= 3; ++posted) {
    twice.postStartup();
    EXPECT_EQ(twice.countOf("makeAppInstallObserver"), std::min<std::size_t>(posted, 2));
  }
  PluginRig elsewhere({.process = "com.vantor.shiftwell"});
  elsewhere.postStartup();
  elsewhere.unload();
  EXPECT_EQ(elsewhere.countOf(registers) + elsewhere.countOf("makeAppInstallObserver"), 0u);
  EXPECT_EQ(elsewhere.countOf("KBNotificationCenterRemoveObserver"), 0u);
  EXPECT_EQ(elsewhere.countOf("removeObserver"), 1u);
  EXPECT_TRUE(exactly(elsewhere.messages(), {}));
}

TEST(SyncMessages, CancellationsAreRememberedUntilTheTransferEnds) {
  PluginRig rig;
  auto asset = request(rig, oneUpdate)[0];
  auto coordinator = rig.platform().installCoordination.coordinatorForAppWithBundleID(Kind::RVAppInstallCoordinator,
                                                                                      "app.a", 3, false);
  auto delegate = std::dynamic_pointer_cast<platform::RVAppInstallObserverDelegate>(rig.client());
  ASSERT_TRUE(coordinator && delegate);
  auto cancel = [&] { delegate->coordinatorCanceledWithReason(coordinator, nullptr, 1); };
  const std::string refuses = "E Cannot cancel app.a as it's already cancelled 1 OR the call is not supported";
  cancel();
  cancel();
  rig.daemon().assetTransferEndedWithSuccess(true);  // with nothing outstanding it forgets nothing
  cancel();
  EXPECT_TRUE(inOrder(rig.messages(), {"Cancelling asset sync for app.a", refuses, "Notifying PN*", refuses}));
  EXPECT_EQ(rig.countOf("cancelAssetTransferForFailedAsset"), 1u);

  rig.progress(asset, 0.5);
  rig.daemon().assetTransferEndedWithSuccess(true);  // now it does
  cancel();
  EXPECT_EQ(rig.countOf("cancelAssetTransferForFailedAsset"), 2u);
  rig.progress(asset, 0.5);
  EXPECT_TRUE(inOrder(rig.traceIn("assetTransferUpdatedProgress", "app.a", 2),
                      {"coordinatorForAppWithBundleID(RVInitiatingAppInstallCoordinator, app.a, 3, 0) ! *"}));

  // The end of a transfer that the person cancelled is not passed on; the next one's is.
  rig.transferEnded(asset, false, platform::makeError("Daemon", 1));
  EXPECT_FALSE(inOrder(rig.traceIn("assetTransferSucceeded", "app.a"), {"step 3/1/1 y *"}));
  rig.transferEnded(asset, false, platform::makeError("Daemon", 1));
  EXPECT_TRUE(inOrder(rig.traceIn("assetTransferSucceeded", "app.a", 2), {"step 3/1/1 y *"}));
}

TEST(SyncMessages, TheRestoreStateIsPruned) {
  auto record = [](const char* version) { return dictionaryOf({{version, dictionaryOf({{"path", "/p"}})}}); };
  const Bytes list = binaryList(arrayOf({"app.a"}));
  const std::pair<Bytes, std::string> rows[] = {
      {binaryList(dictionaryOf({{"app.a", record("1")}})), "(null)"},
      {binaryList(dictionaryOf({{"app.a", record("1")}, {"app.b", record("2")}})), "{app.b = {2 = {path = /p}}}"},
      {binaryList(dictionaryOf({{"app.b", record("2")}})), "{app.b = {2 = {path = /p}}}"},
      {binaryList(dictionaryOf({})), "(null)"},
      {"no property list", "(null)"},
      {list, "(app.a)"},
  };
  for (const auto& [content, left] : rows) {
    PluginRig rig;
    auto asset = platform::TSAsset::downloadAssetWithIdentifier("app.a", "Application", std::nullopt);
    rig.write(restoreStatePath, content);
    rig.daemon().assetInstallSucceeded(asset);
    EXPECT_EQ(platform::describe(rig.readList(restoreStatePath)), left);
    EXPECT_EQ(rig.exists(restoreStatePath), left != "(null)");
    rig.device().files().removeItem(restoreStatePath);
    rig.daemon().assetInstallFailed(asset, nullptr);
    EXPECT_FALSE(rig.exists(restoreStatePath));
    asset->setIsRestore(true);
    rig.daemon().assetInstallFailed(asset, nullptr);
    EXPECT_TRUE(inOrder(rig.traceIn("assetInstallFailed", "app.a", 2),
                        {"app.a install failed but was recoverable: (null)",
                         "scenario Orrin restore 0 n app.a install failed recoverably"}));
  }
}

}  // namespace
}  // namespace tests
