#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <random>
#include <thread>
#include <utility>

#include "platform/Describe.h"
#include "platform/InstallCoordination.h"
#include "platform/NotificationCenter.h"
#include "platform/SerialQueue.h"
#include "tests/RestoreScenario.h"
#include "tests/ScriptedServices.h"

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
    list.array()->append(entryOf({.id = app}, "install"));
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

/// Sees whether anybody touches the work area while a thread that marks entries has read the list and not written it.
class EditWatch {
 public:
  void attachTo(PluginRig& rig) {
    rig.parts().watch = [this](std::string_view operation, std::string_view path) { see(operation, path); };
  }

  static void beginEditing() { edits = true; }
  std::size_t disturbed() const { return _disturbed; }
  void awaitEdit() const {
    for (int i = 0; i < 10000 && _underWay == 0; ++i) std::this_thread::yield();
  }

 private:
  void see(std::string_view operation, std::string_view path) {
    if (edits && path == todoListPath && operation == "readFile") {
      ++_underWay;
      for (int i = 0; i < 50; ++i) std::this_thread::yield();
    } else if (edits && path == todoListPath) {
      --_underWay;
    } else if (!edits && operation != "readFile" && std::string_view(todoListPath).substr(0, path.size()) == path) {
      if (_underWay != 0) ++_disturbed;
    }
  }

  static inline constinit thread_local bool edits = false;
  std::atomic<int> _underWay{0};
  std::atomic<std::size_t> _disturbed{0};
};

TEST(Threads, EditsReconciliationAndClearingExcludeOneAnother) {
  EditWatch watch;
  PluginRig rig(threads);
  watch.attachTo(rig);
  const auto apps = identifiers(8);
  std::atomic<bool> reconciling{true};
  onThreads(5, [&](std::size_t thread) {
    if (thread != 4) EditWatch::beginEditing();
    while (thread != 4 && reconciling) {
      for (std::size_t app = thread; app < apps.size(); app += 4) {
        rig.daemon().assetInstallSucceeded(
            platform::TSAsset::downloadAssetWithIdentifier(apps[app], "Application", std::nullopt));
      }
    }
    for (int i = 0; thread == 4 && i < 200; ++i) {
      stage(rig, apps);
      if (i % 5 != 0) watch.awaitEdit();  // there is a list
      rig.reconcileSync();
      if (i % 5 == 4) watch.awaitEdit();
      if (i % 5 == 4) rig.daemon().clearSyncData();
    }
    if (thread == 4) reconciling = false;
  });
  EXPECT_EQ(watch.disturbed(), 0u);
  stage(rig, apps);
  ASSERT_TRUE(rig.reconcileSync());
  EXPECT_EQ(marks(rig), std::vector<std::string>{"install"});
  onThreads(8, [&](std::size_t i) {
    EditWatch::beginEditing();
    rig.daemon().assetInstallSucceeded(
        platform::TSAsset::downloadAssetWithIdentifier(apps[i], "Application", std::nullopt));
  });
  EXPECT_EQ(marks(rig), std::vector<std::string>{"INSTALLED"});
}

/// The device's clock, which counts those who wait for another thread.
class CountingClock final : public platform::Clock {
 public:
  explicit CountingClock(platform::Clock& clock) : _clock(clock) {}

  Instant now() override { return _clock.now(); }
  bool waitUntil(platform::Mutex& mutex, platform::Condition& changed, Instant deadline,
                 const std::function<bool()>& satisfied) override REQUIRES(mutex) {
    if (deadline == noDeadline) ++waits;
    return _clock.waitUntil(mutex, changed, deadline, satisfied);
  }

  std::atomic<std::size_t> waits{0};

 private:
  platform::Clock& _clock;
};

/// A clock that lets go of whoever waits at once, and delivers something on the waiting thread.
class DeliveringClock final : public platform::Clock {
 public:
  DeliveringClock(platform::Clock& clock, std::function<void()> event) : _clock(clock), _event(std::move(event)) {}

  Instant now() override { return _clock.now(); }
  bool waitUntil(platform::Mutex& mutex, platform::Condition&, Instant, const std::function<bool()>&) override
      REQUIRES(mutex) {
    mutex.unlock();
    if (auto event = std::exchange(_event, nullptr)) event();
    std::this_thread::yield();
    mutex.lock();
    return true;
  }

