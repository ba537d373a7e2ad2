#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <iostream>
#include <random>
#include <set>
#include <string>

#include "tests/ReferenceModel.h"

namespace tests {
namespace {

/// Calls about one app that a seed may let fail, in a sync and in a restore.
constexpr const char* syncPoints[] = {"InstallCoordination.coordinatorForAppWithBundleID",
                                      "InstallCoordination.makeAppPlaceholder",
                                      "InstallCoordination.makePromisedTransferToPathWithoutPath",
                                      "InstallCoordination.uninstallAppWithBundleID",
                                      "OBApplicationWorkspace.applicationIsInstalled",
                                      "OBApplicationWorkspace.applicationProxyForIdentifier",
                                      "RVAppInstallCoordinator.appAssetPromiseWithError",
                                      "RVAppInstallCoordinator.cancelForReason",
                                      "RVAppInstallCoordinator.creatorIdentifier",
                                      "RVAppInstallCoordinator.setAppAssetPromise",
                                      "RVAppInstallCoordinator.setInitialZDRAssetPromises",
                                      "RVAppInstallCoordinator.setInstallOptions",
                                      "RVAppInstallCoordinator.setObserver",
                                      "RVAppInstallCoordinator.setPlaceholderPromise",
                                      "RVPlaceholder.setConfigurationCompleteWithError",
                                      "RVPlaceholder.setIconPromise",
                                      "RVPlaceholder.setMetadata",
                                      "RVPlaceholder.setPlaceholderAttributes",
                                      "RVPromisedTransferToPath.setTransferPath"};
constexpr const char* restorePoints[] = {"InstallCoordination.coordinatorForAppWithBundleID",
                                         "InstallCoordination.makeAppPlaceholder",
                                         "InstallCoordination.makePromisedOutOfBandTransfer",
                                         "InstallCoordination.makePromisedTransferToPath",
                                         "RVAppInstallCoordinator.setAppAssetPromiseResponsibleClient",
                                         "RVAppInstallCoordinator.setPlaceholderPromise",
                                         "RVAppInstallCoordinator.setUserDataPromise",
                                         "RVPlaceholder.setConfigurationCompleteWithError",
                                         "RVPlaceholder.setIconPromise",
                                         "RVPlaceholder.setMetadata",
                                         "RVPlaceholder.setPlaceholderAttributes",
                                         "RVPlaceholder.setSinfData"};

class Dice {
 public:
  explicit Dice(std::uint64_t seed) : _numbers(seed) {}

  std::size_t below(std::size_t count) { return static_cast<std::size_t>(_numbers() % count); }
  bool oneIn(std::size_t count) { return below(count) == 0; }
  template <class T, std::size_t N>
  T of(const T (&choices)[N]) {
    return choices[below(N)];
  }
  /// Mostly the first.
  template <class T, std::size_t N>
  T mostly(const T (&choices)[N]) {
    return oneIn(3) ? of(choices) : choices[0];
  }

