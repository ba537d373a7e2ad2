#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/InstallCoordination.h"
#include "tests/RestoreScenario.h"
#include "tests/Scenario.h"
#include "tests/ScriptedServices.h"

namespace tests {
namespace {

using platform::OBApplicationProxy;
using Lines = std::vector<std::string>;

std::shared_ptr<OBApplicationProxy> proxyOf(const char* app) {
  auto proxy = std::make_shared<OBApplicationProxy>();
  proxy->applicationIdentifier = proxy->bundleIdentifier = app;
  proxy->isPlaceholder = proxy->appState.isPlaceholder = true;
  return proxy;
}

std::shared_ptr<OBApplicationProxy> installing(const char* app) {
  auto proxy = proxyOf(app);
  proxy->installType = 4;
  proxy->installProgressSync = platform::OBInstallProgress{1, 1};
  return proxy;
}

/// The plug-in before a device that can be made to say anything. Its todo list asks for app.a and app.b.
class ScriptedServices : public ::testing::Test {
 protected:
  void SetUp() override {
    Value list = Value::makeArray();
    for (const char* app : {"app.a", "app.b"})
      list.array()->append(dictionaryOf({{"identifier", app}, {"operation", "install"}, {"version", "2"}}));
    _rig.write(todoListPath, binaryList(list));
  }

  void load(Scripted services) {
    _services = services;
    if (!services.workspace) _services.workspace = &_registry;
    _platform.emplace(scripted(_rig.platform(), _services));
    _client = _rig.makeClient(*_platform);
  }
  void load() { load({}); }

  Lines requested() {
    Lines identifiers;
    for (const auto& asset : _client->outstandingAssetTransfers()) identifiers.push_back(asset->identifier());
    return identifiers;
  }
  std::size_t said(const char* line) const {
    const auto lines = _rig.messages();
    return static_cast<std::size_t>(
        std::count_if(lines.begin(), lines.end(), [&](const auto& each) { return matches(line, each); }));
  }

