#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <map>
#include <set>
#include <stdexcept>

#include "platform/Clock.h"
#include "platform/Describe.h"
#include "platform/Installer.h"
#include "tests/FailingMemory.h"
#include "tests/RestoreScenario.h"
#include "tests/ScriptedServices.h"
#include "tsd/CommandError.h"
#include "tsd/daemon/PluginLoader.h"

namespace tests {
namespace {

using Lasts = FailingMemory::Lasts;

/// Throws after the n-th call of the plug-in to a service or to the log, once.
class ThrowingService {
 public:
  /// Of which calls: every one, or the first of each operation of a service inside of each call into the plug-in.
  enum class Of { all, everyKind };

  explicit ThrowingService(std::size_t nth, Of of = Of::all) : _nth(nth), _of(of) {}

  std::function<void(const device::CallRecord&)> listener() {
    return [this](const device::CallRecord& record) {
      if (record.service == "AppsClient") {
        if (record.end) _inside.pop_back();
        if (!record.end) _inside.push_back(record.operation);
        return;
      }
      // What the transaction log makes of a record is inside of the call that records it.
      if (!armed || _inside.empty() || isTransaction(record)) return;
      if (_of == Of::everyKind && !_kinds.insert(_inside.back() + record.service + record.operation).second) return;
      if (++_seen != _nth) return;
      thrownAt = record.operation;
      isTold = record.service != "log";
      if (record.operation == "utimes") throw "no exception of the standard library";
      throw std::runtime_error("a service that throws");
    };
  }
  std::size_t seen() const { return _seen; }

  bool armed = false;
  std::string thrownAt{};
  bool isTold = false;  // it threw elsewhere than in the log, and a message says so

 private:
  static bool isTransaction(const device::CallRecord& record) {
    return record.service == "log" && (*record.arguments.dictionary())["category"] == Value("tsd.appsync");
  }

