#include <gtest/gtest.h>

#include "platform/Describe.h"
#include "plist/PropertyList.h"
#include "tests/DeviceRig.h"

namespace tests {
namespace {

class DeviceInstalls : public testing::TestWithParam<Medium>, protected DeviceRig {
 protected:
  DeviceInstalls() : DeviceRig(GetParam()) {}

  platform::OBApplicationWorkspace& registry() { return platform().workspace; }
};

INSTANTIATE_TEST_SUITE_P(Media, DeviceInstalls, testing::Values(Medium::disk, Medium::memory), nameOfMedium);

/// One way of an app through a coordinator, and how the device shows it then.
struct Way {
  enum class Before { absent, installed, demotedPlaceholder };
  enum class Event {
    none,
    progress,
    good,
    damaged,
    ofAnotherApp,
    missing,
    noPath,
    cancel,
    personCancels,
    uninstall,
    personUninstalls,
    storeFinishes,
    storeFinishesWithoutPackage,
    storeRefuses
  };

  const char* name;
  Before before = Before::absent;
  Kind kind = Kind::RVInitiatingAppInstallCoordinator;
  bool configured = true;
  std::uint64_t type = 4;
  Event event = Event::none;
  // Expected.
  std::string state;
  Lines callbacks{"placeholder"};
  Lines reports{};  // of the registry, after the placeholder's own
  bool open = false;
  std::string outcome{};
  bool uninstalled = false;
  bool packageLeft = false;
};

const Way ways[] = {
    {.name = "a new app's placeholder", .state = "placeholder 4 2", .open = true},
    {.name = "an installed app's placeholder",
     .before = Way::Before::installed,
     .kind = Kind::RVUpdatingAppInstallCoordinator,
     .state = "updating 0 1",
     .open = true},
    {.name = "a placeholder that is not configured", .configured = false, .state = "placeholder 4", .open = true},
    {.name = "another placeholder was there",
     .before = Way::Before::demotedPlaceholder,
     .state = "placeholder 4 2",
     .open = true},
    {.name = "progress",
     .event = Way::Event::progress,
     .state = "placeholder 4 2",
     .callbacks = {"placeholder", "begins"},
     .open = true},
    {.name = "a new app's package",
     .event = Way::Event::good,
     .state = "installed 4 3",
     .callbacks = {"placeholder", "completes"},
     .reports = {"runs com.example.maps/11", "runs"},
     .outcome = "INSTALLED"},
    {.name = "the package of an app whose placeholder was not configured",
     .configured = false,
     .event = Way::Event::good,
     .state = "installed 4 3",
     .callbacks = {"placeholder", "completes"},
     .reports = {"runs com.example.maps/11", "runs"},
     .outcome = "INSTALLED"},
    {.name = "an update's package",
     .before = Way::Before::installed,
     .kind = Kind::RVUpdatingAppInstallCoordinator,
     .event = Way::Event::good,
     .state = "installed 4 3",
     .callbacks = {"placeholder", "completes"},
     .reports = {"runs com.example.maps/11", "runs"},
     .outcome = "INSTALLED"},
    {.name = "a new app's damaged package",
     .event = Way::Event::damaged,
     .state = "",
     .callbacks = {"placeholder", "fails"},
     .reports = {"runs com.example.maps/11", "runs"},
     .outcome = "FAILED",
     .packageLeft = true},
    {.name = "an update's damaged package",
     .before = Way::Before::installed,
     .kind = Kind::RVUpdatingAppInstallCoordinator,
     .event = Way::Event::damaged,
     .state = "installed 0 1",
     .callbacks = {"placeholder", "fails"},
     .reports = {"runs com.example.maps/11", "runs"},
     .outcome = "FAILED",
     .packageLeft = true},
    {.name = "a package of another app",
     .event = Way::Event::ofAnotherApp,
     .state = "",
     .callbacks = {"placeholder", "fails"},
     .reports = {"runs com.example.maps/11", "runs"},
     .outcome = "FAILED",
     .packageLeft = true},
    {.name = "a package that is not there",
     .event = Way::Event::missing,
     .state = "",
     .callbacks = {"placeholder", "fails"},
     .reports = {"runs com.example.maps/11", "runs"},
     .outcome = "FAILED"},
    {.name = "a package without a path",
     .event = Way::Event::noPath,
     .state = "",
     .callbacks = {"placeholder", "fails"},
     .reports = {"runs com.example.maps/11", "runs"},
     .outcome = "FAILED"},
    {.name = "a new app cancelled",
     .event = Way::Event::cancel,
     .state = "",
     .callbacks = {"placeholder", "cancelled by 3"},
     .reports = {"cancelled com.example.maps/10", "runs"},
     .outcome = "CANCELED"},
    {.name = "an update cancelled",
     .before = Way::Before::installed,
     .kind = Kind::RVUpdatingAppInstallCoordinator,
     .event = Way::Event::cancel,
     .state = "installed 0 1",
     .callbacks = {"placeholder", "cancelled by 3"},
     .reports = {"cancelled com.example.maps/10", "runs"},
     .outcome = "CANCELED"},
    {.name = "cancelled by the person",
     .event = Way::Event::personCancels,
     .state = "",
     .callbacks = {"placeholder", "cancelled by 0"},
     .reports = {"cancelled com.example.maps/10", "runs"},
     .outcome = "CANCELED"},
    {.name = "uninstalled through the registry",
     .event = Way::Event::uninstall,
     .state = "",
     .callbacks = {"placeholder", "cancelled by 0"},
     .reports = {"cancelled com.example.maps/10", "runs"},
     .outcome = "CANCELED",
     .uninstalled = true},
    {.name = "an update's app uninstalled by the person",
     .before = Way::Before::installed,
     .kind = Kind::RVUpdatingAppInstallCoordinator,
     .event = Way::Event::personUninstalls,
     .state = "",
     .callbacks = {"placeholder", "cancelled by 0"},
     .reports = {"cancelled com.example.maps/10", "runs"},
     .outcome = "CANCELED",
     .uninstalled = true},
    {.name = "restoring",
     .kind = Kind::RVRestoringAppInstallCoordinator,
     .type = 2,
     .state = "placeholder 2 2",
     .open = true},
    {.name = "restoring, then the store's package",
     .kind = Kind::RVRestoringAppInstallCoordinator,
     .type = 2,
     .event = Way::Event::storeFinishes,
     .state = "installed 2 3",
     .callbacks = {"placeholder", "completes"},
     .reports = {"runs"},
     .outcome = "INSTALLED"},
    {.name = "restoring, then the store without a package",
     .kind = Kind::RVRestoringAppInstallCoordinator,
     .type = 2,
     .event = Way::Event::storeFinishesWithoutPackage,
     .state = "installed 2 2",
     .callbacks = {"placeholder", "completes"},
     .reports = {"runs"},
     .outcome = "INSTALLED"},
    {.name = "restoring, then a bad package of the store's",
     .kind = Kind::RVRestoringAppInstallCoordinator,
     .type = 2,
     .event = Way::Event::storeRefuses,
     .state = "",
     .callbacks = {"placeholder", "fails"},
     .reports = {"runs"},
     .outcome = "FAILED",
     .packageLeft = true},
    {.name = "restoring, demoted",
     .kind = Kind::RVRestoringDemotedAppInstallCoordinator,
     .type = 8,
     .state = "placeholder 8 2"},
};

TEST_P(DeviceInstalls, AnAppsWayThroughItsCoordinator) {
  for (const auto& way : ways) {
    SCOPED_TRACE(way.name);
    DeviceRig rig(GetParam());
    auto& device = rig.device();
    if (way.before == Way::Before::installed) rig.install(maps, "1");
    if (way.before == Way::Before::demotedPlaceholder) {
      auto demoted = rig.coordinator(Kind::RVRestoringDemotedAppInstallCoordinator);
      ASSERT_TRUE(demoted->setPlaceholderPromise(rig.placeholder(maps, 7)));
    }
    rig.deliver();

    auto coordinator = rig.coordinator(way.kind);
    auto delegate = std::make_shared<RecordingDelegate>();
    coordinator->setObserver(delegate);
    bool bySync = way.type == 4;
    auto promise = bySync ? rig.promise(coordinator) : nullptr;
    if (!bySync) {
      ASSERT_TRUE(coordinator->setAppAssetPromiseResponsibleClient(1));
    }
    ErrorRef error;
    ASSERT_TRUE(coordinator->setPlaceholderPromise(rig.placeholder(maps, way.type, way.configured), &error));
    // All but the report is done when the call returns.
    EXPECT_TRUE(rig.isShown());
    EXPECT_EQ(rig.containerCount(), 1u);
    EXPECT_TRUE(delegate->lines.empty());
    auto registry = std::make_shared<RecordingObserver>();
    rig.platform().workspace.addObserver(registry);
    rig.deliver();
    registry->lines.clear();

    auto path = rig.packagePath(maps);
    auto deliverPackage = [&](const Bytes& content) {
      rig.write(path, content);
      promise->setTransferPath(path);
      promise->setComplete(true);
    };
    auto good = packageOf(maps, "3");
    switch (way.event) {
      case Way::Event::none:
        break;
      case Way::Event::progress:
        promise->setPercentComplete(0.25);
        promise->setPercentComplete(0.5);
        EXPECT_EQ(device.app(maps)->progress, 0.5);
        break;
      case Way::Event::good:
        deliverPackage(good);
        break;
      case Way::Event::damaged:
        deliverPackage(good.substr(0, good.size() / 2));
        break;
      case Way::Event::ofAnotherApp:
        deliverPackage(packageOf(notes, "3"));
        break;
      case Way::Event::missing:
        promise->setTransferPath(path);
        promise->setComplete(true);
        break;
      case Way::Event::noPath:
        promise->setComplete(true);
        break;
      case Way::Event::cancel:
        EXPECT_TRUE(coordinator->cancelForReason(platform::makeError("TSError", 1), 3));
        EXPECT_FALSE(coordinator->cancelForReason(platform::makeError("TSError", 1), 3));
        break;
      case Way::Event::personCancels:
        EXPECT_TRUE(device.cancelByPerson(maps));
        break;
      case Way::Event::uninstall:
        EXPECT_TRUE(rig.platform().workspace.uninstallApplication(maps));
        break;
      case Way::Event::personUninstalls:
        EXPECT_TRUE(device.uninstallByPerson(maps));
        break;
      case Way::Event::storeFinishes:
        rig.write(path, good);
        EXPECT_TRUE(device.finishStoreInstall(maps, path));
        break;
      case Way::Event::storeFinishesWithoutPackage:
        EXPECT_TRUE(device.finishStoreInstall(maps, ""));
        break;
      case Way::Event::storeRefuses:
        rig.write(path, "none");
        EXPECT_FALSE(device.finishStoreInstall(maps, path, &error));
        break;
    }
    // A phase is seen before it ends: the install itself is an event of the coordination lane.
    while (rig.events().deliverNext(device::Lane::registry)) {
    }
    rig.deliver();

    EXPECT_EQ(rig.stateOf(), way.state);
    EXPECT_EQ(delegate->lines, way.callbacks);
    EXPECT_EQ(registry->lines, way.reports);
    EXPECT_EQ(device.status().coordinators.size(), way.open ? 1u : 0u);
    EXPECT_EQ(rig.isShown(), !way.state.empty());
    EXPECT_EQ(rig.containerCount(), way.state.empty() ? 0u : 1u);
    auto known = device.app(maps);
    EXPECT_EQ(known ? std::string(device::nameOfOutcome(known->lastOutcome)) : "", way.outcome);
    EXPECT_EQ(known && known->lastReason.empty(), way.outcome.empty() || way.outcome == "INSTALLED");
    bool isPlaceholder = way.state.compare(0, 11, "placeholder") == 0;
    EXPECT_EQ(rig.platform().workspace.applicationIsInstalled(maps), !way.state.empty() && !isPlaceholder);
    EXPECT_EQ(rig.platform().installer.CorvaneLookupUninstalled().dictionary()->contains(maps), way.uninstalled);
    EXPECT_EQ(rig.files().fileExists(path), way.packageLeft);
    // An ended coordinator keeps what it held and takes nothing more.
    EXPECT_TRUE(coordinator->hasPlaceholderPromise());
    EXPECT_EQ(coordinator->setAppAssetPromiseResponsibleClient(7), way.open);
  }
}

TEST_P(DeviceInstalls, ARefusalSaysWhatAndWhy) {
  auto coordinator = this->coordinator(Kind::RVInitiatingAppInstallCoordinator);
  auto& service = platform().installCoordination;
  Lines said;
  ErrorRef error;
  auto note = [&](bool done) {
    EXPECT_FALSE(done);
    said.push_back(error ? error->describe().substr(std::string("InstallCoordination ").size()) : "nothing");
  };
  note(coordinator->appAssetPromiseWithError(&error) != nullptr);
  note(coordinator->setAppAssetPromise(nullptr, &error));
  note(coordinator->setPlaceholderPromise(nullptr, &error));
  note(coordinator->setUserDataPromise(nullptr, &error));
  note(coordinator->setInitialZDRAssetPromises({nullptr}, &error));
  note(coordinator->setInstallOptions(nullptr, &error));
  auto userData = service.makePromisedOutOfBandTransfer("user data", 3, 0);
  EXPECT_TRUE(coordinator->setUserDataPromise(userData, &error));
  note(coordinator->setUserDataPromise(userData, &error));
  auto bare = service.makeAppPlaceholder("Maps", maps, 4, 3);
  note(bare->setIconPromise(nullptr, &error));
  note(bare->setPlaceholderAttributes(nullptr, &error));
  auto complete = placeholder();
  note(complete->setSinfData("rights", &error));
  EXPECT_TRUE(coordinator->setPlaceholderPromise(complete, &error));
  note(coordinator->setPlaceholderPromise(complete, &error));
  note(coordinator->setPlaceholderPromise(placeholder(), &error));
  note(coordinator->setPlaceholderPromise(placeholder(notes), &error));
  EXPECT_TRUE(bare->cancelForReason(nullptr, 3, &error));
  note(bare->cancelForReason(nullptr, 3, &error));
  note(bare->setMetadata(nullptr, &error));
  note(coordinator->setPlaceholderPromise(bare, &error));
  auto promise = this->promise(coordinator);
  note(coordinator->setAppAssetPromise(promise, &error));
  EXPECT_TRUE(coordinator->cancelForReason(nullptr, 3, &error));
  note(coordinator->cancelForReason(nullptr, 3, &error));
  note(coordinator->setInstallOptions(platform().installer.makeInstallOptions(), &error));
  EXPECT_FALSE(device().beginStoreInstall("a/b", {}, &error));
  EXPECT_EQ(error->description(), "\"a/b\" cannot be an app's identifier");
  EXPECT_EQ(
      said,
      (Lines{
          "5: com.example.maps has no app asset promise",
          "1: no app asset promise of this service for com.example.maps",
          "1: no placeholder of this service for com.example.maps",
          "1: no user-data promise of this service for com.example.maps",
          "1: no initial asset promise of this service for com.example.maps",
          "1: no install options of this service for com.example.maps",
          "4: com.example.maps already has a user-data promise", "1: no icon promise for com.example.maps",
          "1: no attributes for com.example.maps", "3: the placeholder of com.example.maps is already configured",
          "4: the placeholder of com.example.maps is already attached to a coordinator",
          "4: com.example.maps already has a placeholder promise",
          "1: a placeholder of com.example.notes is not one of com.example.maps",
          "3: the placeholder of com.example.maps is cancelled", "3: the placeholder of com.example.maps is cancelled",
          "3: the placeholder of com.example.maps is cancelled", "4: com.example.maps already has an app asset promise",
          "3: the coordinator of com.example.maps has ended", "3: the coordinator of com.example.maps has ended"}));
}

TEST_P(DeviceInstalls, AContainerThatGoesWhileAPackageIsUnpacked) {
  ErrorRef error;
  write(packagePath(maps), packageOf(maps, "1"));
  meanwhile("createNew", [this] { EXPECT_TRUE(files().removeItem(containers)); });
  EXPECT_FALSE(device().installFromPackage(packagePath(maps), &error));
  EXPECT_TRUE(error);
  EXPECT_EQ(stateOf(), "");
}

TEST_P(DeviceInstalls, WhatWasUninstalledIsTold) {
  install(notes, "1");
  EXPECT_TRUE(device().uninstallByPerson(notes));
  EXPECT_EQ(platform::describe(platform().installer.CorvaneLookupUninstalled()),
            "{com.example.notes = {KBBundleIdentifier = com.example.notes; KBBundleVersion = 1}}");
}

TEST_P(DeviceInstalls, APlaceholdersFiles) {
  auto coordinator = this->coordinator(Kind::RVInitiatingAppInstallCoordinator);
  ASSERT_TRUE(coordinator->setPlaceholderPromise(placeholder()));
  auto proxy = registry().applicationProxyForIdentifier(maps, true);
  ASSERT_TRUE(proxy);
  auto info = list(*proxy->bundleURL + "/Info.plist");
  ASSERT_TRUE(info.dictionary());
  const auto& entries = *info.dictionary();
  EXPECT_EQ(entries.size(), 40u + 4);
  const Value expected = dictionaryOf({{"Genre", "Travel"},
                                       {"KBBundleIdentifier", maps},
                                       {"KBBundleVersion", "2"},
                                       {"KBBundleDisplayName", "Maps"},
                                       {"OBApplicationLaunchProhibited", true},
                                       {"KBBundleIconFile", "Icon.png"}});
  for (const auto& [key, value] : *expected.dictionary()) EXPECT_EQ(entries[key], value) << key;
  EXPECT_EQ(files().readFile(*proxy->bundleURL + "/Icon.png"), pngOf(4, 4));
  EXPECT_EQ(list(*proxy->bundleContainerURL + "/HarluneMetadata.plist"), DeviceRig::placeholderMetadata());
  EXPECT_EQ(platform().process.infoDictionaryOfBundleAtPath(*proxy->bundleURL), info);
  EXPECT_EQ(*proxy->bundleURL, *proxy->bundleContainerURL + "/com.example.maps.app");
  const std::string name = proxy->bundleContainerURL->substr(std::string(containers).size() + 1);
  EXPECT_EQ(name.size(), 36u);
  for (std::size_t at = 0; at < name.size(); ++at)
    EXPECT_EQ(name[at] == '-', at == 8 || at == 13 || at == 18 || at == 23) << name;
}

TEST_P(DeviceInstalls, StoreMetadataOfWhatIsInstalled) {
  struct Case {
    bool inOptions, inPlaceholder, before;
    const char* expected;  // null: no file
    bool byStore = false;
  };
  for (auto [inOptions, inPlaceholder, before, expected, byStore] :
       {Case{true, true, true, "options"}, Case{false, true, true, "placeholder"}, Case{false, false, true, "before"},
        Case{false, false, false, nullptr}, Case{true, true, true, "options", true},
        Case{false, true, true, "placeholder", true}}) {
    SCOPED_TRACE(expected ? expected : "none");
    DeviceRig rig(GetParam());
    rig.install(maps, "1");
    auto metadataPath = [&] {
      return *rig.platform().workspace.applicationProxyForIdentifier(maps, false)->bundleContainerURL +
             "/HarluneMetadata.plist";
    };
    if (before) rig.write(metadataPath(), *plist::writeXML(dictionaryOf({{"vantorId", "before"}})));
    auto coordinator = rig.coordinator(Kind::RVUpdatingAppInstallCoordinator);
    auto promise = rig.promise(coordinator);
    auto options = rig.platform().installer.makeInstallOptions();
    if (inOptions)
      options->setHarluneMetadata(rig.platform().installer.makeStoreMetadata(dictionaryOf({{"vantorId", "options"}})));
    ASSERT_TRUE(coordinator->setInstallOptions(options));
    auto placeholder =
        inPlaceholder ? rig.placeholder() : rig.platform().installCoordination.makeAppPlaceholder("Maps", maps, 4, 3);
    ASSERT_TRUE(coordinator->setPlaceholderPromise(placeholder));
    rig.write(rig.packagePath(maps), packageOf(maps, "3"));
    if (byStore) {
      ASSERT_TRUE(coordinator->setAppAssetPromiseResponsibleClient(1));
      EXPECT_TRUE(rig.device().finishStoreInstall(maps, rig.packagePath(maps)));
    } else {
      promise->setTransferPath(rig.packagePath(maps));
      promise->setComplete(true);
    }
    rig.deliver();
    EXPECT_EQ(rig.list(metadataPath()), !expected ? Value()
                                        : expected == std::string_view("placeholder")
                                            ? DeviceRig::placeholderMetadata()
                                            : dictionaryOf({{"vantorId", expected}}));
  }
}

}  // namespace
}  // namespace tests
