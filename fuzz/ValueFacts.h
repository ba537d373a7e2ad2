#pragma once

#include <algorithm>
#include <cstddef>

#include "platform/Value.h"

namespace fuzz {

/// What a value amounts to, counted place by place, however the places share it.
struct ValueFacts {
  std::size_t nodes = 0;      // values and keys in containers
  std::size_t text = 0;       // bytes of strings, keys and data
  std::size_t depth = 0;      // of containers in each other
  bool hasFractions = false;  // dates between two seconds, which the XML form does not carry
};
ValueFacts factsOf(const platform::Value& value);

/// Above that many nodes a document that was read from so many bytes is not worth a fuzzer's time any more.
constexpr std::size_t largeTree(std::size_t size) { return std::max<std::size_t>(4096, size); }

}  // namespace fuzz
