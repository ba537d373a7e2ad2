#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "device/files/FileTree.h"
#include "platform/Error.h"
#include "platform/Value.h"

namespace device {

/// How large a package may be. Everything is counted while it is written, whatever the archive says about itself.
struct PackageLimits {
  std::size_t entries = 100'000;  // of the archive; also files and folders, listed or not
  std::uint64_t totalBytes = std::uint64_t{8} << 30;
  std::size_t nameLength = 1024;  // bytes of a whole name
  std::size_t componentLength = 255;
  std::size_t depth = 32;  // components of a name
};

struct UnpackedPackage {
  std::string bundle;        // name of the ".app" directory
  std::string identifier;    // the manifest's "KBBundleIdentifier"
  platform::Value manifest;  // a dictionary
  std::uint64_t bytes = 0;   // of all its files
};

/// Unpacks a package, a zip archive with one "<Name>.app" folder at its top, into a directory that exists and is
/// empty. Nothing is flushed. Answers nothing, with an error of the domain "Package" that names the package and the
/// entry, when it holds anything but plain files and folders below that one folder, when two names differ in case
/// only, or when a limit is exceeded; what has been written by then is left for the caller to remove.
///
/// Of an entry's attributes only owner execute is kept. Only ASCII letters have case; all other characters of a name
/// are taken as they are. libarchive turns the backslashes of a name without a slash into slashes first.
std::optional<UnpackedPackage> unpackPackage(FileTree& files, std::string_view packagePath,
                                             const std::string& directory, const PackageLimits& limits = {},
                                             platform::ErrorRef* error = nullptr);

}  // namespace device
