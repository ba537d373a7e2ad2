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
  std::optional<bool> endPhase;  // what the phase is said to have ended with; absent: what happened
  bool daemonReports = false;
  std::size_t repeat = 1;
  std::size_t transfers = 2;  // packages in flight
};

}  // namespace tsd
