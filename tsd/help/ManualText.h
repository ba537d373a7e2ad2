#pragma once

#include <string>
#include <vector>

namespace tsd {

/// A piece of a manual page: what it is about, and what there is to say.
struct ManualItem {
  std::string tag;
  std::string text;
};

/// A command line that does something useful.
struct ManualExample {
  std::string line;
  std::string text;
};

// What manual pages say beside what the options say of themselves.
const std::vector<ManualItem>& manualOfRules();        // how a rule of injection is written
const std::vector<ManualItem>& manualOfActions();      // the actions of a rule; each stands in `injectionActions`
const std::vector<ManualItem>& manualOfSettings();     // a device's settings; each stands in `settingKeys`
const std::vector<ManualItem>& manualOfFiles();        // of a device and a host
const std::vector<ManualItem>& manualOfEnvironment();  // variables
/// Of a subcommand, by its name, or of the program, without one.
std::vector<ManualExample> manualExamples(const std::string& command);

}  // namespace tsd
