#pragma once

#include <cstddef>

#include "platform/Value.h"

namespace bench {

/// A todo list as a host writes it: entries of identifier, operation, version and name, all to be installed. The same
/// for the same size.
platform::Value makeTodoList(std::size_t entries);

/// What the goals call a list and a large one; a short run takes less.
std::size_t listSize();
std::size_t largeListSize();

}  // namespace bench
