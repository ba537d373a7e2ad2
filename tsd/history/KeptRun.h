#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "device/LocalDevice.h"
#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"
#include "tsd/CommonOptions.h"
#include "tsd/ExitCode.h"
#include "tsd/history/Outcome.h"
#include "tsd/history/RunLines.h"
#include "tsd/terminal/Console.h"

namespace tsd {

/// The run of a command as the device's folder keeps it, in `runs/NUMBER-COMMAND/`: the call journal with brief values,
/// the system log, what became of each app, and what was run, when and with what result. Lines are handed to the system
/// before the device's store or the name of a file changes, and ten times a second, so that the files show what a
/// killed process did last. Nothing here makes a command fail: a problem is reported once.
class KeptRun {
 public:
  static constexpr std::size_t most = 20;  // runs kept on a device; the oldest make room
  /// Bytes of a run's journal, and of its log; what exceeds them is left out, and the last line says so.
  static constexpr std::uint64_t mostBytes = std::uint64_t{64} << 20;
  static constexpr const char* lastLineOfJournal =
      R"({"note":"the journal is cut off here, as it has become too long"})";

  /// `device` is the device's folder, which this process has locked; `console` outlives the run.
  KeptRun(const std::string& device, const CommonOptions& options, Console& console);
  ~KeptRun();
  KeptRun(const KeptRun&) = delete;
  KeptRun& operator=(const KeptRun&) = delete;

  /// Both are called under their caller's own lock.
  void hear(const device::CallRecord& record);
  void hear(const device::LogRecord& record);
  /// Whatever was heard is with the system when it returns. From any thread.
  void handOver() noexcept;
  /// Notes what became of the apps and, if the run failed as a whole, why; when a run does its work several times, the
  /// last time counts.
  void conclude(const std::vector<AppOutcome>& apps, const std::string& message);
  /// Notes how it ended, with the message of a command that could not go on, once nothing is heard any more (or the
  /// process is about to end). Without this the run counts as killed.
  void end(ExitCode code, const std::string& message = {});

 private:
  void makeFolder();
  void handOverNowAndThen();
  std::unique_ptr<device::FileWriter> newFile(const char* name) const;
  void writeSummary(const ExitCode* code) const;
  /// Throws a `CommandError` that names the file, when the operation has failed.
  void require(bool done, const platform::ErrorRef& error) const;
  void tell(const std::string& problem);

  const CommonOptions& _options;
  Console& _console;
  const std::string _device;
  const std::string _began;
  std::unique_ptr<device::FileTree> _files;  // the device's folder; null: nothing is kept
  std::string _folder;                       // below it; empty: nothing is kept
  OutcomeCounts _counts;
  std::string _message;
  bool _told = false;
  std::optional<RunLines> _calls;  // guarded by the journal's lock
  std::optional<RunLines> _log;    // guarded by the system log's lock
  std::string _line;               // of the journal, its memory kept; guarded by the journal's lock
  platform::Mutex _mutex;
  platform::Condition _changed;
  bool _over GUARDED_BY(_mutex) = false;
  std::thread _thread;
};

}  // namespace tsd
