#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "device/boundary/Injection.h"

namespace tsd {

enum class ProgressMode : std::uint8_t { automatic, plain, tty, none };

/// What every subcommand takes.
struct CommonOptions {
  std::string command;                 // the subcommand's name
  std::vector<std::string> arguments;  // what followed the subcommand's name
  bool json = false;                   // one JSON document on standard output
  bool quiet = false;                  // no progress, and no report of a command that does something
  ProgressMode progress = ProgressMode::automatic;
  std::string log;     // file for the system log; empty: none
  std::string calls;   // file for the call journal; empty: none
  std::string trace;   // file for the timeline; empty: none
  std::string record;  // file for the recording; empty: none
  std::string plugin;  // file of the plug-in; empty: the file beside the program
  std::vector<device::InjectionRule> rules;
};

}  // namespace tsd