  const std::size_t _nth;
  const Of _of;
  std::size_t _seen = 0;
  std::vector<std::string> _inside;
  std::set<std::string> _kinds;
};

using Names = std::set<std::string>;

/// What the messages say that exceptions stopped.
Names stoppedIn(const PluginRig& rig) {
  const std::string said = " was stopped by an exception";
  Names names;
  for (const auto& line : rig.messages()) {
    const auto at = line.find(said);
    if (at == line.npos) continue;
    const std::string what = line.substr(at + said.size());
    names.insert(line.substr(2, at - 2) +
                 (what == ": a service that throws" || what == ": std::bad_alloc" ? "" : what));
  }
  return names;
}

/// Runs the trial with 1, 2, … until it has no such allocation or call.
template <class Trial>
void forEveryOne(Trial trial) {
  std::size_t nth = 1;
  for (bool reached = true; reached; ++nth) {
    SCOPED_TRACE("the one of number " + std::to_string(nth));
    reached = trial(nth);
    if (testing::Test::HasFailure()) return;
  }
  EXPECT_GT(nth, 20u);
}

/// Every step of every app that was begun was ended, once.
void expectStepsClosed(PluginRig& rig, const std::string& thrownAt) {
  if (thrownAt == "logStep") return;  // that record is not among the others
  std::map<std::string, int> open;
  for (const auto& record : rig.records()) {
    if (record.operation != "logStep") continue;
    const auto& arguments = *record.arguments.dictionary();
    open[record.app + " step " + platform::describe(arguments["step"])] += arguments["phase"] == Value(1) ? 1 : -1;
  }
  for (const auto& [step, count] : open) EXPECT_EQ(count, 0) << step;
}

/// An update, a new app and one with an icon are asked for.
void stage(PluginRig& rig) {
  rig.install("app.update.with.a.long.name", "1");
  Value list = Value::makeArray();
  for (const char* app : {"app.update.with.a.long.name", "app.new.with.a.long.name"}) {
    list.array()->append(dictionaryOf({{"identifier", app}, {"operation", "install"}, {"version", "2"}}));
    const std::string folder = std::string(stagingDirectory) + '/' + app;
    rig.write(folder + "/Info.plist", binaryList(dictionaryOf({{"KBBundleIdentifier", app}})));
    rig.write(folder + "/HarluneArtwork", iconImage());
  }
  rig.write(std::string(stagingDirectory) + "/ApplicationsSync.plist", binaryList(list));
  ASSERT_TRUE(rig.reconcileSync());
}

std::map<std::string, std::string> marks(PluginRig& rig) {
  std::map<std::string, std::string> found;
  const Value list = rig.readList(todoListPath);
  for (const Value& entry : *list.array()) {
    found[platform::describe((*entry.dictionary())["identifier"])] =
        platform::describe((*entry.dictionary())["operation"]);
  }
  return found;
}

/// Before anybody knows that it is the plug-in's own.
bool losesCoordinator(const std::string& thrownAt) {
  return thrownAt == "coordinatorForAppWithBundleID" || thrownAt == "creatorIdentifier";
}

/// One app at most has failed, and is marked and cancelled; or nothing was begun at all.
void expectOneFailure(PluginRig& rig, const std::vector<TSAssetRef>& assets, const std::string& thrownAt) {
  std::set<std::string> requested;
  for (const auto& asset : assets) requested.insert(asset->identifier());
  std::set<std::string> open;
  for (const auto& each : rig.device().status().coordinators) open.insert(each.app);
  const auto found = marks(rig);
  const bool begun = rig.countOf("coordinatorForAppWithBundleID") != 0 ||
                     found.at("app.new.with.a.long.name") != "install" ||
                     found.at("app.update.with.a.long.name") != "install";
  EXPECT_GE(requested.size(), begun ? 1u : 0u);
  for (const auto& [app, mark] : found) {
    const bool asked = requested.count(app) != 0;
    EXPECT_EQ(mark, asked || !begun ? "install" : "FAILED") << app;
    if (!losesCoordinator(thrownAt)) {
      EXPECT_EQ(open.count(app) != 0, asked) << app;
    }
  }
  expectStepsClosed(rig, thrownAt);
}

TEST(Exceptions, OneAllocationCostsOneInstallAtMost) {
  Names named;
  forEveryOne([&](std::size_t nth) {
    PluginRig rig;
    stage(rig);
    std::vector<TSAssetRef> assets;
    std::size_t seen = 0;
    {
      FailingMemory memory(nth, Lasts::once);
      assets = rig.daemon().outstandingAssetTransfers();
      seen = memory.seen();
    }
    rig.deliver();
    expectOneFailure(rig, assets, "");
    if (seen < nth) {
      EXPECT_EQ(assets.size(), 2u);
    }
    named.merge(stoppedIn(rig));
    return seen >= nth;
  });
  EXPECT_EQ(named, (Names{"outstandingAssetTransfers", "prepareAppForInstallUsingCoordination"}));
}

TEST(Exceptions, AfterMemoryHasComeBackEverythingIsAskedFor) {
  forEveryOne([](std::size_t nth) {
    PluginRig rig;
    stage(rig);
    std::size_t seen = 0;
    {
      FailingMemory memory(nth, Lasts::onwards);
      rig.daemon().outstandingAssetTransfers();
      seen = memory.seen();
    }
    rig.deliver();
    EXPECT_EQ(rig.daemon().outstandingAssetTransfers().size(), 2u);
    return seen >= nth;
  });
}

TEST(Exceptions, AServiceThatThrowsCostsOneInstallAtMost) {
  forEveryOne([](std::size_t nth) {
    ThrowingService service(nth);
    PluginRig rig({.told = service.listener()});
    stage(rig);
    service.armed = true;
    auto assets = rig.daemon().outstandingAssetTransfers();
    service.armed = false;
    rig.deliver();
    expectOneFailure(rig, assets, service.thrownAt);
    return service.seen() >= nth;
  });
}

/// The wait for the one whose report never comes shows that there was one.
const RestoreScenario restored{
    .apps = {{.id = "app.plain.with.a.long.name"},
             {.id = "app.demoted.with.a.long.name", .demotedByHand = true, .neverReported = true}},
    .rules = {"tessaroShouldCreateAppPlaceholdersWithError=error"}};

/// Restores inside of what `around` does. One app at most is missing; the list was filed away after the wait, and the
/// service's error handed back.
template <class Around>
void expectRestored(PluginRig& rig, const ThrowingService* service, Around around) {
  writeRestoreLists(rig, restored);
  ErrorRef error;
  const auto begin = rig.platform().clock.now();
  around([&] { EXPECT_TRUE(rig.daemon().reconcileRestoreOfType(2, &error)); });
  const auto waited = std::chrono::duration_cast<std::chrono::seconds>(rig.platform().clock.now() - begin).count();
  rig.deliver();
  const std::string thrownAt = service ? service->thrownAt : "";
  // Nobody has said that they are wanted, or where they are listed.
  if (thrownAt == "tessaroShouldCreateAppPlaceholdersWithError" || thrownAt == "fileExists") return;
  EXPECT_TRUE(rig.exists(restoreLogPath) && !rig.exists(restoreListPath));
  EXPECT_TRUE(error && error->domain() == "Injection");
  // The placeholder of a demoted app is there for good once it is attached, even if the app is given up then.
  auto isThere = [&](std::size_t number) {
    auto app = rig.device().app(restored.apps[number].id);
    return app && app->isOnDevice() && rig.countOf("cancelForReason", app->id) == 0;
  };
  if (rig.countOf("coordinatorForAppWithBundleID") != 0) {
    EXPECT_TRUE(isThere(0) || isThere(1));
  }
  if (thrownAt != "setPlaceholderPromise") {
    EXPECT_EQ(waited, isThere(1) ? isThere(0) ? 10 : 5 : 0);
  }
  if (!losesCoordinator(thrownAt)) {
    EXPECT_EQ(rig.device().status().coordinators.empty(), !isThere(0));
  }
  for (const auto& record : rig.records()) {
    if (record.operation != "setPlaceholderPromise" || record.result != Value(true)) continue;
    const auto messages = rig.messages();  // what a coordinator holds goes with it
    EXPECT_EQ(std::ranges::count(messages, "Cancelling placeholder for appBundleIdentifier:" + record.app), 0);
  }
  expectStepsClosed(rig, thrownAt);
}

TEST(Exceptions, OneAllocationCostsOneRestoredAppAtMost) {
  Names named;
  forEveryOne([&](std::size_t nth) {
    PluginRig rig(optionsOf(restored));
    std::size_t seen = 0;
    expectRestored(rig, nullptr, [&](auto&& call) {
      FailingMemory memory(nth, Lasts::once);
      call();
      seen = memory.seen();
    });
    named.merge(stoppedIn(rig));
    return seen >= nth;
  });
  EXPECT_EQ(named, (Names{"_loadDemotedAppsPlist", "_placeHolderForBundleIdentifierWithHarluneMetadata",
                          "prepareAppForRestoreUsingCoordination"}));
}

TEST(Exceptions, AServiceThatThrowsCostsOneRestoredAppAtMost) {
  forEveryOne([](std::size_t nth) {
    ThrowingService service(nth);
    auto options = optionsOf(restored);
    options.told = service.listener();
    PluginRig rig(options);
    expectRestored(rig, &service, [&](auto&& call) {
      service.armed = true;
      call();
      service.armed = false;
    });
    return service.seen() >= nth;
  });
}

TEST(Exceptions, WhatWasNotReportedAsDeletedIsReportedLater) {
  forEveryOne([](std::size_t nth) {
    PluginRig rig;
    for (const char* app : {"app.a", "app.b", "app.c"}) {
      rig.install(app, "1");
      EXPECT_TRUE(rig.device().uninstallByPerson(app));
    }
    rig.write(lastSyncPath, binaryList(arrayOf({"app.d"})));
    Value answer;
    std::size_t seen = 0;
    {
      FailingMemory memory(nth, Lasts::once);
      answer = rig.daemon().installedAssets();
      seen = memory.seen();
    }
    EXPECT_TRUE(answer.dictionary() && (*answer.dictionary())["_Deleted"].array()) << platform::describe(answer);
    if (!answer.dictionary()) return false;
    const std::size_t reported = (*answer.dictionary())["_Deleted"].array()->size();
    EXPECT_TRUE(reported == 4 || reported == 0) << reported;
    rig.daemon().syncEndedWithSuccess(true);
    const std::size_t kept = rig.platform().installer.CorvaneLookupUninstalled().dictionary()->size();
    EXPECT_EQ(kept, reported == 0 ? 3u : 0u);
    EXPECT_EQ(rig.exists(lastSyncPath), reported == 0);
    return seen >= nth;
  });
}

TEST(Exceptions, WhatAServiceStopsIsNamed) {
  using App = ScenarioApp;
  const Scenario life{
      .apps = {{.id = "app.arrives", .hasIcon = true, .report = App::Report::succeeded},
               {.id = "app.update", .before = App::Before::installed, .transfer = App::Transfer::fails},
               {.id = "app.wanted", .person = App::Person::prioritizes, .report = App::Report::failed},
               {.id = "app.unwanted", .before = App::Before::installed, .operation = "remove"},
               {.id = "app.cancelled", .transfer = App::Transfer::stalls, .person = App::Person::cancels},
               {.id = "app.stalls", .transfer = App::Transfer::stalls},
               {.id = "app.refused"}},
      .rules = {"setPlaceholderPromise:app.refused=fail", "setPlaceholderPromise:" + restored.apps[0].id + "=fail"},
      .phaseSucceeded = false};
  Names named;
  forEveryOne([&](std::size_t nth) {
    ThrowingService service(nth, ThrowingService::Of::everyKind);
    auto options = optionsOf(life);
    options.told = service.listener();
    PluginRig rig(options);
    service.armed = true;
    run(rig, life);
    rig.daemon().installedAssetMetrics();
    rig.daemon().vantorIDsForAssets();
    rig.daemon().accountsForAssets();
    rig.daemon().disabledAssetTypes();
    rig.daemon().prepareForBackup();
    writeRestoreLists(rig, restored);
    rig.reconcileRestore(2);
    rig.deliver();
    rig.daemon().clearSyncData();
    rig.postStartup();
    service.armed = false;
    EXPECT_EQ(rig.countOf("makeAppInstallObserver"), 1u);  // that threw is not among the records
    const Names stopped = stoppedIn(rig);
    EXPECT_EQ(stopped.size(), service.isTold ? 1u : 0u) << service.thrownAt;
    for (const auto& record : rig.records()) {
      if (!record.end || record.operation != "reconcileSync") continue;
      EXPECT_EQ(record.result, Value(!stopped.contains("reconcileSync"))) << service.thrownAt;
    }
    if (stopped.contains("uninstallAppUsingCoordination")) {
      EXPECT_TRUE(
          std::ranges::any_of(rig.records(), [](const auto& each) { return matches("step 7/1/2 n *", lineOf(each)); }));
    }
    named.insert(stopped.begin(), stopped.end());
    return service.seen() >= nth;
  });
  std::string shown;
  for (const auto& name : named) shown += (shown.empty() ? "" : ", ") + name;
  EXPECT_EQ(shown,
            "_notifyPanello, _placeHolderForBundleIdentifierWithHarluneMetadata, _processHarluneRestoreInfo, "
            "accountsForAssets, assetInstallFailed, assetInstallSucceeded, assetSyncFinishedWithStatus, "
            "assetTransferSucceeded, assetTransferUpdatedProgress, cancelForReason, changeAssetID, "
            "clearSyncData, coordinatorCanceledWithReason, coordinatorDidCompleteSuccessfully, "
            "coordinatorDidInstallPlaceholder, coordinatorShouldPrioritize, createDirectory, deallocateMemory, "
            "disabledAssetTypes, "
            "installedAssetMetrics, installedAssets, logStep, moveItem, outstandingAssetTransfers, "
            "prepareAppForInstallUsingCoordination, prepareAppForRestoreUsingCoordination, prepareForBackup, "
            "reconcileRestoreOfType, reconcileSync, removeItem, removeObserver, setupInstallCoordinatorObserver, "
            "syncEndedWithSuccess, syncEndedWithSuccess of an unknown kind, uninstallAppUsingCoordination, "
            "vantorIDsForAssets");
}

TEST(Exceptions, WhatWantOfMemoryStopsIsNamed) {
  const std::pair<const char*, std::function<void(PluginRig&)>> calls[] = {
      {"supportedDataclasses", [](PluginRig& rig) { rig.client()->supportedDataclasses(); }},
      {"currentSyncAnchor", [](PluginRig& rig) { rig.client()->currentSyncAnchor(); }},
      {"installedAssets", [](PluginRig& rig) { rig.client()->installedAssets(); }}};
  for (const auto& [name, call] : calls) {
    PluginRig rig;
    {
      FailingMemory memory(1, Lasts::once);
      call(rig);
    }
    EXPECT_EQ(stoppedIn(rig), Names{name});
  }
  PluginRig rig;
  const tsd::PluginLoader plugin(SHIPPED_PLUGIN);
  {
    FailingMemory memory(1, Lasts::once);
    EXPECT_THROW(plugin.create(rig.platform()), tsd::CommandError);
  }
  EXPECT_EQ(stoppedIn(rig), Names{"init"});
}

TEST(Exceptions, AReportThatWasNotUnderstoodIsFollowedByTheNext) {
  auto proxy = std::make_shared<platform::OBApplicationProxy>();
  proxy->applicationIdentifier = proxy->bundleIdentifier = "app.installing.with.a.long.name";
  proxy->isPlaceholder = true;
  proxy->installType = 4;
  proxy->installProgressSync = platform::OBInstallProgress{1, 1};
  std::size_t stopped = 0;
  for (std::size_t nth = 1, seen = 1; seen >= nth; ++nth) {
    PluginRig rig;
    ScriptedRegistry registry(rig.platform().workspace);
    registry.isSilent = true;
    registry.reports = {{{proxy}, {}}, {{proxy}, {}}};
    auto client = tsd::PluginLoader(SHIPPED_PLUGIN).create(scripted(rig.platform(), {.workspace = &registry}));
    {
      FailingMemory memory(nth, Lasts::once);
      client->outstandingAssetTransfers();
      seen = memory.seen();
    }
    if (stoppedIn(rig) != Names{"applicationInstallsArePrioritized"}) continue;
    ++stopped;
    EXPECT_TRUE(inOrder(rig.messages(), {"Wait completed",
                                         "Assets already in progress (not returning these): "
                                         "(app.installing.with.a.long.name)"}));
  }
  EXPECT_GT(stopped, 0u);
}

TEST(Exceptions, ACancellationThatCannotBeRememberedIsPassedOn) {
  std::size_t passedOn = 0;
  for (std::size_t nth = 1, seen = 1; seen >= nth; ++nth) {
    PluginRig rig;
    stage(rig);
    rig.daemon().outstandingAssetTransfers();
    rig.deliver();
    EXPECT_TRUE(rig.device().cancelByPerson("app.new.with.a.long.name"));
    {
      FailingMemory memory(nth, Lasts::once);
      rig.deliver();
      seen = memory.seen();
    }
    const bool isNamed = stoppedIn(rig) == Names{"coordinatorCanceledWithReason"};
    if (isNamed && rig.countOf("cancelAssetTransferForFailedAsset") == 1) ++passedOn;
  }
  EXPECT_GT(passedOn, 0u);
}

}  // namespace
}  // namespace tests