  PluginRig _rig;
  ScriptedRegistry _registry{_rig.platform().workspace};
  Scripted _services;
  std::optional<platform::Platform> _platform;
  std::shared_ptr<platform::TSClient> _client;
};

TEST_F(ScriptedServices, TheFirstReportOfTheRegistryCounts) {
  _registry.isSilent = true;
  auto withoutProgress = proxyOf("app.b");
  auto installed = installing("app.b");
  installed->isPlaceholder = false;
  _registry.reports = {{{withoutProgress, installed, installing("app.a")}, {installing("app.b")}},
                       {{installing("app.b")}, {}}};
  load();
  EXPECT_EQ(requested(), Lines{"app.b"});
  EXPECT_EQ(said("No install progress found for asset identifier app.b"), 1u);
  EXPECT_EQ(said("No placeholder for asset identifier app.b"), 1u);
  EXPECT_EQ(said("[15] prioritized proxies*"), 2u);
  EXPECT_EQ(said("signaling semaphore"), 1u);
}

TEST_F(ScriptedServices, AnUpdateIsOfAnInstalledAppThatIsNoPlaceholder) {
  for (bool isInstalled : {false, true}) {
    for (bool isPlaceholder : {false, true}) {
      auto proxy = proxyOf("app.a");
      proxy->isInstalled = isInstalled;
      proxy->isPlaceholder = isPlaceholder;
      proxy->appState.isPlaceholder = !isPlaceholder;
      _registry.proxies = {{"app.a", proxy}, {"app.b", nullptr}};
      _rig.beginStep({});
      load();
      requested();
      EXPECT_EQ(said("App app.a is already installed and will be updated."), isInstalled && !isPlaceholder);
      const auto& records = _rig.records();
      EXPECT_EQ(std::any_of(records.begin(), records.end(),
                            [](const auto& each) { return lineOf(each) == "step 1/1/1 y app.a Update app"; }),
                isInstalled && !isPlaceholder);
    }
  }
}

TEST_F(ScriptedServices, PlaceholdersMayLackAnything) {
  auto bare = proxyOf("app.bare");
  auto byBundle = proxyOf("app.odd");
  byBundle->applicationIdentifier.reset();
  auto byApplication = proxyOf("app.odd");
  byApplication->bundleIdentifier.reset();
  auto noApp = std::make_shared<platform::OBBundleProxy>();
  noApp->bundleIdentifier = "app.bundle";
  auto installed = proxyOf("app.there");
  installed->appState.isPlaceholder = false;
  _registry.bundles = {bare, byBundle, byApplication, noApp, installed};
  load();
  // All of them are listed as bundles of the system, too, whose placeholders are not asked for.
  EXPECT_EQ(requested(), (Lines{"app.a", "app.b"}));
  EXPECT_EQ(said("app.bare is system app placeholder - skipping"), 1u);
  EXPECT_EQ(said("SystemAppPlaceholders {(app.bare, app.odd)}"), 1u);
  EXPECT_EQ(said("[15] processing app install for bundle ''*"), 0u);
  EXPECT_TRUE(_client->accountsForAssets().empty());
  EXPECT_EQ(_client->vantorIDsForAssets().size(), 0u);
  _client->prepareForBackup();

  _registry.areOfTheSystem = false;
  EXPECT_EQ(requested(), (Lines{"app.a", "app.b", "app.bare"}));
  EXPECT_EQ(said("E missing bundlePath"), 1u);
  EXPECT_EQ(
      said("Asset app.bare (pretty=app.bare, version=(null)) prepped with icon (null), at (null), meta at (null), "
           "info at (null), storePid=0, isRestore=n"),
      1u);
  EXPECT_EQ(_rig.countOf("setIconPromise", "app.bare"), 0u);
}

TEST_F(ScriptedServices, AnOrderOfNoBytesIsNone) {
  for (const char* order : {"", "no list"}) {
    ScriptedHomeScreen screen(_rig.platform().homeScreen, order);
    _rig.beginStep({});
    load({.homeScreen = &screen});
    EXPECT_EQ(requested(), (Lines{"app.a", "app.b"}));
    EXPECT_EQ(said("saved icon sort order"), 1u);
    EXPECT_EQ(said("lastly *"), 2u);
    EXPECT_EQ(_rig.countOf("deallocateMemory"), 1u);
    _client = nullptr;
  }
}

TEST_F(ScriptedServices, ADaemonMayEndATransferInsideTheCallThatCancelsIt) {
  HastyDaemon daemon;
  load({.deviceService = &daemon});
  auto delegate = std::dynamic_pointer_cast<platform::RVAppInstallObserverDelegate>(_client);
  auto coordinator = _rig.platform().installCoordination.coordinatorForAppWithBundleID(
      platform::RVCoordinatorKind::RVInitiatingAppInstallCoordinator, "app.a", 3, true);
  daemon.cancelled = [&](const platform::TSAssetRef& asset) {
    _client->assetTransferSucceeded(asset, false, platform::makeError("TSError", 1));
  };
  delegate->coordinatorCanceledWithReason(coordinator, platform::makeError("E", 1), 1);
  // The end of the transfer has taken the app out of the cancelled ones: this is another transfer's cancellation.
  delegate->coordinatorCanceledWithReason(coordinator, platform::makeError("E", 1), 1);
  EXPECT_EQ(daemon.asked, (Lines{"app.a", "app.a"}));
  EXPECT_EQ(said("failed to transfer asset app.a. *"), 2u);
  EXPECT_EQ(said("E Cannot cancel *"), 0u);
  delegate->coordinatorShouldPrioritize(coordinator);
  EXPECT_EQ(said("Prioritize app.a finished with error (null)"), 1u);
}

TEST_F(ScriptedServices, AWaitThatCannotBeIsOver) {
  BrokenClock clock;
  load({.clock = &clock});
  writeRestoreLists(_rig, {});
  EXPECT_TRUE(_client->reconcileRestoreOfType(2));
  EXPECT_EQ(said("E _waitForPlaceholderInstalls was stopped by an exception: a clock that throws"), 1u);
  EXPECT_EQ(said("Finished waiting for placeholder installs"), 1u);
}

}  // namespace
}  // namespace tests
