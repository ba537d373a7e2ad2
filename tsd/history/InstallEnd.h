#pragma once

#include <string>

#include "device/DeviceStatus.h"
#include "tsd/history/Outcome.h"

namespace tsd {

/// How the device remembers an app's last install, in the words that the run told it with.
struct InstallEnd {
  Outcome outcome;
  std::string reason;  // may be empty
};

/// Of an app whose last install has an outcome. One that the plug-in gave up, by a code of its own, has failed; only
/// what somebody else ended was cancelled.
InstallEnd endOf(const device::AppStatus& app);

}  // namespace tsd
