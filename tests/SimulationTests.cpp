#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <iostream>
#include <random>
#include <set>
#include <string>

#include "platform/Describe.h"
#include "tests/Invariants.h"
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

template <std::size_t N>
std::vector<Failure> randomFailures(Dice& dice, const char* const (&points)[N], const std::vector<std::string>& apps) {
  std::vector<Failure> failures;
  std::set<std::string> chosen;
  for (std::size_t count = dice.below(3); count > 0; --count) {
    const auto& app = apps[dice.below(apps.size())];
    // Always, or once.
    std::uint64_t match = dice.oneIn(3) ? 1 + dice.below(3) : 0;
    if (chosen.insert(app).second) failures.push_back({.point = dice.of(points), .app = app, .match = match});
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

/// Up to sixteen, not in the order of their names.
std::string idOf(std::size_t number) { return "app." + std::string(1, static_cast<char>('a' + (number * 5) % 16)); }

ScenarioApp randomApp(Dice& dice, std::size_t number) {
  using App = ScenarioApp;
  App app;
  app.id = idOf(number);
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
  app.content = ContentShape::drawn(dice);
  app.isDownload = !dice.oneIn(8);
  app.isRestore = dice.oneIn(8);
  app.parts = dice.oneIn(2) ? 1 : 2;
  app.person =
      dice.mostly({App::Person::nothing, App::Person::cancels, App::Person::prioritizes, App::Person::uninstalls});
  app.report = dice.mostly({App::Report::none, App::Report::succeeded, App::Report::failed});
  return app;
}

Scenario randomSync(Dice& dice, std::size_t count) {
  Scenario scenario;
  std::vector<std::string> ids;
  for (std::size_t number = 0; number < count; ++number) {
    scenario.apps.push_back(randomApp(dice, number));
    ids.push_back(scenario.apps.back().id);
  }
  scenario.stages = !dice.oneIn(12);
  if (dice.oneIn(2)) {
    for (std::size_t left = dice.below(6); left > 0; --left) {
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
  scenario.phaseSucceeded = !dice.oneIn(3);
  scenario.failures = randomFailures(dice, syncPoints, ids);
  return scenario;
}

RestoreScenario randomRestore(Dice& dice, std::size_t count) {
  using Entry = RestoreApp::Entry;
  RestoreScenario scenario;
  std::vector<std::string> ids;
  for (std::size_t number = 0; number < count; ++number) {
    RestoreApp app;
    app.id = idOf(number);
    app.demotedAutomatically = dice.oneIn(4);
    app.demotedByHand = dice.oneIn(4);
    app.entry = dice.mostly({Entry::good, Entry::good, Entry::notADictionary, Entry::noMetadata,
                             Entry::metadataIsNoList, Entry::metadataIsNoDictionary});
    app.hasIcon = !dice.oneIn(3);
    app.hasRights = !dice.oneIn(3);
    app.neverReported = dice.oneIn(10);
    app.content = ContentShape::drawn(dice);
    if (dice.oneIn(2)) app.metadata.emplace_back("title", "Title of " + app.id);
    if (dice.oneIn(3)) app.metadata.emplace_back("is-auto-download", true);
    ids.push_back(app.id);
    scenario.apps.push_back(std::move(app));
  }
  scenario.hasList = !dice.oneIn(12);
  scenario.type = dice.mostly<std::int32_t>({2, 3, 1, 0, -4});
  if (dice.oneIn(12)) scenario.settings.emplace_back("backup-placeholders", "no");
  if (dice.oneIn(12)) scenario.rawDemotedList = "no list";
  scenario.failures = randomFailures(dice, restorePoints, ids);
  return scenario;
}

/// Syncs and restores of one device, one after another: in one process, with one plug-in object or several, or with the
/// device opened again in between. Either the model knows what may fail, and tells every outcome; or anything fails, at
/// any point and in any way, and what holds is what `Invariants` lists, that the todo list keeps its entries, and that
/// afterwards a sync without faults brings what it is to bring.
class Life {
 public:
  Life(std::uint64_t seed, const std::vector<std::string>& points)
      : _seed(seed),
        _dice(seed),
        _points(points),
        _exact(!_dice.oneIn(3) || points.empty()),
        _count(1 + _dice.below(!_exact          ? 5
                               : _dice.oneIn(6) ? 16
                                                : 8)),
        _world(_dice.oneIn(4) ? "com.vantor.shiftwell" : "com.vantor.tsd"),
        _rig({.process = _world.process}) {}

  bool holds() {
    static constexpr std::size_t lengths[] = {1, 2, 2, 3, 4};
    std::size_t left = _dice.of(lengths);
    while (!::testing::Test::HasFailure()) {
      if (_dice.oneIn(3))
        play(randomRestore(_dice, _count));
      else
        play(randomSync(_dice, _count));
      if (--left == 0) break;
      goOn();
    }
    if (!_exact) playWithoutFaults();
    letObjectGo([this] { _rig.unload(); });
    if (::testing::Test::HasFailure() && !shows())
      std::cerr << "APPSYNC_SEED=" << _seed << " shows it again, call by call\n";
    return !::testing::Test::HasFailure();
  }

  std::set<std::string> pointsPassed{};

 private:
  bool shows() const {
    const char* seed = std::getenv("APPSYNC_SEED");
    return seed && std::to_string(_seed) == seed;
  }

  template <class AnyScenario>
  void play(AnyScenario scenario) {
    scenario.process = _world.process;
    if constexpr (std::is_same_v<AnyScenario, Scenario>) {
      scenario.continues = _steps != 0;
      if (scenario.continues) keepToWhatIsKnown(scenario);
    }
    ++_steps;
    if (!_exact) {
      scenario.failures.clear();
      scenario.rules = randomRules();
    }
    scenario.chooser = [order = std::mt19937_64(_dice.below(1u << 31))](std::size_t count) mutable {
      return static_cast<std::size_t>(order() % count);
    };
    auto rules = optionsOf(scenario).rules;
    if (shows()) std::cout << "-- with " << ::testing::PrintToString(rules) << '\n';
    _rig.beginStep(rules);
    auto outcome = run(_rig, scenario);
    if (_exact) {
      EXPECT_EQ(outcome.text(), predict(scenario, _world).text());
    }
    look();
    if constexpr (std::is_same_v<AnyScenario, Scenario>) checkEntries(scenario);
    _rig.beginStep({});
  }

  /// The model does not know of which version a placeholder of an earlier run is, for which a path may be recorded, and
  /// whether it has an icon.
  static void keepToWhatIsKnown(Scenario& scenario) {
    for (auto& app : scenario.apps) {
      if (app.path == ScenarioApp::Path::recorded) app.path = ScenarioApp::Path::absent;
    }
    std::erase_if(scenario.failures,
                  [](const Failure& failure) { return failure.point == "RVPlaceholder.setIconPromise"; });
  }

  void look() {
    _invariants.look(_rig.records());
    for (const auto& record : _rig.records()) {
      if (shows()) std::cout << record.thread << "  " << lineOf(record) << '\n';
      if (_points.empty() && record.service != "log") pointsPassed.insert(record.service + '.' + record.operation);
    }
  }

  /// The todo list has all entries of one that was there or that the host has sent, or is gone.
  void checkEntries(const Scenario& scenario) {
    std::vector<std::string> staged;
    for (const auto& app : scenario.apps) {
      if (!app.operation.empty()) staged.push_back(platform::describe(entryOf(app, "")));
    }
    std::vector<std::string> entries;
    Value list = _rig.readList(todoListPath);
    for (std::size_t at = 0; list.array() && at < list.array()->size(); ++at) {
      auto& entry = *list.array()->dictionary(at);
      EXPECT_FALSE(entry["operation"].isAbsent());
      entry.set("operation", "");
      entries.push_back(platform::describe((*list.array())[at]));
    }
    // What an earlier sync did not come to take may be taken now.
    _lists.insert(staged);
    if (_steps == 1) _lists.insert(entries);
    EXPECT_TRUE(entries.empty() || _lists.count(entries)) << ::testing::PrintToString(entries);
  }

  template <class End>
  void letObjectGo(End end) {
    _rig.beginStep({});
    end();
    look();
    _invariants.objectIsGone();
  }

  /// What lies between two of them.
  void goOn() {
    static constexpr const char* defaults[][2] = {{"app-installation", "allowed"},
                                                  {"app-removal", "allowed"},
                                                  {"device-service-cancel", "yes"},
                                                  {"backup-placeholders", "yes"}};
    for (const auto& [key, value] : defaults) EXPECT_TRUE(_rig.device().set(key, value));
    if (_dice.oneIn(8)) {
      _rig.daemon().clearSyncData();
      _rig.deliver();
      _world.clearSyncData();
    }
    if (_dice.oneIn(4)) _rig.daemon().prepareForBackup();
    look();
    std::size_t how = _dice.below(4);
    if (how < 2) return;  // the same object
    auto before = _rig.device().status();
    letObjectGo([&] { how == 2 ? _rig.unload() : _rig.reopen(); });
    EXPECT_TRUE(_rig.device().status() == before) << "the device is another one when it is opened again";
    if (how == 2) _rig.load();
    _world.startAnew();
  }

  std::vector<std::string> randomRules() {
    static constexpr const char* actions[] = {
        "fail", "error", "none", "value=", "cancel=", "prioritize=", "uninstall=", "store="};
    std::vector<std::string> rules;
    for (std::size_t count = 1 + _dice.below(4); count > 0; --count) {
      std::string rule = _points[_dice.below(_points.size())];
      std::string action = _dice.of(actions);
      // One of these always causes a next one, for ever.
      bool feedsItself = action == "prioritize=" || action == "store=";
      if (_dice.oneIn(2)) rule += ':' + idOf(_dice.below(_count));
      if (feedsItself || !_dice.oneIn(3)) rule += '@' + std::to_string(1 + _dice.below(6));
      rule += '=' + action;
      if (action == "value=")
        rule += std::to_string(_dice.of({0, 1, 2, 3, 77, -1}));
      else if (action.back() == '=')
        rule += idOf(_dice.below(_count));
      rules.push_back(std::move(rule));
    }
    return rules;
  }

  /// An app that no fault has met is brought all the same.
  void playWithoutFaults() {
    goOn();
    Scenario scenario{.continues = true,
                      .apps = {{.id = "app.new", .content = ContentShape::drawn(_dice)}},
                      .process = _world.process};
    _rig.beginStep({});
    auto outcome = run(_rig, scenario);
    look();
    EXPECT_EQ(outcome.marks["app.new"], "INSTALLED") << outcome.text();
    EXPECT_EQ(outcome.present["app.new"], "installed") << outcome.text();
    EXPECT_EQ(_rig.device().app("app.new")->version, "2.0");
    EXPECT_TRUE(_rig.daemon().vantorIDsForAssets().contains("me"));
  }

  const std::uint64_t _seed;
  Dice _dice;
  const std::vector<std::string>& _points;
  const bool _exact;
  const std::size_t _count;
  std::size_t _steps = 0;
  World _world;
  PluginRig _rig;
  Invariants _invariants;
  std::set<std::vector<std::string>> _lists;  // that the host has sent
};

/// Every point that lives without other faults pass.
const std::vector<std::string>& everyPoint() {
  static const std::vector<std::string> points = [] {
    std::set<std::string> passed;
    const std::vector<std::string> none;
    for (std::uint64_t seed = 1; seed <= 60; ++seed) {
      Life life(seed, none);
      if (!life.holds()) break;
      passed.merge(life.pointsPassed);
    }
    std::vector<std::string> injectable;
    std::copy_if(passed.begin(), passed.end(), std::back_inserter(injectable), device::isInjectionPoint);
    return injectable;
  }();
  return points;
}

/// One seed alone when the environment names it, else as many as it says.
template <class Play>
void forEachSeed(Play play) {
  if (const char* seed = std::getenv("APPSYNC_SEED")) {
    play(std::strtoull(seed, nullptr, 10));
    return;
  }
  const char* seeds = std::getenv("APPSYNC_SEEDS");
  const char* first = std::getenv("APPSYNC_FIRST_SEED");
  const std::uint64_t begin = first ? std::strtoull(first, nullptr, 10) : 1;
  const std::uint64_t count = seeds ? std::strtoull(seeds, nullptr, 10) : 400;
  for (std::uint64_t seed = begin; seed < begin + count; ++seed) {
    if (!play(seed)) return;
  }
}

TEST(Simulation, LivesOfADeviceHoldWhatIsPromised) {
  const auto& points = everyPoint();
  ASSERT_GT(points.size(), 80u);
  forEachSeed([&](std::uint64_t seed) { return Life(seed, points).holds(); });
}

}  // namespace
}  // namespace tests
