#pragma once

#include <string>

#include "platform/Value.h"

namespace tsd {

/// Why an element of a todo list cannot be acted on; empty if it can.
std::string problemOfTodoEntry(const platform::Value& entry);

}  // namespace tsd