 private:
  std::mt19937_64 _numbers;
};

template <std::size_t N>
std::vector<Failure> randomFailures(Dice& dice, const char* const (&points)[N], const std::vector<std::string>& apps) {
  std::vector<Failure> failures;
  std::set<std::string> chosen;
  for (std::size_t count = dice.below(3); count > 0; --count) {
    const auto& app = apps[dice.below(apps.size())];
    if (chosen.insert(app).second) failures.push_back({.point = dice.of(points), .app = app});
  }
  return failures;
}

device::StoreInstall randomPlaceholder(Dice& dice) {
  device::StoreInstall install = ScenarioApp::plainPlaceholder();
  install.installType = dice.mostly<std::uint64_t>({4, 0, 1, 2, 3, 7, 8, 99});
  install.installState = dice.mostly<std::uint64_t>({1, 0, 2, 3, 77});
  install.installPhase = dice.below(5);
  install.hasProgress = dice.oneIn(2);
  install.paused = dice.oneIn(5);
  install.createsCoordinator = dice.oneIn(4);
  install.systemBundle = dice.oneIn(8);
  install.applicationType = dice.oneIn(8) ? "System" : "User";
  return install;
}

ScenarioApp randomApp(Dice& dice, std::size_t number) {
  using App = ScenarioApp;
  App app;
  app.id = "app." + std::string(1, static_cast<char>('a' + (number * 5) % 8));
  app.before = dice.mostly({App::Before::absent, App::Before::installed, App::Before::placeholder});
  app.lost = app.before == App::Before::absent && dice.oneIn(6);
  app.store = randomPlaceholder(dice);
  app.previousMark = dice.mostly({"", "install", "DOWNLOADED", "INSTALLED", "FAILED"});
  app.operation = dice.mostly({"install", "remove", "", "SENT", "INSTALLED"});
  app.inLastSync = dice.oneIn(4);
  app.hasFolder = !dice.oneIn(6);
  app.hasIcon = app.hasFolder && dice.oneIn(6);
  app.transfer =
      dice.mostly({App::Transfer::arrives, App::Transfer::fails, App::Transfer::stalls, App::Transfer::neverStarts});
  app.package =
      dice.mostly({App::Package::good, App::Package::damaged, App::Package::ofAnotherApp, App::Package::missing});
  app.path = dice.mostly(
      {App::Path::absolute, App::Path::relative, App::Path::absent, App::Path::recorded, App::Path::climbing});
  app.isDownload = !dice.oneIn(8);
  app.isRestore = dice.oneIn(8);
  app.parts = dice.oneIn(2) ? 1 : 2;
  app.person =
      dice.mostly({App::Person::nothing, App::Person::cancels, App::Person::prioritizes, App::Person::uninstalls});
  app.report = dice.mostly({App::Report::none, App::Report::succeeded, App::Report::failed});
  return app;
}

Scenario randomSync(Dice& dice) {
  Scenario scenario;
  std::vector<std::string> ids;
  for (std::size_t number = 0, count = 1 + dice.below(8); number < count; ++number) {
    scenario.apps.push_back(randomApp(dice, number));
    ids.push_back(scenario.apps.back().id);
  }
  scenario.stages = !dice.oneIn(12);
  if (dice.oneIn(2)) {
    for (std::size_t count = dice.below(6); count > 0; --count) {
      std::string id = dice.oneIn(5) ? "app.nowhere" : ids[dice.below(ids.size())];
      if (std::find(scenario.layout.begin(), scenario.layout.end(), id) == scenario.layout.end()) {
        scenario.layout.push_back(id);
      }
    }
  }
  if (dice.oneIn(10)) scenario.settings.emplace_back("app-installation", "forbidden");
  if (dice.oneIn(10)) scenario.settings.emplace_back("app-removal", "forbidden");
  if (dice.oneIn(6)) scenario.settings.emplace_back("device-service-cancel", "no");
  if (dice.oneIn(10)) scenario.rules.emplace_back("applicationInstallsArePrioritized=none");
  if (dice.oneIn(10)) scenario.process = "com.vantor.shiftwell";
  scenario.phaseSucceeded = !dice.oneIn(3);
  scenario.failures = randomFailures(dice, syncPoints, ids);
  return scenario;
}

RestoreScenario randomRestore(Dice& dice) {
  using Entry = RestoreApp::Entry;
  RestoreScenario scenario;
  std::vector<std::string> ids;
  for (std::size_t number = 0, count = 1 + dice.below(8); number < count; ++number) {
    RestoreApp app;
    app.id = "app." + std::to_string(number);
    app.demotedAutomatically = dice.oneIn(4);
    app.demotedByHand = dice.oneIn(4);
    app.entry = dice.mostly({Entry::good, Entry::good, Entry::notADictionary, Entry::noMetadata,
                             Entry::metadataIsNoList, Entry::metadataIsNoDictionary});
    app.hasIcon = !dice.oneIn(3);
    app.hasRights = !dice.oneIn(3);
    app.neverReported = dice.oneIn(10);
    if (dice.oneIn(2)) app.metadata.emplace_back("title", "Title of " + app.id);
    ids.push_back(app.id);
    scenario.apps.push_back(std::move(app));
  }
  scenario.hasList = !dice.oneIn(12);
  scenario.type = dice.mostly<std::int32_t>({2, 3, 1, 0, -4});
  if (dice.oneIn(12)) scenario.settings.emplace_back("backup-placeholders", "no");
  if (dice.oneIn(12)) scenario.rawDemotedList = "no list";
  if (dice.oneIn(8)) scenario.process = "com.vantor.tsd";
  scenario.failures = randomFailures(dice, restorePoints, ids);
  return scenario;
}

template <class AnyScenario>
bool holds(AnyScenario scenario, std::uint64_t seed) {
  std::mt19937_64 order(seed);
  scenario.chooser = [order](std::size_t count) mutable { return static_cast<std::size_t>(order() % count); };
  PluginRig rig(optionsOf(scenario));
  auto outcome = run(rig, scenario);
  EXPECT_EQ(outcome.text(), predict(scenario).text()) << "APPSYNC_SEED=" << seed << " shows it again, call by call";
  if (std::getenv("APPSYNC_SEED")) {
    for (const auto& record : rig.records()) std::cout << record.thread << "  " << lineOf(record) << '\n';
  }
  return !::testing::Test::HasFailure();
}

/// One seed alone when the environment names it, else as many as it says.
template <class Play>
void forEachSeed(Play play) {
  if (const char* seed = std::getenv("APPSYNC_SEED")) {
    play(std::strtoull(seed, nullptr, 10));
    return;
  }
  const char* seeds = std::getenv("APPSYNC_SEEDS");
  const std::uint64_t count = seeds ? std::strtoull(seeds, nullptr, 10) : 200;
  for (std::uint64_t seed = 1; seed <= count; ++seed) {
    if (!play(seed)) return;
  }
}

TEST(Simulation, SyncsEndAsTheModelSays) {
  forEachSeed([](std::uint64_t seed) {
    Dice dice(seed);
    return holds(randomSync(dice), seed);
  });
}

TEST(Simulation, RestoresEndAsTheModelSays) {
  forEachSeed([](std::uint64_t seed) {
    Dice dice(seed);
    return holds(randomRestore(dice), seed);
  });
}

}  // namespace
}  // namespace tests
