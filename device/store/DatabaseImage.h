#pragma once

#include <optional>
#include <string>

#include "platform/Error.h"
#include "platform/Value.h"

namespace device {

/// A database file as its last commit left it, also while another process writes to it: the file with the pages that
/// its log has of it, as one that has no log. Takes no lock and leaves everything as it is. Nothing with an error when
/// a file cannot be read, or the database is being made.
std::optional<platform::Bytes> readDatabaseImage(const std::string& path, platform::ErrorRef* error = nullptr);

}  // namespace device
