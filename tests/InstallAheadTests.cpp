#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <future>
#include <thread>

#include "device/events/EventQueue.h"
#include "device/install/Containers.h"
#include "platform/Describe.h"
#include "platform/DevicePaths.h"
#include "platform/InstallCoordination.h"
#include "platform/Installer.h"
#include "tests/PluginRig.h"
#include "tests/Scenario.h"

namespace tests {
namespace {

/// Three apps whose packages have arrived and are unpacked, while none of them is installed yet.
class InstallsAhead : public testing::Test {
 protected:
  void SetUp() override {
    _rig.postStartup();
    const auto assets = ask({"app.a", "app.b", "app.c"});
    ASSERT_EQ(assets.size(), 3u);
    ASSERT_EQ(containers(), 3u) << "of the placeholders";
    block();
    for (const auto& asset : assets) send(asset, "2.0");
    while (containers() != 6) std::this_thread::yield();
  }
  void TearDown() override {
    const auto status = _rig.device().status();
    const auto there =
        std::count_if(status.apps.begin(), status.apps.end(), [](const auto& app) { return app.isOnDevice(); });
    EXPECT_EQ(containers(), static_cast<std::size_t>(there)) << "one for each app, and none that is nobody's";
  }

  /// Begins a sync of these apps.
  std::vector<TSAssetRef> ask(const std::vector<std::string>& ids) {
    Value list = Value::makeArray();
    for (const auto& id : ids) {
      const ScenarioApp app{.id = id};
      list.array()->append(entryOf(app, "install"));
      const std::string folder = std::string(stagingDirectory) + '/' + id;
      _rig.write(folder + "/Info.plist", binaryList(dictionaryOf({{"KBBundleIdentifier", id}})));
      _rig.write(folder + "/HarluneMetadata.plist", binaryList(dictionaryOf({{"itemId", 5}})));
    }
    _rig.write(std::string(stagingDirectory) + "/ApplicationsSync.plist", binaryList(list));
    EXPECT_TRUE(_rig.reconcileSync());
    return _rig.daemon().outstandingAssetTransfers();
  }
  void send(const TSAssetRef& asset, const std::string& version) {
    asset->setPath(_rig.receivePackage(asset->identifier(), packageOf(asset->identifier(), version)));
    _rig.transferEnded(asset, true);
  }

  /// Keeps the device from installing anything until it may go on.
  void block() {
    std::promise<void> begun;
    _rig.device().events().post(device::Lane::coordination, [this, &begun] {
      begun.set_value();
      _mayGoOn.get_future().wait();
    });
    begun.get_future().wait();
  }
  void goOn() {
    _mayGoOn.set_value();
    _rig.deliver();
  }

  std::size_t containers() {
    const auto entries = _rig.device().files().list(device::containersDirectory);
    return entries ? entries->size() : 0;
  }
  device::AppState stateOf(const std::string& id) {
    const auto app = _rig.device().app(id);
    return app ? app->state : device::AppState::gone;
  }

  std::promise<void> _mayGoOn;
  PluginRig _rig{PluginRig::Options{.threaded = true}};
};

TEST_F(InstallsAhead, installWhatWasUnpackedInItsTurn) {
  goOn();
  for (const char* id : {"app.a", "app.b", "app.c"}) EXPECT_EQ(stateOf(id), device::AppState::installed);
}

TEST_F(InstallsAhead, leaveNothingOfAnAppThatWasCancelledOrRemoved) {
  ASSERT_TRUE(_rig.device().cancelByPerson("app.a"));
  ASSERT_TRUE(_rig.device().uninstallByPerson("app.b"));
  goOn();
  EXPECT_EQ(stateOf("app.a"), device::AppState::gone);
  EXPECT_EQ(stateOf("app.b"), device::AppState::gone);
  EXPECT_EQ(stateOf("app.c"), device::AppState::installed);
}

TEST_F(InstallsAhead, leaveNothingWhenInstallsArePutOff) {
  _rig.device().putOffInstalls();
  goOn();
  for (const char* id : {"app.a", "app.b", "app.c"}) EXPECT_EQ(stateOf(id), device::AppState::placeholder);
}

TEST_F(InstallsAhead, useTheMetadataThatCountInTheirTurn) {
  const auto& platform = _rig.platform();
  auto coordinator = platform.installCoordination.coordinatorForAppWithBundleID(
      platform::RVCoordinatorKind::RVAppInstallCoordinator, "app.a", 3, false);
  ASSERT_TRUE(coordinator);
  auto options = platform.installer.makeInstallOptions();
  options->setHarluneMetadata(platform.installer.makeStoreMetadata(dictionaryOf({{"itemId", 6}})));
  ASSERT_TRUE(coordinator->setInstallOptions(options));
  goOn();
  std::vector<std::string> found;
  const auto entries = _rig.device().files().list(device::containersDirectory);
  ASSERT_TRUE(entries);
  for (const auto& container : *entries) {
    const Value metadata = _rig.readList(std::string(device::containersDirectory) + '/' + container.name + '/' +
                                         std::string(platform::storeMetadataFileName));
    ASSERT_TRUE(metadata.dictionary());
    found.push_back(platform::describe((*metadata.dictionary())["itemId"]));
  }
  std::sort(found.begin(), found.end());
  EXPECT_EQ(found, (std::vector<std::string>{"5", "5", "6"}));
}

TEST_F(InstallsAhead, waitForAPackageThatIsBeingUnpacked) {
  goOn();
  const auto assets = ask({"app.a"});
  ASSERT_EQ(assets.size(), 1u);
  _mayGoOn = std::promise<void>();
  block();
  std::atomic<bool> unpacks{false}, meet{false};
  std::atomic<int> times{0};
  _rig.parts().watch = [&](std::string_view, std::string_view path) {
    if (!path.starts_with(device::containersDirectory)) return;
    if (std::string_view(device::currentThreadName()) != "unpacking") {
      if (unpacks) meet = true;
    } else if (times++ == 0) {
      unpacks = true;
      _mayGoOn.set_value();
      for (int i = 0; i < 2000; ++i) std::this_thread::yield();
      unpacks = false;
    }
  };
  send(assets[0], "3.0");
  while (times == 0) std::this_thread::yield();
  _rig.deliver();
  _rig.parts().watch = nullptr;
  EXPECT_FALSE(meet) << "the install went on beside it";
  EXPECT_EQ(_rig.device().app("app.a")->version, "3.0");
}

}  // namespace
}  // namespace tests
