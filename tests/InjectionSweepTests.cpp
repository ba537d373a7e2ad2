#include <gtest/gtest.h>

#include <cstdlib>
#include <map>
#include <string>

#include "tests/ReferenceModel.h"

namespace tests {
namespace {

/// Every fourth failure, beginning somewhere else with each seed; all of them when the environment says so.
struct Sample {
  std::size_t begin = 0;
  std::size_t step = 4;

  Sample() {
    const char* sweep = std::getenv("APPSYNC_SWEEP");
    const char* seed = std::getenv("APPSYNC_SEED");
    if (sweep && std::string(sweep) == "all") step = 1;
    if (seed) begin = std::strtoull(seed, nullptr, 10) % step;
  }
};

/// What only loses memory is nothing that an outcome could show.
bool showsInOutcome(const Failure& failure) { return failure.point != "Process.deallocateMemory"; }

std::string describe(const Failure& failure) {
  return failure.rule() + "\n  inside " + failure.entry + ", call " + std::to_string(failure.ordinal) + " about \"" +
         failure.app + "\" \"" + failure.path + "\"";
}

/// Records a clean run, then fails each call that crossed to a service once, in a run of its own.
template <class AnyScenario>
void sweep(AnyScenario scenario, std::size_t fewest) {
  std::vector<Failure> failures;
  {
    PluginRig rig(optionsOf(scenario));
    ASSERT_EQ(run(rig, scenario).text(), predict(scenario).text());
    failures = failuresOf(rig.records());
  }
  ASSERT_GT(failures.size(), fewest);
  const Sample sample;
  for (std::size_t i = sample.begin; i < failures.size(); i += sample.step) {
    if (!showsInOutcome(failures[i])) continue;
    scenario.failures = {failures[i]};
    PluginRig rig(optionsOf(scenario));
    EXPECT_EQ(run(rig, scenario).text(), predict(scenario).text()) << describe(failures[i]);
  }
}

using App = ScenarioApp;

const Scenario threeInstalls{
    .name = "three installs, a removal, a deletion",
    .apps = {{.id = "app.fresh", .hasIcon = true},
             {.id = "app.update", .before = App::Before::installed},
             {.id = "app.shown", .before = App::Before::placeholder, .path = App::Path::recorded},
             {.id = "app.unwanted", .before = App::Before::installed, .operation = "remove"},
             {.id = "app.lost", .lost = true, .previousMark = "INSTALLED", .operation = ""},
             {.id = "app.last", .operation = "", .inLastSync = true}},
    .layout = {"app.update", "app.fresh"}};
const Scenario trouble{
    .name = "transfers that end badly",
    .apps = {{.id = "app.stalled", .transfer = App::Transfer::stalls},
             {.id = "app.failed", .before = App::Before::installed, .transfer = App::Transfer::fails},
             {.id = "app.reported", .report = App::Report::failed}},
    .phaseSucceeded = false};
const RestoreScenario threeRestored{.name = "three apps",
                                    .apps = {{.id = "app.plain"},
                                             {.id = "app.automatic", .demotedAutomatically = true},
                                             {.id = "app.byHand", .demotedByHand = true}}};

TEST(InjectionSweep, EveryCallOfASyncFailsOnce) { sweep(threeInstalls, 250); }
TEST(InjectionSweep, EveryCallOfASyncWithTroubleFailsOnce) { sweep(trouble, 150); }
TEST(InjectionSweep, EveryCallOfARestoreFailsOnce) { sweep(threeRestored, 90); }

/// What is an error by itself: a service's answer to the question for one.
bool answersAnError(const Failure& failure) {
  return failure.point == "RVAppInstallCoordinator.error" ||
         failure.point == "CLManager.tessaroShouldCreateAppPlaceholdersWithError" ||
         failure.point == "InstallCoordination.RVCreateUserPresentableError";
}

/// Each kind of call in each operation once takes effect and reports an error besides, which changes nothing.
template <class AnyScenario>
void errorSweep(AnyScenario scenario, std::size_t fewest) {
  const std::string clean = predict(scenario).text();
  std::map<std::string, Failure> kinds;
  {
    PluginRig rig(optionsOf(scenario));
    run(rig, scenario);
    for (const auto& failure : failuresOf(rig.records())) kinds.emplace(failure.entry + ' ' + failure.point, failure);
  }
  ASSERT_GT(kinds.size(), fewest);
  for (const auto& [kind, failure] : kinds) {
    if (answersAnError(failure)) continue;
    const std::string rule = failure.rule();
    scenario.rules = {rule.substr(0, rule.rfind('=')) + "=error"};
    PluginRig rig(optionsOf(scenario));
    EXPECT_EQ(run(rig, scenario).text(), clean) << describe(failure);
  }
}

TEST(InjectionSweep, AnErrorBesideASyncChangesNothing) { errorSweep(threeInstalls, 100); }
TEST(InjectionSweep, AnErrorBesideASyncWithTroubleChangesNothing) { errorSweep(trouble, 100); }
TEST(InjectionSweep, AnErrorBesideARestoreChangesNothing) { errorSweep(threeRestored, 40); }

}  // namespace
}  // namespace tests
