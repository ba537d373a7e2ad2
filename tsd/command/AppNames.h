#pragma once

#include <map>
#include <string>
#include <vector>

#include "device/DeviceStatus.h"
#include "tsd/history/RunHistory.h"

namespace tsd {

/// The apps that a device or its kept runs know, for whoever calls one by less than its identifier.
class AppNames {
 public:
  AppNames(const device::DeviceStatus& status, const std::vector<RunSummary>& runs);

  /// The only app that has this name, or whose identifier ends with a dot and this, or has it in it, or that has it in
  /// its name, whatever the case. Throws a `CommandError` that names those that it may be when there is none, or more
  /// than one.
  std::string identifierOf(const std::string& word) const;

 private:
  std::map<std::string, std::string> _names;  // by identifier; may be empty
  std::size_t _runs;
};

}  // namespace tsd
