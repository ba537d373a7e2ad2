#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "platform/FileSystem.h"
#include "platform/Value.h"

namespace tsd {

/// One entry of the todo list, as far as it can be read; fields that are not strings are empty.
struct TodoEntry {
  std::string identifier;
  std::string operation;
  std::string name;
  std::string version;
};

/// The todo list in the work area; empty if it is missing or cannot be read. Entries that are not dictionaries are
/// skipped. `problem`, when given, becomes the reason why an existing list cannot be read, or empty.
std::vector<TodoEntry> readTodoList(platform::FileSystem& files, std::string* problem = nullptr);

/// The entries of a list; none if it is not an array.
std::vector<TodoEntry> todoEntriesOf(const platform::Value& list);

/// What the host wants of an app, all its entries of the todo list taken together: removals count first, then installs.
enum class TodoWish : std::uint8_t { install, removal, other };
std::map<std::string, TodoWish> wishesOf(const std::vector<TodoEntry>& entries);

/// Puts the path of an app's package into the restore state and leaves its other records alone. False with an error
/// when it cannot be written.
bool recordPackagePath(platform::FileSystem& files, const std::string& identifier, const std::string& version,
                       const std::string& path, platform::ErrorRef* error = nullptr);

}  // namespace tsd
