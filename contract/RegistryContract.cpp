#include <algorithm>

#include "contract/Fixture.h"
#include "platform/Process.h"

namespace contract {
namespace {

class RegistryContract : public Fixture {};
INSTANTIATE_TEST_SUITE_P(Contract, RegistryContract, testing::ValuesIn(hosts()), nameOfHost);

TEST_P(RegistryContract, WhatIsKnownOfAnApp) {
  install(maps, "1");
  begin(initiating, notes);
  auto listed = [&](std::uint64_t type) {
    Lines ids;
    registry().enumerateBundlesOfType(type,
                                      [&](const auto& bundle, bool&) { ids.push_back(*bundle->bundleIdentifier); });
    std::sort(ids.begin(), ids.end());
    return ids;
  };
  EXPECT_EQ(listed(0), (Lines{maps, notes}));
  EXPECT_EQ(listed(1), (Lines{maps, notes}));
  EXPECT_EQ(listed(7), Lines{});
  int calls = 0;
  registry().enumerateBundlesOfType(0, [&](const auto&, bool& stop) { stop = ++calls == 1; });
  EXPECT_EQ(calls, 1);
  EXPECT_TRUE(registry().applicationIsInstalled(maps));
  EXPECT_FALSE(registry().applicationIsInstalled(notes)) << "a placeholder is no installed app";
  EXPECT_FALSE(registry().applicationProxyForIdentifier(notes, false));
  EXPECT_FALSE(registry().applicationProxyForIdentifier(maps, true));
  EXPECT_FALSE(registry().applicationProxyForIdentifier("com.example.none", false));
  auto proxy = registry().applicationProxyForIdentifier(maps, false);
  ASSERT_TRUE(proxy);
  EXPECT_EQ(proxy->applicationIdentifier, maps);
  EXPECT_EQ(proxy->bundleVersion, "1");
  EXPECT_TRUE(proxy->appState.isInstalled && !proxy->appState.isPlaceholder);
  ASSERT_TRUE(proxy->bundleURL);
  const Value info = platform().process.infoDictionaryOfBundleAtPath(*proxy->bundleURL);
  ASSERT_TRUE(info.dictionary());
  EXPECT_EQ((*info.dictionary())["KBBundleIdentifier"].string(), maps);
  // A proxy is a snapshot.
  ASSERT_TRUE(registry().uninstallApplication(maps));
  EXPECT_FALSE(registry().uninstallApplication(maps));
  EXPECT_TRUE(proxy->isInstalled);
  EXPECT_EQ(stateOf(), "");
}

TEST_P(RegistryContract, ReportsOfRunningInstalls) {
  auto observer = std::make_shared<RecordingObserver>();
  auto reports = [&] {
    host().deliver();
    auto lines = observer->notes.take();
    // Only the last picture counts: a registry may say the same one more than once.
    Lines distinct;
    for (const auto& line : lines) {
      if (distinct.empty() || distinct.back() != line) distinct.push_back(line);
    }
    return distinct;
  };
  {
    InsideCall inside;
    registry().addObserver(observer);
  }
  EXPECT_EQ(reports(), Lines{"runs"}) << "the first report comes when nothing runs, too";
  auto package = begin(initiating);
  EXPECT_EQ(reports(), Lines{"runs com.example.maps"});
  auto progress = registry().applicationProxyForIdentifier(maps, true)->installProgressSync;
  ASSERT_TRUE(progress);
  EXPECT_EQ(progress->installState, 1u) << "active";
  EXPECT_EQ(progress->installPhase, 0u) << "loading";
  send(package, packageOf(maps, "1"));
  EXPECT_EQ(reports().back(), "runs");
  auto update = coordinator(updating);
  begin(updating);
  EXPECT_EQ(reports(), Lines{"runs com.example.maps"});
  update->cancelForReason(nullptr, 3);
  EXPECT_EQ(reports(), (Lines{"cancelled com.example.maps", "runs"}));
  registry().removeObserver(observer.get());
  registry().removeObserver(observer.get());  // an unknown one is ignored
  begin(initiating, notes);
  EXPECT_EQ(reports(), Lines{});
  registry().addObserver(observer);
  std::weak_ptr<RecordingObserver> alive = observer;
  observer.reset();
  EXPECT_TRUE(alive.expired()) << "nobody keeps an observer alive";
  host().deliver();
}

TEST_P(RegistryContract, AnObserverMayEndItselfInItsReport) {
  auto observer = std::make_shared<RecordingObserver>();
  observer->then = [&] { registry().removeObserver(observer.get()); };
  registry().addObserver(observer);
  begin(initiating);
  host().deliver();
  EXPECT_EQ(observer->notes.take().size(), 1u);
  begin(initiating, notes);
  host().deliver();
  EXPECT_EQ(observer->notes.take().size(), 0u);
}

TEST_P(RegistryContract, TheRemovalOfAnObserverWaitsForItsReport) {
  auto observer = std::make_shared<RecordingObserver>();
  expectRemovalToWait(
      [&](const std::function<void()>& callback) {
        observer->then = callback;
        registry().addObserver(observer);
      },
      [&] { registry().removeObserver(observer.get()); });
}

}  // namespace
}  // namespace contract
