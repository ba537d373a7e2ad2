#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "platform/DevicePaths.h"
#include "platform/Value.h"

namespace tsd {

using platform::iconLayoutName;
using platform::todoListName;
constexpr std::string_view packagesName = "Packages";
constexpr std::string_view restoreName = "Restore";
using platform::demotedListName;
using platform::restoreListName;

/// The files in a host's folder that are overlooked because their names are only nearly that of a missing one: a
/// sentence about each, which begins with its path. Throws a `CommandError` when the folder cannot be read.
std::vector<std::string> misspelledFiles(const std::string& folder);

/// Throws a `CommandError` when a host's folder is not there, is not a folder, cannot be read, is a device's, holds
/// none of a host's files, or holds a file whose name is nearly that of a missing one.
void requireHostFolder(const std::string& folder);

/// Whether something is there; throws a `CommandError` when that cannot be found out.
bool isThere(const std::string& path);

/// A property list of the host; absent when there is no such file. Throws a `CommandError` that names the file, and the
/// place in it, when it cannot be read, or is not a property list of that kind.
platform::Value readHostList(const std::string& path, platform::Value::Kind kind);

}  // namespace tsd
