#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "device/LocalDevice.h"
#include "tsd/CommonOptions.h"
#include "tsd/ExitCode.h"
#include "tsd/history/MappedLines.h"
#include "tsd/history/Outcome.h"
#include "tsd/terminal/Console.h"

namespace tsd {

/// The run of a command as the device's folder keeps it, in `runs/NUMBER-COMMAND/`: the call journal with brief values,
/// the system log, what came of each app, and what was run, when and with what result. A line is with the system when
/// it was heard, so that the files tell of a killed process what it did last. Nothing here fails a command: what goes
/// wrong is said once.
class KeptRun {
 public:
  static constexpr std::size_t most = 20;  // runs of a device; the oldest make room
  /// Bytes of a run's journal, and of its log; what comes then is left out, which the last line says.
  static constexpr std::uint64_t mostBytes = std::uint64_t{64} << 20;

  /// `device` is the device's folder, which this process has locked; `console` outlives the run.
  KeptRun(const std::string& device, const CommonOptions& options, Console& console);

  /// Each under its caller's own lock.
  void hear(const device::CallRecord& record);
  void hear(const device::LogRecord& record);
  /// Notes what came of the apps, and, where it failed as a whole, why; of a run that does its work several times the
  /// last time counts.
  void conclude(const std::vector<AppOutcome>& apps, const std::string& message);
  /// Notes how it ended, with the message of a command that could not go on, once nothing is heard any more (or the
  /// process is about to end). Without it the run counts as one that was killed.
  void end(ExitCode code, const std::string& message = {});

 private:
  void makeFolder(const std::string& runs);
  void writeSummary(const ExitCode* code) const;
  void tell(const std::string& problem);

  const CommonOptions& _options;
  Console& _console;
  const std::string _began;
  std::string _folder;  // empty: nothing is kept
  OutcomeCounts _counts;
  std::string _message;
  bool _told = false;
  std::optional<MappedLines> _calls;  // guarded by the journal's lock
  std::optional<MappedLines> _log;    // guarded by the system log's lock
  std::string _line;                  // of the journal, its memory kept; guarded by the journal's lock
};

}  // namespace tsd
