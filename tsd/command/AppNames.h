#pragma once

#include <map>
#include <string>
#include <vector>

#include "device/DeviceStatus.h"
#include "tsd/history/RunHistory.h"

namespace tsd {

/// The apps that a device or its kept runs know, to find one by less than its whole identifier.
class AppNames {
 public:
  AppNames(const device::DeviceStatus& status, const std::vector<RunSummary>& runs);

  /// The only app that has this name, whose identifier ends with a dot and this word or contains it, or whose name
  /// contains it, whatever the case. Throws a `CommandError` when there is no such app, or more than one, which it then
  /// names.
  std::string identifierOf(const std::string& word) const;

 private:
  std::map<std::string, std::string> _names;  // by identifier; may be empty
  std::size_t _runs;
};

}  // namespace tsd
