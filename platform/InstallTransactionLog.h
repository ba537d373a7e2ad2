#pragma once

#include <memory>
#include <string_view>

#include "platform/SystemLog.h"

namespace platform {

/// The record of what was done to which app. Callable from any thread; never calls back. The numbers' meaning is the
/// log's.
class InstallTransactionLog {
 public:
  virtual ~InstallTransactionLog() = default;

  /// Once per process; later records go to the handle.
  virtual void initializeWithLog(std::shared_ptr<LogHandle> log) = 0;
  virtual void logStep(int step, int party, int phase, bool success, std::string_view bundleID,
                       std::string_view description) = 0;
  virtual void logScenario(std::string_view scenario, int step, bool success, std::string_view bundleID,
                           std::string_view description) = 0;
};

}  // namespace platform
