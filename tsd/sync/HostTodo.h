#pragma once

#include <string>
#include <vector>

#include "tsd/daemon/TodoList.h"
#include "tsd/terminal/Console.h"

namespace tsd {

/// The todo list in a host's folder; nothing where there is none. Entries that nobody can act on are named on the
/// console. Throws a `CommandError` when it cannot be read.
std::vector<TodoEntry> readHostTodoList(const std::string& host, Console& console);

}  // namespace tsd
