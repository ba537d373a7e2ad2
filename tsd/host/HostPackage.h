#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "platform/Value.h"

namespace tsd {

/// An app as its package has it. Bytes that the package does not have are empty.
struct HostPackage {
  std::string id;
  std::string version;       // may be empty
  std::string name;          // the manifest's, else the ".app" folder's
  std::string iconName;      // of the file in its bundle; empty when the manifest names none that is there
  platform::Bytes manifest;  // "Info.plist" as it is
  platform::Bytes icon;
  platform::Bytes artwork;
  platform::Bytes metadata;  // "HarluneMetadata.plist" as it is
};

/// Reads the whole package as a device would when it installs it, without writing anything. Throws a `CommandError`
/// that names the file, as `shownPath` has it, when no device would take it, or its identifier can be no app's.
HostPackage readHostPackage(const std::string& path, const std::string& shownPath);

/// Makes a package of an app's folder, which is a "NAME.app" folder, has one in it and nothing else, or is another
/// folder with an "Info.plist", whose name gets the ending. Throws a `CommandError` that names the file when something
/// in it is neither a file nor a folder, or no device would take the package. An older file stays as it is unless it
/// is to be replaced.
HostPackage packFolder(const std::string& folder, const std::string& output, bool replaces);

}  // namespace tsd
