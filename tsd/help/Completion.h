#pragma once

#include <string>

#include "tsd/OptionTable.h"

namespace tsd {

/// What a shell reads to complete a command line of the program: subcommands, options, their values where those can be
/// listed, files and folders. Each needs nothing but the shell itself.
std::string bashCompletion(const OptionTable& table);
std::string zshCompletion(const OptionTable& table);
std::string fishCompletion(const OptionTable& table);

}  // namespace tsd
