#pragma once

#include <functional>
#include <string>

#include "device/events/EventQueue.h"
#include "device/files/FileTree.h"
#include "device/install/Containers.h"
#include "device/install/OpenCoordinators.h"
#include "device/records/AppRecords.h"
#include "device/reports/InstallReports.h"

namespace device {

/// What every install works with. It outlives them all.
struct InstallParts {
  AppRecords& records;
  FileTree& files;
  Containers& containers;
  OpenCoordinators& open;
  InstallReports& reports;
  EventQueue& events;
  /// Told why an app's placeholder could not be written, since the plug-in ignores that silently. May be null.
  const std::function<void(const std::string& app, const platform::ErrorRef& reason)>& placeholderFailed;
};

}  // namespace device
