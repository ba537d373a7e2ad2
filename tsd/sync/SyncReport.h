#pragma once

#include <optional>
#include <string>
#include <vector>

#include "platform/Value.h"
#include "tsd/ExitCode.h"
#include "tsd/daemon/TodoList.h"
#include "tsd/history/Outcome.h"

namespace tsd {

/// The result of one sync.
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
