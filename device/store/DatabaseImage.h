#pragma once

#include <optional>
#include <string>

#include "platform/Error.h"
#include "platform/Value.h"

namespace device {

/// A database file as its last commit left it, even while another process writes to it: the file with the pages of its
/// log put in, so that it needs no log. Takes no lock and changes nothing. Nothing, with an error, when a file cannot
/// be read or the database is just being made.
std::optional<platform::Bytes> readDatabaseImage(const std::string& path, platform::ErrorRef* error = nullptr);

}  // namespace device
