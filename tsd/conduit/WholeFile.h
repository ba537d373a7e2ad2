#pragma once

#include <string>

#include "platform/Value.h"

namespace tsd {

/// Replaces a file of the host as a whole: an older one stays as it was until the new one is on disk. A link is
/// followed. Throws a `CommandError` that names the file, also when that name belongs to anything but a regular file.
void writeWholeFile(const std::string& path, platform::BytesView content);

/// The content of a file of the host. Throws a `CommandError` that names it.
platform::Bytes readWholeFile(const std::string& path);

}  // namespace tsd
