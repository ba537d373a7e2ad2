#pragma once

#include <string>
#include <vector>

#include "tsd/daemon/TodoList.h"
#include "tsd/terminal/Console.h"

namespace tsd {

/// The todo list in a host's folder; empty if there is none. Entries that cannot be acted on are named on the console.
/// Throws a `CommandError` when the list cannot be read.
std::vector<TodoEntry> readHostTodoList(const std::string& host, Console& console);

}  // namespace tsd
