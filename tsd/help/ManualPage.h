#pragma once

#include <string>

#include "tsd/OptionTable.h"

namespace tsd {

/// The program's manual page, for section 1, as `man` reads it.
std::string manualPage(const OptionTable& table);
/// The manual page of a subcommand, "tsd-sync(1)".
std::string manualPage(const OptionTable& table, const CommandEntry& command);

}  // namespace tsd
