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

TEST(SyncCases, AnAppIsShownBeforeItsPackageIsAskedFor) {
  PluginRig rig;
  EXPECT_EQ(request(rig, oneApp).size(), 1u);
  EXPECT_EQ(rig.device().status().home, Lines{"app.a"});
  // The same again: now as a placeholder of the device, of which everything is prepared.
  EXPECT_EQ(rig.daemon().outstandingAssetTransfers().size(), 1u);
  EXPECT_EQ(rig.countOf("setAppAssetPromise") + rig.countOf("setPlaceholderPromise"), 2u);
}

TEST(SyncCases, WhatMayFailInAPreparation) {
  // Whether the package is asked for all the same.
  const std::pair<const char*, bool> rows[] = {{"coordinatorForAppWithBundleID=fail", false},
                                               {"setInstallOptions=fail", false},
                                               {"setInitialZDRAssetPromises=fail", false},
                                               {"makePromisedTransferToPathWithoutPath=fail", false},
                                               {"setAppAssetPromise=fail", false},
                                               {"makeAppPlaceholder=fail", false},
                                               {"setPlaceholderPromise=fail", false},
                                               {"makePromisedTransferToPath=fail", true},
                                               {"setIconPromise=fail", true},
                                               {"setPlaceholderAttributes=fail", true},
                                               {"setMetadata=fail", true},
                                               {"setConfigurationCompleteWithError=fail", true},
                                               {"copyItem=fail", true},
                                               {"copyItem=error", true},
                                               {"attributesOfItem=fail", true},
                                               {"createDirectory@3=error", true},
                                               {"createDirectory@3=fail", true}};
  for (const auto& [rule, isAskedFor] : rows) {
    PluginRig rig({.rules = {rule}});
    EXPECT_EQ(request(rig, oneApp).size(), isAskedFor ? 1u : 0u) << rule;
    const std::string list = platform::describe(rig.readList(todoListPath));
    EXPECT_TRUE(matches(isAskedFor ? "*operation = install;*" : "*operation = FAILED;*", list)) << rule << list;
  }
}

