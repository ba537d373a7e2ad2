#include "fuzz/ValueFacts.h"

#include <algorithm>
#include <cmath>

namespace fuzz {
namespace {

void count(const platform::Value& value, std::size_t depth, ValueFacts& facts) {
  if (auto text = value.string()) facts.text += text->size();
  if (auto data = value.data()) facts.text += data->size();
  if (auto date = value.date()) facts.hasFractions |= date->seconds != std::floor(date->seconds);
  if (!value.array() && !value.dictionary()) return;
  facts.depth = std::max(facts.depth, depth + 1);
  if (const auto* array = value.array()) {
    facts.nodes += array->size();
    for (const auto& item : *array) count(item, depth + 1, facts);
    return;
  }
  facts.nodes += 2 * value.dictionary()->size();
  for (const auto& entry : *value.dictionary()) {
    facts.text += entry.key.size();
    count(entry.value, depth + 1, facts);
  }
}

}  // namespace

ValueFacts factsOf(const platform::Value& value) {
  ValueFacts facts;
  count(value, 0, facts);
  return facts;
}

}  // namespace fuzz
