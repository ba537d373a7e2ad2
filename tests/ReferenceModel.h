#pragma once

#include "tests/RestoreScenario.h"
#include "tests/Scenario.h"

namespace tests {

/// What must follow from a sync: worked out from what the device, the host and the daemon do, without a look at how
/// the plug-in goes about it. Of several failures at once only those of different apps are told right.
Outcome predict(const Scenario& scenario);
/// What must follow from a restore.
RestoreOutcome predict(const RestoreScenario& scenario);

}  // namespace tests
