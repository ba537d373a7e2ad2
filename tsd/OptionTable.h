#pragma once

#include <string>
#include <vector>

#include "tsd/ExitCode.h"

namespace tsd {

/// An option or an argument of a subcommand, as its help shows it.
struct OptionEntry {
  std::vector<std::string> names;  // "-o", "--output"; of an argument only its name: "DEVICE"
  std::string value;               // placeholder for the value: "FILE"; of an argument its name; empty for a flag
  std::string description;         // one line
  std::vector<std::string> words;  // the values it takes, if they can be listed
  bool isArgument = false;
  bool isRequired = false;
  bool isRepeatable = false;
  bool isCommon = false;  // one that the subcommands share

  /// Whether the value names something in the file system; the placeholder tells which sort.
  bool takesFile() const { return value == "FILE"; }
  /// Whether it is a file to add to a host or an app of that host to remove, as the two arguments before it have it.
  bool takesSource() const { return value == "SOURCE"; }
  /// Whether it names an app of the device before it, or is a rule of injection.
  bool takesApp() const { return value == "APP"; }
  bool takesRule() const { return value == "RULE"; }
  /// Whether it is an app of the host, the second argument, with one of the words behind it.
  bool takesAsset() const { return value == "ASSET"; }
  bool takesFolder() const { return value == "DEVICE" || value == "HOST" || value == "FOLDER"; }
};

struct CommandEntry {
  std::string name;
  std::string description;
  std::vector<OptionEntry> options;  // and arguments, in the order of the help
};

struct ExitCodeEntry {
  ExitCode code;
  std::string meaning;
};

/// A point of injection rules, and the calls that it stands for.
struct PointEntry {
  std::string name;
  std::string calls;
};

/// Everything that the help texts say: manual pages and completions are made from it too.
struct OptionTable {
  std::string program;
  std::string version;
  std::string description;
  std::vector<ExitCodeEntry> exitCodes;
  std::vector<CommandEntry> commands;
  std::vector<std::string> points;   // of injection rules
  std::vector<PointEntry> calls;     // what these stand for, and those that stand for several
  std::vector<std::string> actions;  // those that take something end with "="

  /// What can be said of an app's asset.
  std::vector<std::string> assetWords() const {
    for (const auto& command : commands) {
      for (const auto& option : command.options) {
        if (option.takesAsset()) return option.words;
      }
    }
    return {};
  }
};

}  // namespace tsd
