#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "device/files/FileTree.h"
#include "platform/Error.h"

namespace device {

/// What a package says it is.
struct PackageManifest {
  std::string identifier;
  std::string version;  // empty when it has none
};

/// Reads a package as far as its manifest, without unpacking it; the rest of it may still be damaged. Nothing, with an
/// error of the domain "Package" that names the package, when what was read is not that of a package.
std::optional<PackageManifest> readPackageManifest(FileTree& files, std::string_view packagePath,
                                                   platform::ErrorRef* error = nullptr);

}  // namespace device
