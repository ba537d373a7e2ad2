#include "contract/Fixture.h"
#include "platform/Installer.h"

namespace contract {
namespace {

class CoordinationContract : public Fixture {
 protected:
  std::shared_ptr<RecordingDelegate> observe(const CoordinatorRef& coordinator) {
    auto delegate = std::make_shared<RecordingDelegate>();
    coordinator->setObserver(delegate);
    return delegate;
  }
};
INSTANTIATE_TEST_SUITE_P(Contract, CoordinationContract, testing::ValuesIn(hosts()), nameOfHost);

TEST_P(CoordinationContract, ThereIsOneCoordinatorPerAppFoundByItsKind) {
  auto lookUp = [&](Kind kind, bool create) {
    bool created = true;
    ErrorRef error = platform::makeError("Stale", 1);
    auto found = coordination().coordinatorForAppWithBundleID(kind, maps, 3, create, &created, &error);
    return std::string(found ? "found" : "none") + (created ? " new" : "") + (error ? " error" : "");
  };
  EXPECT_EQ(lookUp(anyKind, false), "none");
  EXPECT_EQ(lookUp(initiating, false), "none");
  EXPECT_EQ(lookUp(anyKind, true), "none error");
  EXPECT_EQ(lookUp(initiating, true), "found new");
  EXPECT_EQ(lookUp(initiating, true), "found");
  EXPECT_EQ(lookUp(anyKind, false), "found");
  EXPECT_EQ(lookUp(updating, true), "none error");
  EXPECT_EQ(lookUp(updating, false), "none error");
  // What another client finds says whose it is, and is the same.
  auto found = coordination().coordinatorForAppWithBundleID(anyKind, maps, 7, true);
  ASSERT_TRUE(found);
  EXPECT_EQ(found->creatorIdentifier(), 3u);
  EXPECT_EQ(found->bundleID(), maps);
  EXPECT_TRUE(found->setInitialZDRAssetPromises({}));
  EXPECT_TRUE(coordinator(initiating)->hasInitialZDRAssetPromises()) << "two handles of one record answer alike";
  EXPECT_TRUE(coordinator(initiating)->cancelForReason(nullptr, 3));
  host().deliver();
  EXPECT_EQ(lookUp(anyKind, false), "none");
}

TEST_P(CoordinationContract, ACoordinatorTakesEachPieceOnceAndNothingAfterItsEnd) {
  auto coordinator = this->coordinator(initiating);
  auto refused = [](bool result, const ErrorRef& error) { return !result && error; };
  ErrorRef error;
  EXPECT_FALSE(coordinator->error());
  EXPECT_FALSE(coordinator->appAssetPromiseWithError(&error));
  EXPECT_TRUE(error);
  EXPECT_TRUE(refused(coordinator->setPlaceholderPromise(nullptr, &error), error));
  EXPECT_TRUE(refused(coordinator->setPlaceholderPromise(placeholder(notes), &error), error));
  auto cancelled = placeholder();
  EXPECT_TRUE(cancelled->cancelForReason(platform::makeError("Contract", 1), 3));
  EXPECT_TRUE(refused(coordinator->setPlaceholderPromise(cancelled, &error), error));
  EXPECT_FALSE(coordinator->hasPlaceholderPromise());
  auto complete = placeholder();
  EXPECT_TRUE(refused(complete->setMetadata(nullptr, &error), error)) << "its configuration is complete";
  EXPECT_TRUE(coordinator->setPlaceholderPromise(complete, &error));
  EXPECT_FALSE(error);
  EXPECT_TRUE(coordinator->hasPlaceholderPromise());
  EXPECT_TRUE(refused(coordinator->setPlaceholderPromise(placeholder(), &error), error));
  // An empty list of initial promises is one, too.
  EXPECT_FALSE(coordinator->hasInitialZDRAssetPromises());
  EXPECT_TRUE(coordinator->setInitialZDRAssetPromises({}));
  EXPECT_TRUE(coordinator->hasInitialZDRAssetPromises());
  EXPECT_FALSE(coordinator->hasInstallOptions());
  auto package = promise(coordinator);
  EXPECT_TRUE(coordinator->hasInstallOptions());
  EXPECT_EQ(coordinator->appAssetPromiseWithError(), package);
  EXPECT_EQ(coordinator->appAssetPromiseResponsibleClientWithError(), 0u);
  EXPECT_TRUE(coordinator->setAppAssetPromiseResponsibleClient(1));
  EXPECT_EQ(coordinator->appAssetPromiseResponsibleClientWithError(), 1u);
  // An install does not outlive its package's promise, and fulfilling a promise afterwards does nothing.
  EXPECT_TRUE(package->cancelForReason(platform::makeError("Contract", 30), 3));
  package->setComplete(true);
  host().deliver();
  EXPECT_EQ(stateOf(), "");
  auto userData = coordination().makePromisedOutOfBandTransfer("com.example.maps-UserData", 3, 0);
  EXPECT_TRUE(refused(coordinator->setUserDataPromise(userData, &error), error));
  EXPECT_FALSE(coordinator->hasUserDataPromise());
  EXPECT_TRUE(coordinator->hasPlaceholderPromise()) << "an ended coordinator answers what it last held";
  EXPECT_TRUE(refused(coordinator->cancelForReason(nullptr, 3, &error), error));
}

/// One way of an app through a coordinator.
struct Way {
  const char* name;
  bool wasInstalled;
  enum class Event { placeholder, progress, package, damaged, ofAnotherApp, cancel, uninstall } event;
  const char* state;  // of the app afterwards
  Lines callbacks;
  bool isOpen = false;
};

TEST_P(CoordinationContract, AnAppsWayThroughItsCoordinator) {
  using Event = Way::Event;
  const Way ways[] = {
      {"a new app's placeholder", false, Event::placeholder, "placeholder", {"placeholder"}, true},
      {"an update's placeholder", true, Event::placeholder, "updating 1", {"placeholder"}, true},
      {"progress", false, Event::progress, "placeholder", {"placeholder", "begins"}, true},
      {"a new app's package", false, Event::package, "installed 3", {"placeholder", "completes"}},
      {"an update's package", true, Event::package, "installed 3", {"placeholder", "completes"}},
      {"a new app's damaged package", false, Event::damaged, "", {"placeholder", "fails"}},
      {"an update's damaged package", true, Event::damaged, "installed 1", {"placeholder", "fails"}},
      {"the package of another app", false, Event::ofAnotherApp, "", {"placeholder", "fails"}},
      {"a new app cancelled", false, Event::cancel, "", {"placeholder", "cancelled by 3"}},
      {"an update cancelled", true, Event::cancel, "installed 1", {"placeholder", "cancelled by 3"}},
      {"an update's app uninstalled", true, Event::uninstall, "", {"placeholder", "cancelled by 0"}},
  };
  for (const auto& way : ways) {
    SCOPED_TRACE(way.name);
    if (way.wasInstalled) install(maps, "1");
    auto handle = coordinator(way.wasInstalled ? updating : initiating);
    auto delegate = observe(handle);
    auto package = begin(way.wasInstalled ? updating : initiating);
    EXPECT_EQ(stateOf(), way.wasInstalled ? "updating 1" : "placeholder") << "shown when the call returns";
    host().deliver();
    switch (way.event) {
      case Event::placeholder:
        break;
      case Event::progress:
        package->setPercentComplete(0.25);
        package->setPercentComplete(0.5);
        break;
      case Event::package:
        send(package, packageOf(maps, "3"));
        EXPECT_TRUE(package->isComplete());
        break;
      case Event::damaged:
        send(package, packageOf(maps, "3").substr(0, 30));
        break;
      case Event::ofAnotherApp:
        send(package, packageOf(notes, "3"));
        break;
      case Event::cancel: {
        InsideCall inside;
        EXPECT_TRUE(handle->cancelForReason(platform::makeError("Contract", 1), 3));
        break;
      }
      case Event::uninstall: {
        InsideCall inside;
        EXPECT_TRUE(registry().uninstallApplication(maps));
        break;
      }
    }
    host().deliver();
    EXPECT_EQ(stateOf(), way.state);
    EXPECT_EQ(delegate->notes.take(), way.callbacks);
    EXPECT_EQ(coordination().coordinatorForAppWithBundleID(anyKind, maps, 3, false) != nullptr, way.isOpen);
    EXPECT_EQ(handle->setAppAssetPromiseResponsibleClient(7), way.isOpen);
    registry().uninstallApplication(maps);
    host().deliver();
  }
}

TEST_P(CoordinationContract, CallbacksGoToTheObserverElseToTheClientsObservers) {
  auto own = std::make_shared<RecordingDelegate>();
  auto ofClient = std::make_shared<RecordingDelegate>();
  auto ofOthers = std::make_shared<RecordingDelegate>();
  auto registration = coordination().makeAppInstallObserver("service", {2, 3}, ofClient);
  auto other = coordination().makeAppInstallObserver("service", {1}, ofOthers);
  auto package = begin(initiating);
  host().deliver();
  EXPECT_EQ(ofClient->notes.take(), Lines{"placeholder"});
  coordinator(initiating)->setObserver(own);
  package->setPercentComplete(0.5);
  host().deliver();
  EXPECT_EQ(own->notes.take(), Lines{"begins"});
  own.reset();  // nobody keeps an observer alive
  coordinator(initiating)->cancelForReason(nullptr, 3);
  host().deliver();
  EXPECT_EQ(ofClient->notes.take(), Lines{"cancelled by 3"});
  begin(initiating);
  registration.reset();
  ofClient->notes.take();
  host().deliver();
  EXPECT_EQ(ofClient->notes.take(), Lines{});
  EXPECT_EQ(ofOthers->notes.take(), Lines{});
}

TEST_P(CoordinationContract, AnObserverMayCallTheServicesBack) {
  auto delegate = std::make_shared<RecordingDelegate>();
  delegate->then = [&](const CoordinatorRef& each) {
    registry().enumerateBundlesOfType(0, [&](const auto&, bool&) { registry().uninstallApplication(maps); });
    each->setObserver({});
  };
  coordinator(initiating)->setObserver(delegate);
  begin(initiating);
  host().deliver();
  EXPECT_EQ(delegate->notes.take(), Lines{"placeholder"});
  EXPECT_EQ(stateOf(), "");
}

TEST_P(CoordinationContract, TheReleaseOfAnObserverWaitsForItsCallback) {
  auto delegate = std::make_shared<RecordingDelegate>();
  std::unique_ptr<platform::RVAppInstallObserver> registration;
  expectRemovalToWait(
      [&](const std::function<void()>& callback) {
        delegate->then = [callback](const CoordinatorRef&) { callback(); };
        registration = coordination().makeAppInstallObserver("service", {3}, delegate);
        begin(initiating);
      },
      [&] { registration.reset(); });
}

TEST_P(CoordinationContract, UninstallingAnswersLaterAndIsRemembered) {
  install(maps, "1");
  Notes completions;
  auto uninstall = [&](const std::string& app) {
    InsideCall inside;
    coordination().uninstallAppWithBundleID(
        app, false, [&completions, app](const ErrorRef& error) { completions.add(app + (error ? " error" : "")); });
  };
  uninstall(maps);
  uninstall("com.example.none");
  host().deliver();
  EXPECT_EQ(completions.take(), (Lines{"com.example.maps", "com.example.none error"}));
  EXPECT_EQ(stateOf(), "");
  auto uninstalled = [&] { return platform().installer.CorvaneLookupUninstalled(); };
  EXPECT_TRUE(uninstalled().dictionary()->contains(maps));
  EXPECT_FALSE(uninstalled().dictionary()->contains("com.example.none"));
  install(maps, "2");
  EXPECT_FALSE(uninstalled().dictionary()->contains(maps)) << "it is there again";
  EXPECT_TRUE(registry().uninstallApplication(maps));
  EXPECT_EQ(platform().installer.CorvaneClearUninstalled({maps, "com.example.none"}), 0);
  EXPECT_TRUE(uninstalled().dictionary()->empty());
}

}  // namespace
}  // namespace contract
