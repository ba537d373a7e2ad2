#pragma once

#include <string>
#include <vector>

#include "tsd/daemon/Daemon.h"

namespace tsd {

/// The results of the first calls of a sync, up to the reconciliation.
struct SyncOpening {
  std::vector<std::string> deleted;  // what the host is told was removed on the device
  std::string problem;               // why the plug-in refused a step; empty if it did not
};

/// Asks the plug-in whether it serves apps, has it prepare the sync, asks what was deleted, and has it take over the
/// host's files.
SyncOpening openSync(Daemon& daemon);

}  // namespace tsd
