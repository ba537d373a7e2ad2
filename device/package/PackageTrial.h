#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "device/files/FileTree.h"
#include "device/package/Package.h"
#include "platform/TextTable.h"

namespace device {

/// What a package holds, of which everything was read.
struct TriedPackage {
  UnpackedPackage package;
  platform::TextMap<platform::Bytes> files;  // those that were wanted, by their names below the ".app" folder
};

/// Unpacks a package into nowhere: it is held to every rule that `unpackPackage` holds it to, and nothing is written.
/// `isWanted` is asked for each file by its name below the ".app" folder; what of the wanted ones is larger than a
/// manifest may be is not kept. Nothing, with the same errors, when it could not be unpacked.
std::optional<TriedPackage> tryPackage(FileTree& files, std::string_view packagePath,
                                       const std::function<bool(std::string_view)>& isWanted = nullptr,
                                       platform::ErrorRef* error = nullptr);

}  // namespace device
