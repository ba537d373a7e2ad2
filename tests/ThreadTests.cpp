#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <random>
#include <thread>

#include "platform/Describe.h"
#include "platform/InstallCoordination.h"
#include "platform/NotificationCenter.h"
#include "tests/RestoreScenario.h"

namespace tests {
namespace {

using Delegate = platform::RVAppInstallObserverDelegate;
using Kind = platform::RVCoordinatorKind;

// Without a journal, whose lock would order what is to race, wherever its records are not looked at.
const PluginRig::Options threads{.threaded = true, .journaled = false};

std::vector<std::string> identifiers(std::size_t count) {
  std::vector<std::string> names;
  for (std::size_t i = 0; i < count; ++i) names.push_back("app." + std::to_string(i));
  return names;
}

void stage(PluginRig& rig, const std::vector<std::string>& apps) {
  Value list = Value::makeArray();
  for (const auto& app : apps) {
    auto& entry = list.array()->appendDictionary();
    entry.set("identifier", app);
    entry.set("operation", "install");
    entry.set("version", "2.0");
  }
  rig.write(std::string(stagingDirectory) + "/ApplicationsSync.plist", binaryList(list));
}

/// The marks of the todo list, each once.
std::vector<std::string> marks(PluginRig& rig) {
  std::vector<std::string> found;
  const Value list = rig.readList(todoListPath);
  if (!list.array()) return found;
  for (const Value& entry : *list.array()) {
    found.push_back(platform::describe((*entry.dictionary())["operation"]));
  }
  std::sort(found.begin(), found.end());
  found.erase(std::unique(found.begin(), found.end()), found.end());
  return found;
}

/// Runs the body on so many threads, which begin together.
template <class Body>
void onThreads(std::size_t count, Body body) {
  std::atomic<std::size_t> waiting{count};
  std::vector<std::thread> running;
  for (std::size_t i = 0; i < count; ++i) {
    running.emplace_back([&, i] {
      device::ThreadName name("transfer-" + std::to_string(i + 1));
      --waiting;
      while (waiting != 0) std::this_thread::yield();
      body(i);
    });
  }
  for (auto& thread : running) thread.join();
}

TEST(Threads, SixteenPackagesInFlightLoseNoMark) {
  PluginRig rig(threads);
  rig.postStartup();
  stage(rig, identifiers(16));
  ASSERT_TRUE(rig.reconcileSync());
  auto assets = rig.daemon().outstandingAssetTransfers();
  ASSERT_EQ(assets.size(), 16u);
  for (const auto& asset : assets) {
    asset->setPath(rig.receivePackage(asset->identifier(), packageOf(asset->identifier(), "2.0")));
  }
  onThreads(16, [&](std::size_t i) {
    for (int step = 1; step <= 10; ++step) rig.progress(assets[i], step / 10.0);
    rig.transferEnded(assets[i], true);
  });
  rig.deliver();
  EXPECT_EQ(marks(rig), std::vector<std::string>{"INSTALLED"});
  rig.daemon().assetTransferEndedWithSuccess(true);
  rig.daemon().syncEndedWithSuccess(true);
  for (const auto& asset : assets) EXPECT_EQ(rig.device().app(asset->identifier())->version, "2.0");
}

TEST(Threads, CallbacksFromEightThreadsDuringARestore) {
  RestoreScenario scenario;
  for (const auto& id : identifiers(24)) scenario.apps.push_back({.id = id, .hasIcon = false});
  PluginRig rig({.process = scenario.process, .threaded = true});
  writeRestoreLists(rig, scenario);
  auto delegate = std::dynamic_pointer_cast<Delegate>(rig.client());
  // Coordinators as an earlier run of the restore would have left them.
  std::vector<std::shared_ptr<platform::RVAppInstallCoordinator>> coordinators;
  for (const auto& app : scenario.apps) {
    coordinators.push_back(rig.platform().installCoordination.coordinatorForAppWithBundleID(
        Kind::RVRestoringAppInstallCoordinator, app.id, 3, true));
    ASSERT_TRUE(coordinators.back());
  }
  onThreads(9, [&](std::size_t thread) {
    if (thread == 8) {
      rig.reconcileRestore(2);
      return;
    }
    std::mt19937_64 numbers(thread);
    for (int i = 0; i < 400; ++i) {
      const auto& coordinator = coordinators[numbers() % coordinators.size()];
      switch (numbers() % 4) {
        case 0:
          delegate->coordinatorCanceledWithReason(coordinator, nullptr, 1);
          break;
        case 1:
          delegate->coordinatorDidCompleteSuccessfully(coordinator);
          break;
        default:
          delegate->coordinatorDidInstallPlaceholder(coordinator);
      }
    }
  });
  for (const auto& coordinator : coordinators) delegate->coordinatorCanceledWithReason(coordinator, nullptr, 1);
  delegate = nullptr;
  rig.unload();
  rig.device().events().stop();
  // Every awaited placeholder was let go of once, and none is left.
  const auto messages = rig.messages();
  auto count = [&](std::string_view pattern) {
    return std::count_if(messages.begin(), messages.end(),
                         [&](const std::string& message) { return matches(pattern, message); });
  };
  EXPECT_EQ(count("Shiftwell will wait for RC to install placeholder for *"), 24);
  EXPECT_EQ(
      count("RC finished installing placeholder for *") + count("RC cancelled coordinator for restoring app bundle *"),
      24);
  EXPECT_EQ(count("*getting dealloc'd*"), 0);
}

TEST(Threads, EditsReconciliationAndClearingExcludeOneAnother) {
  PluginRig rig(threads);
  const auto apps = identifiers(8);
  const std::vector<std::string> fewer(apps.begin(), apps.begin() + 5);
  std::atomic<bool> reconciling{true};
  std::size_t stale = 0;
  onThreads(5, [&](std::size_t thread) {
    if (thread != 4) {
      while (reconciling) {
        for (std::size_t app = thread; app < apps.size(); app += 4) {
          rig.daemon().assetInstallSucceeded(
              platform::TSAsset::downloadAssetWithIdentifier(apps[app], "Application", std::nullopt));
        }
      }
      return;
    }
    for (int i = 0; i < 500; ++i) {
      const auto& staged = i % 2 ? apps : fewer;
      stage(rig, staged);
      rig.reconcileSync();
      // An edit that began on the list before must not land now.
      for (int look = 0; look < 4; ++look) {
        const Value list = rig.readList(todoListPath);
        if (!list.array() || list.array()->size() != staged.size()) ++stale;
      }
      if (i % 5 == 4) rig.daemon().clearSyncData();
      if (i % 5 == 4 && rig.exists(todoListPath)) ++stale;
    }
    reconciling = false;
  });
  EXPECT_EQ(stale, 0u);
  stage(rig, apps);
  ASSERT_TRUE(rig.reconcileSync());
  EXPECT_EQ(marks(rig), std::vector<std::string>{"install"});
  onThreads(8, [&](std::size_t i) {
    rig.daemon().assetInstallSucceeded(
        platform::TSAsset::downloadAssetWithIdentifier(apps[i], "Application", std::nullopt));
  });
  EXPECT_EQ(marks(rig), std::vector<std::string>{"INSTALLED"});
}

TEST(Threads, TheObjectGoesWhileServicesCallBack) {
  PluginRig rig(threads);
  const auto apps = identifiers(4);
  for (int round = 0; round < 40; ++round) {
    stage(rig, apps);
    rig.postStartup();
    ASSERT_TRUE(rig.reconcileSync());
    rig.daemon().outstandingAssetTransfers();
    onThreads(3, [&](std::size_t thread) {
      for (std::size_t i = 0; i < apps.size(); ++i) {
        if (thread == 0) rig.device().cancelByPerson(apps[i]);
        if (thread == 1) rig.platform().notifications.notify_post(startupNotification);
        if (thread == 2 && i == 1) rig.forget();
      }
    });
    rig.deliver();
    rig.load();
  }
}

}  // namespace
}  // namespace tests
