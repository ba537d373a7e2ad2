#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/boundary/Boundary.h"
#include "tsd/history/Outcome.h"

namespace tsd {

/// What the summary of a kept run says (see KeptRun).
struct RunSummary {
  std::string folder;
  std::uint64_t number = 0;
  std::string command;
  std::vector<std::string> arguments;
  std::string began;                 // "2024-02-29T12:34:56.789Z"; empty: unknown
  std::optional<std::string> ended;  // absent: it was killed, or is still running
  std::string result;                // "done", …; empty if it has no end
  std::optional<int> exitCode;
  OutcomeCounts counts;
  std::string message;  // why it failed as a whole; may be empty
};

/// The runs in this folder, the oldest first. Other folders are ignored; of a run whose summary cannot be read, only
/// the folder, the number and the command are known.
std::vector<RunSummary> keptRuns(const std::string& runs);

/// What became of an app according to the run; nothing if the run does not say, for example because it was killed.
std::optional<AppOutcome> outcomeIn(const RunSummary& run, const std::string& app);
/// The same for every app of the run.
std::vector<AppOutcome> outcomesIn(const RunSummary& run);

/// Every record of the run's journal whose line contains one of the texts, in order; lines that are not records are
/// skipped.
void readJournal(const RunSummary& run, const std::vector<std::string>& texts,
                 const std::function<void(const device::CallRecord& record)>& each);

}  // namespace tsd
