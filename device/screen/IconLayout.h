#pragma once

#include <string>

#include "platform/Value.h"

namespace device {

/// Why the home screen does not take a host's layout.
struct LayoutProblem {
  std::size_t place = 0;  // of the entry that it is about, from 0
  std::string text;       // empty: the layout is taken
};
LayoutProblem problemOfLayout(const platform::Value& layout);

}  // namespace device
