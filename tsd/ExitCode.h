#pragma once

namespace tsd {

/// How the program ends.
enum class ExitCode : int {
  done = 0,        // also: there was nothing to do
  failed = 1,      // the command as a whole
  usage = 2,       // the command line
  someFailed = 3,  // some apps are not as the host wants them
  cancelled = 4,   // by a signal
  deadline = 5,    // a deadline passed before everything awaited had happened
  busy = 6,        // another process holds the device
  differs = 7,     // a replay differs from its recording
};

}  // namespace tsd
