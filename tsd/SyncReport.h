#pragma once

#include <optional>
#include <string>
#include <vector>

#include "platform/Value.h"
#include "tsd/ExitCode.h"
#include "tsd/TodoList.h"

namespace tsd {

/// What came of one app in a sync.
struct AppOutcome {
  std::string id;
  std::string name;
  std::string version;
  /// "INSTALLED", "SENT", "DOWNLOADED" (of a restore), "SKIPPED"; or, not good: "FAILED", "CANCELLED", "REFUSED",
  /// "PENDING" (asked for, and nothing came of it), "INTERRUPTED".
  std::string outcome;
  std::string reason;  // empty where there is none to give

  bool isGood() const {
    return outcome == "INSTALLED" || outcome == "SENT" || outcome == "DOWNLOADED" || outcome == "SKIPPED";
  }
};

/// What came of one sync.
struct SyncReport {
  ExitCode code = ExitCode::done;
  std::string message;                 // of a sync that failed as a whole, or of a deadline that passed
  std::vector<std::string> deleted;    // reported to the host
  std::vector<std::string> removed;    // at the host's wish
  std::vector<std::string> requested;  // in the order asked for
  std::vector<AppOutcome> apps;
  std::vector<TodoEntry> todo;
  std::optional<double> placeholderSeconds;  // until the last placeholder was on the home screen
  double seconds = 0;

  platform::Value document(const std::string& command) const;
  /// For people.
  std::string text() const;
};

}  // namespace tsd