 private:
  platform::Clock& _clock;
  std::function<void()> _event;
};

TEST(Threads, AQueueServesItsCallersInTheOrderInWhichTheyCame) {
  using Block = platform::SerialQueue::Block;
  PluginRig rig(threads);
  for (int round = 0; round < 50; ++round) {
    CountingClock clock(rig.platform().clock);
    platform::SerialQueue queue("line");
    std::vector<std::string> order;
    std::thread other;
    {
      Block block(queue, clock);
      other = std::thread([&] {
        Block waited(queue, clock);
        order.push_back("waited");
      });
      while (clock.waits == 0) std::this_thread::yield();
      tests::BrokenClock broken;
      std::thread([&] { EXPECT_ANY_THROW(Block(queue, broken)); }).join();  // leaves the line
    }
    {
      Block block(queue, clock);
      order.push_back("came later");
    }
    other.join();
    EXPECT_EQ(order, (std::vector<std::string>{"waited", "came later"}));
  }
}

TEST(Threads, WhatIsDeliveredToAThreadInAQueueGoesBeforeThatThread) {
  using Block = platform::SerialQueue::Block;
  PluginRig rig(threads);
  auto& clock = rig.platform().clock;
  platform::SerialQueue queue("line");
  std::vector<std::string> order;
  std::atomic<bool> entered{false};
  std::atomic<bool> leaves{false};
  std::thread other([&] {
    Block block(queue, clock);
    entered = true;
    while (!leaves) std::this_thread::yield();
  });
  while (!entered) std::this_thread::yield();
  DeliveringClock delivering(clock, [&] {
    leaves = true;
    Block block(queue, clock);
    order.push_back("delivered");
  });
  {
    Block block(queue, delivering);
    order.push_back("own");
  }
  other.join();
  EXPECT_EQ(order, (std::vector<std::string>{"delivered", "own"}));
}

/// While `first` is about to do `operation` with that file, `second` begins on another thread, and has to wait.
struct Meeting {
  const char* operation;
  const char* path;
  std::function<void(platform::TSClient&)> first;
  std::function<void(platform::TSClient&)> second;
};

TEST(Threads, WhoeverMeetsAnEditWaitsForItsEnd) {
  const auto mark = [](platform::TSClient& client) {
    client.assetInstallSucceeded(platform::TSAsset::downloadAssetWithIdentifier("app.0", "Application", std::nullopt));
  };
  const auto reconcile = [](platform::TSClient& client) { client.reconcileSync(1, "anchor", {}, nullptr); };
  const auto clear = [](platform::TSClient& client) { client.clearSyncData(); };
  const Meeting meetings[] = {{"readFile", todoListPath, mark, reconcile},
                              {"readFile", todoListPath, mark, clear},
                              {"readFile", todoListPath, mark, mark},
                              {"removeItem", workArea, reconcile, mark},
                              {"removeItem", pluginDirectory, clear, mark}};
  for (const auto& meeting : meetings) {
    PluginRig rig(threads);
    CountingClock clock(rig.platform().clock);
    stage(rig, identifiers(1));
    rig.reconcileSync();
    stage(rig, identifiers(1));
    auto client = rig.makeClient(scripted(rig.platform(), {.clock = &clock}));
    std::atomic<bool> begun{false};
    std::atomic<bool> over{false};
    std::thread other;
    rig.parts().watch = [&](std::string_view operation, std::string_view path) {
      if (operation != meeting.operation || path != meeting.path || begun.exchange(true)) return;
      other = std::thread([&] {
        device::ThreadName name("other");
        meeting.second(*client);
        over = true;
      });
      while (clock.waits == 0 && !over) std::this_thread::yield();
    };
    meeting.first(*client);
    ASSERT_TRUE(other.joinable()) << meeting.operation;
    other.join();
    EXPECT_GE(clock.waits, 1u) << meeting.operation << ' ' << meeting.path;
    rig.parts().watch = nullptr;
  }
}

