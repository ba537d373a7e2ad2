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

TEST_P(DeviceServices, WhatTheStoreDoes) {
  device::StoreInstall paused;
  paused.paused = true;
  paused.installState = 2;
  ASSERT_TRUE(device().beginStoreInstall(notes, paused));
  auto foreign = coordination().coordinatorForAppWithBundleID(Kind::RVInitiatingAppInstallCoordinator, notes, 3, true);
  ASSERT_TRUE(foreign);
  EXPECT_EQ(foreign->creatorIdentifier(), 1u);
  auto observer = watchRegistry();
  begin(Kind::RVInitiatingAppInstallCoordinator);
  deliver();
  EXPECT_EQ(observer->lines.back(), "runs com.example.maps/10 paused com.example.notes/20");
  device::StoreInstall odd;
  odd.installType = 40;
  odd.installState = 41;
  odd.installPhase = 42;
  odd.createsCoordinator = false;
  ASSERT_TRUE(device().beginStoreInstall(notes, odd));
  deliver();
  EXPECT_EQ(observer->lines.back(), "runs com.example.maps/10 com.example.notes/4142");
  EXPECT_EQ(stateOf(notes), "placeholder 40");
  device::StoreInstall system;
  system.applicationType = "System";
  system.systemBundle = true;
  system.hasProgress = false;
  ASSERT_TRUE(device().beginStoreInstall("com.example.other", system));
  auto countOfType = [&](std::uint64_t type) {
    int count = 0;
    registry().enumerateBundlesOfType(type, [&](const auto&, bool&) { ++count; });
    return count;
  };
  EXPECT_EQ(countOfType(1), 3);
  EXPECT_EQ(countOfType(7), 1);
  EXPECT_EQ(countOfType(3), 0);
}

TEST_P(DeviceServices, WhatThePersonDoes) {
  auto delegate = observe(coordinator(Kind::RVInitiatingAppInstallCoordinator));
  ASSERT_TRUE(device().prioritizeByPerson(maps));
  deliver();
  EXPECT_EQ(delegate->lines, Lines{"prioritize"});
  EXPECT_FALSE(device().prioritizeByPerson(notes));
  install(notes, "1");
  EXPECT_TRUE(device().uninstallByPerson(notes));
  EXPECT_FALSE(device().uninstallByPerson(notes));
  EXPECT_TRUE(platform().installer.CorvaneLookupUninstalled().dictionary()->contains(notes));
}

TEST_P(DeviceServices, WhatIsRemovedWhileTheStoreFinishesItStaysRemoved) {
  device::StoreInstall alone;
  alone.createsCoordinator = false;
  write(packagePath(notes), packageOf(notes, "3"));
  for (const std::string& package : {std::string(), packagePath(notes)}) {
    SCOPED_TRACE(package);
    ASSERT_TRUE(device().beginStoreInstall(notes, alone));
    meanwhile("syncItem", [&] { EXPECT_TRUE(device().uninstallByPerson(notes)); });
    ErrorRef error;
    EXPECT_FALSE(device().finishStoreInstall(notes, package, &error));
    EXPECT_EQ(error->description(), "com.example.notes was removed meanwhile");
    EXPECT_EQ(stateOf(notes), "");
    EXPECT_EQ(containerCount(), 0u);
    EXPECT_TRUE(files().fileExists(packagePath(notes)));
  }
  // Nor is anything done to an install that has taken its place.
  ASSERT_TRUE(device().beginStoreInstall(notes, alone));
  meanwhile("syncItem", [&] {
    EXPECT_TRUE(device().uninstallByPerson(notes));
    begin(Kind::RVInitiatingAppInstallCoordinator, notes);
  });
  EXPECT_FALSE(device().finishStoreInstall(notes, packagePath(notes)));
  EXPECT_EQ(stateOf(notes), "placeholder 4 2");
  EXPECT_EQ(device().status().coordinators.size(), 1u);
  EXPECT_EQ(containerCount(), 1u);
}

TEST_P(DeviceServices, APlaceholderThatIsNotTakenLeavesNothing) {
  meanwhile("createNew", [&] { coordinator(Kind::RVInitiatingAppInstallCoordinator, notes); });
  EXPECT_FALSE(device().beginStoreInstall(notes, {}));
  EXPECT_EQ(containerCount(), 0u);
  // Cancelled while its files are written, it takes its coordinator along.
  auto offered = placeholder();
  meanwhile("createNew", [&] { EXPECT_TRUE(offered->cancelForReason(nullptr, 3)); });
  EXPECT_FALSE(coordinator(Kind::RVInitiatingAppInstallCoordinator)->setPlaceholderPromise(offered));
  EXPECT_EQ(stateOf(), "");
  EXPECT_EQ(device().status().coordinators.size(), 1u);  // the other app's
  EXPECT_EQ(containerCount(), 0u);
}

TEST_P(DeviceServices, NamesThatAreNoIdentifiers) {
  for (const char* name : {"../etc", "", "a/b"}) {
    ErrorRef error;
    EXPECT_FALSE(coordination().coordinatorForAppWithBundleID(Kind::RVInitiatingAppInstallCoordinator, name, 3, true,
                                                              nullptr, &error));
    EXPECT_TRUE(error) << name;
  }
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
    if (!app.isOnDevice()) continue;
    ++present;
    // A placeholder is there for an open coordinator only.
    EXPECT_EQ(app.state == device::AppState::placeholder,
              service.coordinatorForAppWithBundleID(Kind::RVAppInstallCoordinator, app.id, 3, false) != nullptr &&
                  app.state != device::AppState::updating && app.state != device::AppState::installed)
        << app.id << ' ' << device::nameOfState(app.state);
    EXPECT_TRUE(device->files().fileExists(
        *registry.applicationProxyForIdentifier(app.id, app.state == device::AppState::placeholder)->bundleURL));
  }
  EXPECT_EQ(device->files().list(containers)->size(), present);
  registry.removeObserver(observer.get());
  registration.reset();
  device->events().drain();
  device->events().stop();
}

}  // namespace
}  // namespace tests
