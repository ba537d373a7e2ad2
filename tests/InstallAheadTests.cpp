#include <gtest/gtest.h>

#include <algorithm>
#include <future>
#include <thread>

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
    Value list = Value::makeArray();
    for (const char* id : {"app.a", "app.b", "app.c"}) {
      const ScenarioApp app{.id = id};
      list.array()->append(entryOf(app, "install"));
      const std::string folder = std::string(stagingDirectory) + '/' + id;
      _rig.write(folder + "/Info.plist", binaryList(dictionaryOf({{"KBBundleIdentifier", id}})));
      _rig.write(folder + "/HarluneMetadata.plist", binaryList(dictionaryOf({{"itemId", 5}})));
    }
    _rig.write(std::string(stagingDirectory) + "/ApplicationsSync.plist", binaryList(list));
    ASSERT_TRUE(_rig.reconcileSync());
    const auto assets = _rig.daemon().outstandingAssetTransfers();
    ASSERT_EQ(assets.size(), 3u);
    ASSERT_EQ(containers(), 3u) << "of the placeholders";
    block();
    for (const auto& asset : assets) {
      asset->setPath(_rig.receivePackage(asset->identifier(), packageOf(asset->identifier(), "2.0")));
      _rig.transferEnded(asset, true);
    }
    while (containers() != 6) std::this_thread::yield();
  }
  void TearDown() override {
    const auto status = _rig.device().status();
    const auto there =
        std::count_if(status.apps.begin(), status.apps.end(), [](const auto& app) { return app.isOnDevice(); });
    EXPECT_EQ(containers(), static_cast<std::size_t>(there)) << "one for each app, and none that is nobody's";
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

}  // namespace
}  // namespace tests