/// One of the daemon's calls, or what somebody else does meanwhile.
// NOLINTNEXTLINE(readability-function-size): a list of calls
void callAnything(PluginRig& rig, const platform::TSAssetRef& asset, std::size_t which) {
  auto& daemon = rig.daemon();
  const std::string& id = asset->identifier();
  switch (which % 16) {
    case 0:
      daemon.installedAssets();
      break;
    case 1:
      daemon.assetTransferSucceeded(asset, true, nullptr);
      break;
    case 2:
      daemon.assetTransferSucceeded(asset, false, platform::makeError("Daemon", 5, "connection lost"));
      break;
    case 3:
      daemon.assetInstallSucceeded(asset);
      break;
    case 4:
      daemon.assetInstallFailed(asset, nullptr);
      break;
    case 5:
      daemon.assetTransferEndedWithSuccess(false);
      break;
    case 6:
      daemon.syncEndedWithSuccess(true);
      break;
    case 7:
      rig.device().cancelByPerson(id);
      break;
    case 8:
      rig.device().prioritizeByPerson(id);
      break;
    case 9:
      rig.transfers().complete();
      break;
    case 10:
      daemon.prepareForBackup();
      break;
    case 11:
      daemon.vantorIDsForAssets();
      break;
    case 12:
      daemon.installedAssetMetrics();
      break;
    default:
      daemon.assetTransferUpdatedProgress(asset, 0.5);
  }
}

TEST(Threads, EveryEntryPointAtOnce) {
  PluginRig rig(threads);
  rig.postStartup();
  const auto apps = identifiers(6);
  for (int round = 0; round < 5; ++round) {
    stage(rig, apps);
    // Looked up by completions without a path, while callbacks clean it.
    Value records = Value::makeDictionary();
    for (const auto& app : apps) {
      Value path = dictionaryOf({{"path", rig.receivePackage(app, packageOf(app, "2.0"))}});
      records.dictionary()->set(app, dictionaryOf({{"2.0", path}}));
    }
    rig.write(restoreStatePath, binaryList(records));
    ASSERT_TRUE(rig.reconcileSync());
    auto assets = rig.daemon().outstandingAssetTransfers();
    onThreads(8, [&](std::size_t thread) {
      std::mt19937_64 numbers(static_cast<std::uint64_t>(round) * 8 + thread);
      for (int i = 0; i < 30; ++i) {
        // One for each thread: what an asset holds is its transfer's alone.
        auto asset = platform::TSAsset::downloadAssetWithIdentifier(apps[numbers() % apps.size()], "Application", {});
        asset->setVariantOptions(dictionaryOf({{"Version", "2.0"}}));
        callAnything(rig, asset, numbers());
        if (thread == 0 && i % 15 == 14) rig.daemon().outstandingAssetTransfers();
      }
    });
    rig.deliver();
    rig.daemon().assetTransferEndedWithSuccess(false);
    rig.deliver();
    EXPECT_EQ(rig.readList(todoListPath).array()->size(), apps.size());
  }
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
        if (thread == 0) rig.device().prioritizeByPerson(apps[(i + 1) % apps.size()]);
        if (thread == 1) rig.platform().notifications.notify_post(startupNotification);
        // The answer to a request holds the object, and may be the last that does.
        if (thread == 1) rig.transfers().complete();
        if (thread == 2 && i == 1) rig.forget();
      }
    });
    rig.deliver();
    rig.load();
  }
}

TEST(Threads, TheObjectGoesOnTheThreadThatDeliversItsLastAnswer) {
  PluginRig rig;
  rig.install("app.0", "1");
  std::weak_ptr<platform::TSClient> object = rig.client();
  // The removal's completion holds the object until it has been delivered.
  rig.daemon().assetInstallFailed(platform::TSAsset::downloadAssetWithIdentifier("app.0", "Application", {}), nullptr);
  rig.forget();
  rig.deliver();
  EXPECT_TRUE(object.expired());
  const auto& records = rig.records();
  auto gone = std::find_if(records.rbegin(), records.rend(), [](const device::CallRecord& record) {
    return record.service == "OBApplicationWorkspace" && record.operation == "removeObserver";
  });
  ASSERT_NE(gone, records.rend());
  EXPECT_EQ(gone->thread, "coordination");
}

}  // namespace
}  // namespace tests
