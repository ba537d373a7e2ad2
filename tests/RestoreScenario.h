#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tests/PluginRig.h"
#include "tests/Scenario.h"

namespace tests {

/// One app of the host's restore list.
struct RestoreApp {
  enum class Entry { good, notADictionary, noMetadata, metadataIsNoList, metadataIsNoDictionary };

  std::string id{};
  bool demotedAutomatically = false;
  bool demotedByHand = false;
  Entry entry = Entry::good;
  std::vector<std::pair<std::string, Value>> metadata{};  // what the store metadata holds
  bool hasIcon = true;
  bool hasRights = true;
  ContentShape content{};
  bool neverReported = false;  // nobody tells that its placeholder was installed
};

/// One restore on a device of its own.
struct RestoreScenario {
  std::string name{};
  std::vector<RestoreApp> apps{};
  std::optional<Bytes> rawList{};  // instead of the list of the apps
  bool hasList = true;
  std::optional<Bytes> rawDemotedList{};
  std::int32_t type = 2;
  std::string process = "com.vantor.shiftwell";
  std::vector<std::pair<std::string, std::string>> settings{};
  std::vector<std::string> rules{};
  std::vector<Failure> failures{};
  std::function<std::size_t(std::size_t)> chooser{};
};

struct RestoreOutcome {
  bool accepted = true;
  std::vector<std::string> cancelled{};        // as of a sync
  std::vector<std::string> open{};             // as of a sync
  std::map<std::string, std::string> present;  // by identifier: "placeholder 2", the number being the install type
  std::int64_t waited = 0;                     // seconds of the clock
  bool filedAway = false;                      // the list lies among the logs
  std::string error{};                         // what the daemon got

  std::string text() const;
};

PluginRig::Options optionsOf(const RestoreScenario& scenario);
/// Lays out the lists and runs the restore.
RestoreOutcome run(PluginRig& rig, const RestoreScenario& scenario);
/// Only lays out.
void writeRestoreLists(PluginRig& rig, const RestoreScenario& scenario);

}  // namespace tests
