#pragma once

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/ReferenceModel.h"

namespace tests {

/// One row: what is given, and what must be seen of it.
template <class AnyScenario>
struct ScenarioRow {
  AnyScenario given;
  std::string outcome;                   // its text
  std::vector<std::string> says{};       // in this order, other messages between them
  std::vector<std::string> neverSays{};  // patterns that no message fits
  bool modelled = true;                  // the reference model says the same
};

template <class AnyScenario>
void expectRows(const std::vector<ScenarioRow<AnyScenario>>& rows) {
  for (const auto& row : rows) {
    SCOPED_TRACE(row.given.name);
    PluginRig rig(optionsOf(row.given));
    auto outcome = run(rig, row.given);
    EXPECT_EQ(outcome.text(), row.outcome);
    EXPECT_TRUE(!row.modelled || outcome.text() == predict(row.given).text()) << predict(row.given).text();
    EXPECT_TRUE(inOrder(rig.messages(), row.says));
    for (const auto& pattern : row.neverSays) EXPECT_FALSE(inOrder(rig.messages(), {pattern})) << pattern;
  }
}

}  // namespace tests
