#pragma once

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "device/LocalDevice.h"
#include "platform/Value.h"
#include "tsd/history/RunHistory.h"

namespace tsd {

/// What a report is made from, besides what the run itself left.
struct ReportSubject {
  std::string deviceName;
  RunSummary run;
  bool isLast = true;        // no run came after it
  bool isRunning = false;    // a process is working on the device
  device::DeviceStatus now;  // the device's
  std::string version;       // of the program
};

/// All that the report's page shows, read from the run's journal and from the device.
platform::Value reportDocument(const ReportSubject& subject, device::LocalDevice& device);

}  // namespace tsd
