#pragma once

#include <optional>
#include <string>
#include <vector>

#include "tsd/daemon/CommandContext.h"
#include "tsd/daemon/DeviceLock.h"
#include "tsd/daemon/DeviceSession.h"
#include "tsd/history/RunHistory.h"
#include "tsd/history/RunProgress.h"

namespace tsd {

/// The runs that a device's folder keeps, as `keptRuns`. A last one without an end is marked as running while a process
/// is working on the device.
std::vector<RunSummary> runsOfDevice(const std::string& folder, const TellProblem& tell);

/// A device as it is now, whoever is using it: nobody is waited for or disturbed, and nothing is written.
class DeviceView {
 public:
  /// Throws a `CommandError` when the device cannot be read.
  DeviceView(const CommandContext& context, const std::string& folder);
  /// The same, when the device's progress is already known.
  DeviceView(const CommandContext& context, const std::string& folder, const RunProgress& progress);

  /// A copy in memory.
  device::LocalDevice& device() { return _session.device(); }
  /// Including how far the packages have come, as far as that is known.
  const device::DeviceStatus& status() const { return _status; }
  /// Who is changing it.
  const std::optional<DeviceLock::Holder>& holder() const { return _holder; }
  /// "Process 4711 is working on it: tsd sync phone host." on a line or more; empty when nobody is.
  std::string holderText() const;
  /// Adds "busy" with the process to a command's document, when there is one.
  void addHolder(platform::Value& document) const;

 private:
  const std::optional<DeviceLock::Holder> _holder;
  DeviceSession _session;
  device::DeviceStatus _status;
};

}  // namespace tsd
