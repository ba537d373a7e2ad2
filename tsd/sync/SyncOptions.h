#pragma once

#include <cstddef>
#include <optional>
#include <string>

#include "tsd/daemon/AssetReport.h"

namespace tsd {

struct SyncOptions {
  std::string device;
  std::string host;
  AssetReports reports;
  std::optional<bool> endPhase;  // how the phase is reported to have ended; absent: as it did
  bool daemonReports = false;
  std::size_t repeat = 1;
  std::size_t transfers = 2;  // packages sent at the same time
};

}  // namespace tsd
