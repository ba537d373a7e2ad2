#pragma once

#include <string>

#include "device/LocalDevice.h"

namespace tsd {

/// A message of the system log as a line of a file, without a line end: "TIME LEVEL CATEGORY MESSAGE", written now.
std::string logLine(const device::LogRecord& record);

}  // namespace tsd