TEST(SyncCases, AnIconThatCannotBeDrawnIsTheHostsArtwork) {
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

TEST(SyncCases, ProgressAndPackageReachThePromise) {
  PluginRig rig;
  auto asset = request(rig, oneUpdate)[0];
  asset->setInstallProgress(0.125f);
  rig.progress(asset, 0.5);
  asset->setPath(rig.receivePackage("app.a", packageOf("app.a", "2.0")));
  rig.transferEnded(asset, true);
  // Once the package is handed over nothing reaches the promise any more; and a second end is of no update.
  rig.progress(asset, 0.75);
  EXPECT_EQ(rig.countOf("setPercentComplete", "app.a"), 3u);  // the icon's, too
  rig.transferEnded(asset, true);
  rig.deliver();
  EXPECT_EQ(rig.device().app("app.a")->version, "2.0");
}

TEST(SyncCases, APromiseThatIsCompleteIsLeft) {
  PluginRig rig({.rules = {"isComplete=value=1"}});
  auto asset = request(rig, oneApp)[0];
  rig.progress(asset, 0.5);
  asset->setPath("/some/package");
  rig.transferEnded(asset, true);
  EXPECT_EQ(rig.countOf("isComplete"), 2u);
  EXPECT_EQ(rig.countOf("setTransferPath"), 0u);
}

TEST(SyncCases, ACoordinatorInErrorIsLeft) {
  PluginRig rig({.rules = {"RVAppInstallCoordinator.error=error"}});
  auto asset = request(rig, oneApp)[0];
  rig.progress(asset, 0.5);
  rig.transferEnded(asset, true);
  EXPECT_EQ(rig.countOf("appAssetPromiseWithError"), 0u);
}

TEST(SyncCases, AnUpdateUnderWayIsNoPlaceholder) {
  PluginRig rig;
  rig.install("app.a", "1.0");
  EXPECT_TRUE(rig.device().beginStoreInstall("app.a", {}));
  EXPECT_TRUE(rig.daemon().outstandingAssetTransfers().empty());
}

TEST(SyncCases, AReconciliationThatFails) {
  PluginRig rig;
  ErrorRef error;
  request(rig, {.apps = {{.id = "app.a", .operation = "remove"}}});
  EXPECT_EQ(rig.device().status().syncing, 1u);
  rig.daemon().assetTransferEndedWithSuccess(true);
  EXPECT_EQ(rig.device().status().syncing, 0u);

  for (const char* rule : {"createDirectory@1=fail", "moveItem@1=fail"}) {
    PluginRig failing({.rules = {rule}});
    failing.write(std::string(stagingDirectory) + "/PanelloIconState.plist", "layout");
    EXPECT_FALSE(failing.reconcileSync(&error));
    EXPECT_EQ(error->domain(), "Injection");
    EXPECT_TRUE(failing.exists(stagingDirectory));
    EXPECT_EQ(failing.countOf("notify_post"), 0u);
  }

  PluginRig deaf({.rules = {"notify_register_check=value=9"}});
  deaf.write(std::string(stagingDirectory) + "/PanelloIconState.plist", "");
  EXPECT_TRUE(deaf.reconcileSync(&error));
  EXPECT_EQ(error->domain(), "FileSystem");  // of the list that is not there
  EXPECT_EQ(deaf.countOf("notify_post") + deaf.countOf("notify_set_state"), 0u);
}

TEST(SyncCases, TheLayoutReachesTheHomeScreenUnchanged) {
  PluginRig rig;
  Bytes layout = plist::writeXML(arrayOf({"app.z", "app.y"})).value();
  rig.write(std::string(stagingDirectory) + "/PanelloIconState.plist", layout);
  EXPECT_TRUE(rig.reconcileSync());
  EXPECT_EQ(rig.device().status().home, (Lines{"app.z", "app.y"}));
  rig.daemon().outstandingAssetTransfers();
  EXPECT_EQ(rig.countOf("deallocateMemory"), 1u);
}

TEST(SyncCases, TheEndOfASync) {
  PluginRig rig({.rules = {"CorvaneClearUninstalled@1=value=3", "utimes@2=fail"}});
  rig.install("app.lost", "1");
  EXPECT_TRUE(rig.device().uninstallByPerson("app.lost"));
  rig.write(lastSyncPath, binaryList(arrayOf({})));
  const std::string deleted = platform::describe(rig.daemon().installedAssets());
  EXPECT_EQ(deleted, "{_Deleted = ({KBBundleIdentifier = app.lost})}");
  rig.daemon().syncEndedWithSuccess(false);
  EXPECT_TRUE(rig.exists(lastSyncPath));
  EXPECT_EQ(platform::describe(rig.daemon().installedAssets()), deleted);

  rig.daemon().syncEndedWithSuccess(true);  // the installer does not forget
  EXPECT_FALSE(rig.exists(lastSyncPath));
  rig.daemon().syncEndedWithSuccess(true);  // is asked again
  rig.daemon().syncEndedWithSuccess(true);  // and not again
  EXPECT_EQ(rig.countOf("CorvaneClearUninstalled"), 2u);
  EXPECT_EQ(platform::describe(rig.daemon().installedAssets()), "{_Deleted = ()}");
}

TEST(SyncCases, ClearingLeavesNothing) {
  PluginRig rig({.rules = {"uninstallApplication:app.stays=value=0", "CorvaneLookupUninstalled@2=none",
                           "CorvaneClearUninstalled@2=value=1"}});
  auto plain = App::plainPlaceholder();
  for (const char* id : {"app.goes", "app.stays"}) EXPECT_TRUE(rig.device().beginStoreInstall(id, plain));
  rig.install("app.installed", "1");
  rig.write(restoreStatePath, "anything");
  rig.daemon().clearSyncData();
  EXPECT_FALSE(rig.exists(pluginDirectory));
  EXPECT_FALSE(rig.device().app("app.goes") && rig.device().app("app.goes")->isOnDevice());
  EXPECT_EQ(rig.device().app("app.installed")->state, device::AppState::installed);
  for (int again = 0; again < 2; ++again) rig.daemon().clearSyncData();
  EXPECT_EQ(rig.countOf("CorvaneClearUninstalled"), 2u);
}

TEST(SyncCases, LifeAndDeath) {
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

TEST(SyncCases, CancellationsAreRememberedUntilTheTransferEnds) {
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

TEST(SyncCases, TheRestoreStateIsPruned) {
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
    EXPECT_EQ(rig.countOf("logScenario", "app.a"), 1u);
  }
}

}  // namespace
}  // namespace tests
