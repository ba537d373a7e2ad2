#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/boundary/Boundary.h"
#include "device/files/FileTree.h"
#include "tsd/history/Outcome.h"

namespace tsd {

/// Where the kept runs lie in a device's folder.
constexpr std::string_view runsFolder = "/runs";

/// What the summary of a kept run says (see KeptRun).
struct RunSummary {
  std::shared_ptr<device::FileTree> files;  // the device's folder
  std::string folder;                       // below it
  std::string device;                       // the device's folder, for messages
  std::uint64_t number = 0;
  std::string command;
  std::vector<std::string> arguments;
  std::string began;                 // "2024-02-29T12:34:56.789Z"; empty: unknown
  std::optional<std::string> ended;  // absent: it was killed, or is still running
  bool isRunning = false;            // as far as whoever asks for it knows; otherwise it was killed
  std::string result;                // "done", …; empty if it has no end
  std::optional<int> exitCode;
  OutcomeCounts counts;
  std::string message;  // why it failed as a whole; may be empty
};

/// Told of what cannot be read, with its path and the reason.
using TellProblem = std::function<void(const std::string& problem)>;

/// The runs that a device's folder keeps, the oldest first. Other folders are ignored; of a run whose summary
/// cannot be read, only the folder, the number and the command are known. `tell` may be null.
std::vector<RunSummary> keptRuns(const std::string& device, const TellProblem& tell);

/// "killed" or "still running", of a run without an end.
const char* wordsOfNoEnd(const RunSummary& run);
/// How it ended, or that it did not, for people: "done", "not complete", "killed".
std::string endOf(const RunSummary& run);

// What follows throws a `CommandError` when a file is there and cannot be read. Lines that are not
// records, are too long or are nested too deeply are skipped.

/// What became of an app according to the run; nothing if the run does not say, for example because it was killed.
std::optional<AppOutcome> outcomeIn(const RunSummary& run, const std::string& app);
/// The same for every app of the run.
std::vector<AppOutcome> outcomesIn(const RunSummary& run);

/// Every record of the run's journal whose line contains one of the texts, in order.
/// Answers whether the journal had come to its size limit, so that more happened than it says.
bool readJournal(const RunSummary& run, const std::vector<std::string>& texts,
                 const std::function<void(const device::CallRecord& record)>& each);

}  // namespace tsd
