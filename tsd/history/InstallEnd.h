#pragma once

#include <string>

#include "device/DeviceStatus.h"
#include "tsd/history/Outcome.h"

namespace tsd {

/// How the device remembers the end of an app's last install, in the run's words.
struct InstallEnd {
  Outcome outcome;
  std::string reason;  // may be empty
};

/// For an app whose last install has an outcome. An install that the plug-in gave up, by a code of its own, has failed;
/// only one that somebody else ended was cancelled.
InstallEnd endOf(const device::AppStatus& app);

}  // namespace tsd
