#pragma once

#include "tests/RestoreScenario.h"
#include "tests/Scenario.h"
#include "tests/World.h"

namespace tests {

/// What must follow from a sync: worked out from what the device, the host and the daemon do, without a look at how
/// the plug-in goes about it. Of several failures at once only those of different apps are told right.
Outcome predict(const Scenario& scenario, World& world);
/// What must follow from a restore.
RestoreOutcome predict(const RestoreScenario& scenario, World& world);
/// On a device of its own.
template <class AnyScenario>
auto predict(const AnyScenario& scenario) {
  World world(scenario.process);
  return predict(scenario, world);
}

}  // namespace tests
