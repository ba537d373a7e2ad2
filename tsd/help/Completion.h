#pragma once

#include <string>

#include "tsd/OptionTable.h"

namespace tsd {

/// The scripts with which shells complete command lines of the program: subcommands, options, their values if those can
/// be listed, files and folders. Each needs nothing but the shell itself.
std::string bashCompletion(const OptionTable& table);
std::string zshCompletion(const OptionTable& table);
std::string fishCompletion(const OptionTable& table);

}  // namespace tsd
