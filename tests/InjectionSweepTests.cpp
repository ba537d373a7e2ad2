#include <gtest/gtest.h>

#include <cstdlib>
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

TEST(InjectionSweep, EveryCallOfASyncFailsOnce) {
  using App = ScenarioApp;
  sweep(Scenario{.name = "three installs, a removal, a deletion",
                 .apps = {{.id = "app.fresh", .hasIcon = true},
                          {.id = "app.update", .before = App::Before::installed},
                          {.id = "app.shown", .before = App::Before::placeholder, .path = App::Path::recorded},
                          {.id = "app.unwanted", .before = App::Before::installed, .operation = "remove"},
                          {.id = "app.lost", .lost = true, .previousMark = "INSTALLED", .operation = ""},
                          {.id = "app.last", .operation = "", .inLastSync = true}},
                 .layout = {"app.update", "app.fresh"}},
        250);
}

TEST(InjectionSweep, EveryCallOfASyncWithTroubleFailsOnce) {
  using App = ScenarioApp;
  sweep(Scenario{.name = "transfers that end badly",
                 .apps = {{.id = "app.stalled", .transfer = App::Transfer::stalls},
                          {.id = "app.failed", .before = App::Before::installed, .transfer = App::Transfer::fails},
                          {.id = "app.reported", .report = App::Report::failed}},
                 .phaseSucceeded = false},
        150);
}

TEST(InjectionSweep, EveryCallOfARestoreFailsOnce) {
  sweep(RestoreScenario{.name = "three apps",
                        .apps = {{.id = "app.plain"},
                                 {.id = "app.automatic", .demotedAutomatically = true},
                                 {.id = "app.byHand", .demotedByHand = true}}},
        90);
}

}  // namespace
}  // namespace tests
