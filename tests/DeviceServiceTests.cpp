#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <thread>

#include "plist/PropertyList.h"
#include "tests/DeviceRig.h"

namespace tests {
namespace {

class DeviceServices : public testing::TestWithParam<Medium>, protected DeviceRig {
 protected:
  DeviceServices() : DeviceRig(GetParam()) {}

  platform::InstallCoordination& coordination() { return platform().installCoordination; }
  platform::OBApplicationWorkspace& registry() { return platform().workspace; }
  std::shared_ptr<RecordingDelegate> observe(const Coordinator& coordinator) {
    auto delegate = std::make_shared<RecordingDelegate>();
    coordinator->setObserver(delegate);
    return delegate;
  }
  std::shared_ptr<RecordingObserver> watchRegistry() {
    auto observer = std::make_shared<RecordingObserver>();
    registry().addObserver(observer);
    deliver();
    observer->lines.clear();
    return observer;
  }
  Lines homeOrder() { return device().status().home; }
};

INSTANTIATE_TEST_SUITE_P(Media, DeviceServices, testing::Values(Medium::disk, Medium::memory), nameOfMedium);

TEST_P(DeviceServices, LookUpRules) {
  auto lookUp = [&](Kind kind, bool create, const char* app = maps) {
    bool created = true;
    ErrorRef error;
    auto found = coordination().coordinatorForAppWithBundleID(kind, app, 3, create, &created, &error);
    return std::string(found ? "found" : "none") + (created ? " new" : "") + (error ? " error" : "");
  };
  constexpr auto any = Kind::RVAppInstallCoordinator;
  constexpr auto initiating = Kind::RVInitiatingAppInstallCoordinator;
  constexpr auto updating = Kind::RVUpdatingAppInstallCoordinator;
  EXPECT_EQ(lookUp(any, false), "none");
  EXPECT_EQ(lookUp(initiating, false), "none");
  EXPECT_EQ(lookUp(any, true), "none error");
  EXPECT_EQ(lookUp(initiating, true), "found new");
  EXPECT_EQ(lookUp(initiating, true), "found");
  EXPECT_EQ(lookUp(any, false), "found");
  EXPECT_EQ(lookUp(updating, true), "none error");
  EXPECT_EQ(lookUp(Kind::RVRestoringAppInstallCoordinator, false), "none error");
  EXPECT_EQ(lookUp(initiating, true, "../etc"), "none error");
  EXPECT_EQ(lookUp(initiating, true, ""), "none error");
  // What another client made is found, and says whose it is.
  ASSERT_TRUE(device().beginStoreInstall(notes, {}));
  auto foreign = coordination().coordinatorForAppWithBundleID(initiating, notes, 3, true);
  ASSERT_TRUE(foreign);
  EXPECT_EQ(foreign->creatorIdentifier(), 1u);
  EXPECT_EQ(foreign->bundleID(), notes);
}

TEST_P(DeviceServices, WhatACoordinatorRefuses) {
  auto coordinator = this->coordinator(Kind::RVInitiatingAppInstallCoordinator);
  auto refused = [](bool result, const ErrorRef& error) { return !result && error; };
  ErrorRef error;
  EXPECT_FALSE(coordinator->appAssetPromiseWithError(&error));
  EXPECT_TRUE(error);
  EXPECT_TRUE(refused(coordinator->setPlaceholderPromise(nullptr, &error), error));
  EXPECT_TRUE(refused(coordinator->setPlaceholderPromise(placeholder(notes), &error), error));
  EXPECT_TRUE(refused(coordinator->setAppAssetPromise(nullptr, &error), error));
  auto cancelled = placeholder();
  EXPECT_TRUE(cancelled->cancelForReason(platform::makeError("TSError", 1), 3));
  EXPECT_TRUE(refused(coordinator->setPlaceholderPromise(cancelled, &error), error));
  EXPECT_FALSE(coordinator->hasPlaceholderPromise());
  auto configured = placeholder();
  EXPECT_TRUE(refused(configured->setMetadata(nullptr, &error), error));
  EXPECT_TRUE(coordinator->setPlaceholderPromise(configured, &error));
  EXPECT_FALSE(error);
  EXPECT_TRUE(refused(coordinator->setPlaceholderPromise(placeholder(), &error), error));
  // An empty list of initial promises is one, too.
  EXPECT_FALSE(coordinator->hasInitialZDRAssetPromises());
  EXPECT_TRUE(coordinator->setInitialZDRAssetPromises({}));
  EXPECT_TRUE(coordinator->hasInitialZDRAssetPromises());
  auto promise = this->promise(coordinator);
  EXPECT_EQ(coordinator->appAssetPromiseWithError(), promise);
  EXPECT_TRUE(refused(coordinator->setAppAssetPromise(promise, &error), error));
  // An install does not outlive its package's promise, and a promise kept afterwards comes to nothing.
  EXPECT_TRUE(promise->cancelForReason(platform::makeError("TSError", 30), 3));
  promise->setComplete(true);
  deliver();
  EXPECT_EQ(stateOf(), "");
  EXPECT_TRUE(refused(coordinator->setUserDataPromise(
                          coordination().makePromisedOutOfBandTransfer("com.example.maps-UserData", 3, 0), &error),
                      error));
  EXPECT_FALSE(coordinator->hasUserDataPromise());
}

TEST_P(DeviceServices, CallbacksGoToTheObserverElseToTheClientsObservers) {
  auto own = std::make_shared<RecordingDelegate>();
  auto ofClient = std::make_shared<RecordingDelegate>();
  auto ofOthers = std::make_shared<RecordingDelegate>();
  auto registration = coordination().makeAppInstallObserver("service", {2, 3}, ofClient);
  auto other = coordination().makeAppInstallObserver("service", {1}, ofOthers);
  begin(Kind::RVInitiatingAppInstallCoordinator);
  deliver();
  EXPECT_EQ(ofClient->lines, Lines{"placeholder"});
  auto coordinator = this->coordinator(Kind::RVInitiatingAppInstallCoordinator);
  coordinator->setObserver(own);
  ASSERT_TRUE(device().prioritizeByPerson(maps));
  deliver();
  EXPECT_EQ(own->lines, Lines{"prioritize"});
  own.reset();
  ASSERT_TRUE(device().prioritizeByPerson(maps));
  deliver();
  EXPECT_EQ(ofClient->lines, (Lines{"placeholder", "prioritize"}));
  ASSERT_TRUE(device().prioritizeByPerson(maps));
  registration.reset();
  deliver();
  EXPECT_EQ(ofClient->lines.size(), 2u);
  EXPECT_TRUE(ofOthers->lines.empty());
  EXPECT_FALSE(device().prioritizeByPerson(notes));
}

TEST_P(DeviceServices, CallbacksWaitForTheCallersNextCall) {
  auto coordinator = this->coordinator(Kind::RVInitiatingAppInstallCoordinator);
  auto placeholder = this->placeholder();
  deliver();
  ASSERT_TRUE(coordinator->setPlaceholderPromise(placeholder));
  auto before = events().pending();
  auto delegate = observe(coordinator);
  EXPECT_GT(events().pending(), before);
  deliver();
  EXPECT_EQ(delegate->lines, Lines{"placeholder"});
}

TEST_P(DeviceServices, AnObserverMayCallTheServicesBack) {
  auto promise = begin(Kind::RVInitiatingAppInstallCoordinator);
  auto coordinator = this->coordinator(Kind::RVInitiatingAppInstallCoordinator);
  auto delegate = observe(coordinator);
  delegate->then = [&](const Coordinator& each) {
    registry().enumerateBundlesOfType(0, [&](const auto&, bool&) { registry().uninstallApplication(maps); });
    each->setObserver({});
  };
  auto observer = std::make_shared<RecordingObserver>();
  observer->then = [&] { registry().removeObserver(observer.get()); };
  registry().addObserver(observer);
  deliver();
  EXPECT_EQ(delegate->lines, Lines{"placeholder"});
  EXPECT_EQ(observer->lines.size(), 1u);
  EXPECT_EQ(stateOf(), "");
}

TEST_P(DeviceServices, RegistryReports) {
  device::StoreInstall paused;
  paused.paused = true;
  paused.installState = 2;
  ASSERT_TRUE(device().beginStoreInstall(notes, paused));
  begin(Kind::RVInitiatingAppInstallCoordinator);
  deliver();
  auto observer = std::make_shared<RecordingObserver>();
  registry().addObserver(observer);
  EXPECT_TRUE(observer->lines.empty());
  deliver();
  EXPECT_EQ(observer->lines, Lines{"runs com.example.maps/10 paused com.example.notes/20"});
  device::StoreInstall odd;
  odd.installType = 40;
  odd.installState = 41;
  odd.installPhase = 42;
  odd.createsCoordinator = false;
  ASSERT_TRUE(device().beginStoreInstall(notes, odd));
  deliver();
  EXPECT_EQ(observer->lines.back(), "runs com.example.maps/10 com.example.notes/4142");
  EXPECT_EQ(stateOf(notes), "placeholder 40");
  registry().removeObserver(observer.get());
  ASSERT_TRUE(device().uninstallByPerson(notes));
  deliver();
  EXPECT_EQ(observer->lines.size(), 2u);
  registry().addObserver(observer);
  std::weak_ptr<RecordingObserver> alive = observer;
  observer.reset();
  EXPECT_TRUE(alive.expired());
  deliver();
}

TEST_P(DeviceServices, TheRegistrysViewOfApps) {
  install(maps, "1");
  device::StoreInstall system;
  system.applicationType = "System";
  system.systemBundle = true;
  system.hasProgress = false;
  ASSERT_TRUE(device().beginStoreInstall(notes, system));
  auto listed = [&](std::uint64_t type) {
    Lines ids;
    registry().enumerateBundlesOfType(type,
                                      [&](const auto& bundle, bool&) { ids.push_back(*bundle->bundleIdentifier); });
    return ids;
  };
  EXPECT_EQ(listed(0), (Lines{maps, notes}));
  EXPECT_EQ(listed(1), (Lines{maps, notes}));
  EXPECT_EQ(listed(7), Lines{notes});
  EXPECT_EQ(listed(3), Lines{});
  int calls = 0;
  registry().enumerateBundlesOfType(0, [&](const auto&, bool& stop) { stop = ++calls == 1; });
  EXPECT_EQ(calls, 1);
  EXPECT_TRUE(registry().applicationIsInstalled(maps));
  EXPECT_FALSE(registry().applicationIsInstalled(notes));
  EXPECT_FALSE(registry().applicationProxyForIdentifier(notes, false));
  EXPECT_FALSE(registry().applicationProxyForIdentifier(maps, true));
  auto proxy = registry().applicationProxyForIdentifier(maps, false);
  ASSERT_TRUE(proxy);
  EXPECT_TRUE(proxy->isInstalled && proxy->appState.isInstalled && !proxy->isPlaceholder);
  EXPECT_GT(proxy->diskUsage.staticUsage, 10u);
  EXPECT_EQ(files().readFile(*proxy->bundleURL + "/data/tiles"), "0123456789");
  // A proxy is a snapshot.
  ASSERT_TRUE(registry().uninstallApplication(maps));
  EXPECT_FALSE(registry().uninstallApplication(maps));
  EXPECT_TRUE(proxy->isInstalled);
}

TEST_P(DeviceServices, UninstalledApps) {
  install(maps, "1");
  install(notes, "1");
  Lines completions;
  auto uninstall = [&](const std::string& app) {
    coordination().uninstallAppWithBundleID(app, false, [&completions, app](const ErrorRef& error) {
      completions.push_back(app + (error ? " error" : ""));
    });
  };
  uninstall(maps);
  uninstall("com.example.none");
  EXPECT_TRUE(completions.empty());
  events().release();
  deliver();
  EXPECT_EQ(completions, (Lines{"com.example.maps", "com.example.none error"}));
  EXPECT_TRUE(device().uninstallByPerson(notes));
  auto uninstalled = platform().installer.CorvaneLookupUninstalled();
  EXPECT_EQ(uninstalled.dictionary()->size(), 2u);
  install(maps, "2");
  EXPECT_FALSE(platform().installer.CorvaneLookupUninstalled().dictionary()->contains(maps));
  EXPECT_EQ(platform().installer.CorvaneClearUninstalled({notes}), 0);
  EXPECT_TRUE(platform().installer.CorvaneLookupUninstalled().dictionary()->empty());
}

TEST_P(DeviceServices, HomeScreenLayouts) {
  auto layout = [](const char* xml) { return std::string("<plist version=\"1.0\">") + xml + "</plist>"; };
  struct Case {
    std::string bytes;
    bool accepted;
    Lines order;
  };
  const Case cases[] = {
      {layout("<array><string>b</string><string>a</string></array>"), true, {"b", "a"}},
      {layout("<array><array><string>c</string></array><array/><array><string>b</string></array></array>"),
       true,
       {"c", "b"}},
      {layout("<array><string>b</string><string>a</string><string>b</string></array>"), true, {"b", "a"}},
      {layout("<array/>"), true, {}},
      {layout("<array><string>a</string><array/></array>"), false, {}},
      {layout("<array><array><string>a</string></array><string>b</string></array>"), false, {}},
      {layout("<array><array><array/></array></array>"), false, {}},
      {layout("<array><integer>1</integer></array>"), false, {}},
      {layout("<array><string></string></array>"), false, {}},
      {layout("<dict/>"), false, {}},
      {"no property list", false, {}},
      {"", false, {}},
  };
  auto& home = platform().homeScreen;
  auto port = home.PNSPanelloBlockableServerPort();
  auto flattened = [&] {
    void* buffer = &home;
    std::size_t length = 1;
    EXPECT_EQ(home.PNGetFlattenedIconState(port, 1, &buffer, &length), 0);
    Lines ids;
    if (!buffer) return ids;
    auto value = plist::read(Bytes(static_cast<char*>(buffer), length));
    platform().process.deallocateMemory(buffer, length);
    for (const auto& id : *value.array()) ids.emplace_back(*id.string());
    return ids;
  };
  EXPECT_EQ(flattened(), Lines{});
  for (const auto& each : cases) {
    SCOPED_TRACE(each.bytes);
    auto before = homeOrder();
    EXPECT_EQ(home.PNSetIconState(port, each.bytes) == 0, each.accepted);
    EXPECT_EQ(homeOrder(), each.accepted ? each.order : before);
    EXPECT_EQ(flattened(), homeOrder());
  }
}

TEST_P(DeviceServices, HomeScreenOrder) {
  install(notes, "1");
  install(maps, "1");
  EXPECT_EQ(homeOrder(), (Lines{notes, maps}));
  auto bytes = *plist::writeBinary([] {
    auto value = Value::makeArray();
    for (const char* id : {"com.example.later", maps}) value.array()->append(id);
    return value;
  }());
  ASSERT_EQ(platform().homeScreen.PNSetIconState(1, bytes), 0);
  EXPECT_EQ(homeOrder(), (Lines{"com.example.later", maps, notes}));
  begin(Kind::RVInitiatingAppInstallCoordinator, "com.example.later");
  EXPECT_EQ(homeOrder(), (Lines{"com.example.later", maps, notes}));
  ASSERT_TRUE(device().uninstallByPerson(maps));
  begin(Kind::RVInitiatingAppInstallCoordinator, maps);
  EXPECT_EQ(homeOrder(), (Lines{"com.example.later", notes, maps}));
  reopen();
  EXPECT_EQ(homeOrder(), (Lines{"com.example.later", notes, maps}));
}

TEST_P(DeviceServices, TheOwnerIsToldOfEachChange) {
  auto promise = begin(Kind::RVInitiatingAppInstallCoordinator);
  promise->setPercentComplete(0.5);
  ASSERT_TRUE(device().cancelByPerson(maps));
  EXPECT_TRUE(told().empty());
  deliver();
  EXPECT_EQ(told(),
            (Lines{"com.example.maps placeholder", "com.example.maps placeholder", "com.example.maps  CANCELED"}));
}

TEST_P(DeviceServices, AStoreThatRefusesChangesNothing) {
  install(notes, "1");
  auto coordinator = this->coordinator(Kind::RVInitiatingAppInstallCoordinator);
  auto placeholder = this->placeholder();
  breakStore(true);
  ErrorRef error;
  EXPECT_FALSE(coordinator->setPlaceholderPromise(placeholder, &error));
  EXPECT_TRUE(error);
  EXPECT_FALSE(coordinator->hasPlaceholderPromise());
  EXPECT_FALSE(coordinator->cancelForReason(nullptr, 3, &error));
  EXPECT_FALSE(registry().uninstallApplication(notes));
  EXPECT_FALSE(coordination().coordinatorForAppWithBundleID(Kind::RVInitiatingAppInstallCoordinator, "com.example.x", 3,
                                                            true, nullptr, &error));
  EXPECT_NE(platform().homeScreen.PNSetIconState(1, "<plist><array/></plist>"), 0);
  EXPECT_FALSE(device().set("icon-size", "64", &error));
  breakStore(false);
  EXPECT_EQ(containerCount(), 1u);
  EXPECT_EQ(device().setting("icon-size"), "120");
  EXPECT_EQ(stateOf(notes), "installed 0 1");
  EXPECT_TRUE(coordinator->setPlaceholderPromise(placeholder, &error));
  deliver();
  EXPECT_EQ(stateOf(), "placeholder 4 2");
  // An install that cannot be recorded fails, and says so, rather than leave anybody waiting.
  auto delegate = observe(coordinator);
  auto promise = this->promise(coordinator);
  write(packagePath(maps), packageOf(maps, "3"));
  promise->setTransferPath(packagePath(maps));
  breakStore(true);
  promise->setComplete(true);
  events().release();
  deliver();
  EXPECT_EQ(delegate->lines, Lines{"fails"});
}

TEST(DeviceThreads, InstallsCancelsAndQueriesAtOnce) {
  auto events = device::makeThreadedEventQueue();
  auto device = device::makeMemoryDevice(std::move(events), {});
  auto& service = device->platform().installCoordination;
  auto& registry = device->platform().workspace;
  auto observer = std::make_shared<platform::OBApplicationWorkspaceObserver>();
  auto delegate = std::make_shared<platform::RVAppInstallObserverDelegate>();
  registry.addObserver(observer);
  auto registration = service.makeAppInstallObserver("service", {3}, delegate);
  auto work = [&](int worker) {
    for (int i = 0; i < 40; ++i) {
      std::string app = "com.example.app" + std::to_string((worker + i) % 5);
      std::string path = std::string(packages) + '/' + app + std::to_string(worker) + ".pkg";
      auto coordinator = service.coordinatorForAppWithBundleID(Kind::RVInitiatingAppInstallCoordinator, app, 3, true);
      auto promise = service.makePromisedTransferToPathWithoutPath(app + "-Asset", 3, 0);
      coordinator->setAppAssetPromise(promise);
      coordinator->setPlaceholderPromise(service.makeAppPlaceholder("App", app, 4, 3));
      promise->setPercentComplete(0.5);
      device->files().createFile(path, packageOf(app, "1"), {});
      promise->setTransferPath(path);
      promise->setComplete(true);
      registry.enumerateBundlesOfType(0, [&](const auto& bundle, bool&) {
        if (i % 4 == worker) registry.uninstallApplication(*bundle->bundleIdentifier);
      });
      if (i % 3 == 0) coordinator->cancelForReason(nullptr, 3);
    }
  };
  std::vector<std::thread> workers;
  for (int worker = 0; worker < 3; ++worker) workers.emplace_back(work, worker);
  for (auto& worker : workers) worker.join();
  device->events().drain();
  std::size_t present = 0;
  for (const auto& app : device->status().apps) {
    if (app.state.empty()) continue;
    ++present;
    // A placeholder is there for an open coordinator only.
    EXPECT_EQ(app.state == "placeholder",
              service.coordinatorForAppWithBundleID(Kind::RVAppInstallCoordinator, app.id, 3, false) != nullptr &&
                  app.state != "updating" && app.state != "installed")
        << app.id << ' ' << app.state;
    EXPECT_TRUE(device->files().fileExists(
        *registry.applicationProxyForIdentifier(app.id, app.state == "placeholder")->bundleURL));
  }
  EXPECT_EQ(device->files().list(containers)->size(), present);
  registry.removeObserver(observer.get());
  registration.reset();
  device->events().drain();
  device->events().stop();
}

}  // namespace
}  // namespace tests
