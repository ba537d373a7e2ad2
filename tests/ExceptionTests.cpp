#include <gtest/gtest.h>

#include <chrono>
#include <map>
#include <set>
#include <stdexcept>

#include "platform/Clock.h"
#include "platform/Describe.h"
#include "platform/Installer.h"
#include "tests/FailingMemory.h"
#include "tests/RestoreScenario.h"

namespace tests {
namespace {

using Lasts = FailingMemory::Lasts;

/// Throws after the n-th call of the plug-in to a service or to the log, once.
class ThrowingService {
 public:
  explicit ThrowingService(std::size_t nth) : _nth(nth) {}

  std::function<void(const device::CallRecord&)> listener() {
    return [this](const device::CallRecord& record) {
      // What the transaction log makes of a record is inside of the call that records it.
      if (!armed || record.service == "AppsClient" || record.thread != "daemon" || isTransaction(record)) return;
      if (record.operation == "deallocateMemory") return;  // the device has yet to do it
      if (++_seen != _nth) return;
      thrownAt = record.operation;
      throw std::runtime_error("a service that throws");
    };
  }
  std::size_t seen() const { return _seen; }

  bool armed = false;
  std::string thrownAt{};

 private:
  static bool isTransaction(const device::CallRecord& record) {
    return record.service == "log" && (*record.arguments.dictionary())["category"] == Value("tsd.appsync");
  }

  const std::size_t _nth;
  std::size_t _seen = 0;
};

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
  forEveryOne([](std::size_t nth) {
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
    return seen >= nth;
  });
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
  expectStepsClosed(rig, thrownAt);
}

TEST(Exceptions, OneAllocationCostsOneRestoredAppAtMost) {
  forEveryOne([](std::size_t nth) {
    PluginRig rig(optionsOf(restored));
    std::size_t seen = 0;
    expectRestored(rig, nullptr, [&](auto&& call) {
      FailingMemory memory(nth, Lasts::once);
      call();
      seen = memory.seen();
    });
    return seen >= nth;
  });
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

}  // namespace
}  // namespace tests
