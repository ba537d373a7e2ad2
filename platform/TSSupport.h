#pragma once

#include <memory>

#include "platform/SystemLog.h"
#include "platform/TSAccountInfo.h"

namespace platform {

/// The sync daemon's support library. Callable from any thread.
class TSSupport {
 public:
  virtual ~TSSupport() = default;

  /// The daemon's log category of that number: 8 for the plug-in's messages, 15 for long summaries, 0 for
  /// unexpected metadata. The handle lives as long as the daemon.
  virtual LogHandle& TSGetLogCategory(int category) = 0;
  /// A new, empty account record; null when none can be made.
  virtual std::shared_ptr<TSMutableAccountInfo> makeAccountInfo() = 0;
};

}  // namespace platform
