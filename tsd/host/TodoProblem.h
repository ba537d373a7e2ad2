#pragma once

#include <string>

#include "platform/Value.h"

namespace tsd {

/// Why nobody can act on an element of a todo list; empty: somebody can.
std::string problemOfTodoEntry(const platform::Value& entry);

}  // namespace tsd
