#pragma once

#include <cstdint>
#include <string>

#include "tsd/sample/SampleApp.h"

namespace tsd {

/// Writes the app's package: a zip archive with one "<Name>.app" folder that holds the manifest, the icon and, up to
/// `size` bytes in all, content that does not compress: one file, and the app's other files in folders of ten. The same
/// bytes for the same arguments. Throws a `CommandError` that names the file.
void writeSamplePackage(const std::string& path, const SampleApp& app, std::uint64_t size, std::uint64_t seed);

}  // namespace tsd
