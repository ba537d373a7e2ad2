#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "platform/FileSystem.h"

namespace tsd {

/// One entry of the todo list, as far as it can be read; fields that are no strings are empty.
struct TodoEntry {
  std::string identifier;
  std::string operation;
  std::string name;
  std::string version;
};

constexpr std::string_view todoListPath = "/var/mobile/Library/ApplicationSync/HarluneStuff/ApplicationsSync.plist";
constexpr std::string_view restoreStatePath = "/var/mobile/Library/ApplicationSync/RestoreState.plist";

/// The todo list in the work area. Without one, or when it is not what it should be, nothing; entries that are no
/// dictionaries are passed over. `problem`, when given, becomes why a list that is there cannot be read, or empty.
std::vector<TodoEntry> readTodoList(platform::FileSystem& files, std::string* problem = nullptr);

/// Puts the path of an app's package into the restore state, whose other records stay. False with an error when it
/// cannot be written.
bool recordPackagePath(platform::FileSystem& files, const std::string& identifier, const std::string& version,
                       const std::string& path, platform::ErrorRef* error = nullptr);

}  // namespace tsd
