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

/// The files in a host's folder that stand where nobody looks for them, as their names are nearly that of one that is
/// missing: a sentence about each, which begins with its path. Throws a `CommandError` when the folder cannot be read.
std::vector<std::string> misspelledFiles(const std::string& folder);

/// Throws a `CommandError` when a host's folder is not there, is none, cannot be read, is a device's, has none of a
/// host's files in it, or a file in the place of a missing one that has nearly its name.
void requireHostFolder(const std::string& folder);

/// False for what is not there; throws a `CommandError` when that cannot be told.
bool isThere(const std::string& path);

/// A property list of the host; absent when there is no such file. Throws a `CommandError` that names the file, and the
/// place in it, when it cannot be read, or is no property list of that kind.
platform::Value readHostList(const std::string& path, platform::Value::Kind kind);

}  // namespace tsd
