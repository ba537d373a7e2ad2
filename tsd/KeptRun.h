#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "device/LocalDevice.h"
#include "tsd/CommonOptions.h"
#include "tsd/Console.h"
#include "tsd/ExitCode.h"
#include "tsd/MappedLines.h"

namespace tsd {

/// The run of a command as the device's folder keeps it, in `runs/NUMBER-COMMAND/`: the call journal with brief values,
/// the system log, and what was run, when and with what result. A line is with the system when it was heard, so that
/// the files tell of a killed process what it did last. Nothing here fails a command: what goes wrong is said once.
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
  /// Notes how it ended, once nothing is heard any more (or the process is about to end). Without it the run counts as
  /// one that was killed.
  void end(ExitCode code);

 private:
  void makeFolder(const std::string& runs);
  void writeSummary(const ExitCode* code) const;
  void tell(const std::string& problem);

  const CommonOptions& _options;
  Console& _console;
  const std::string _began;
  std::string _folder;  // empty: nothing is kept
  bool _told = false;
  std::optional<MappedLines> _calls;  // guarded by the journal's lock
  std::optional<MappedLines> _log;    // guarded by the system log's lock
  std::string _line;                  // of the journal, its memory kept; guarded by the journal's lock
};

}  // namespace tsd
