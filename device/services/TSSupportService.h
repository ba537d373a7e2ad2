#pragma once

#include <map>
#include <memory>

#include "device/boundary/Boundary.h"
#include "device/services/SystemLogService.h"
#include "platform/Mutex.h"
#include "platform/TSSupport.h"
#include "platform/ThreadSafety.h"

namespace device {

/// The daemon's support library: its log categories are categories of the system log, named by their number.
class TSSupportService final : public platform::TSSupport {
 public:
  TSSupportService(Boundary& boundary, SystemLogService& log) : _boundary(boundary), _log(log) {}

  /// Does not cross the boundary by itself: callers ask for it with every message, and the message crosses.
  platform::LogHandle& TSGetLogCategory(int category) override;
  /// The record is a `LocalAccountInfo`.
  std::shared_ptr<platform::TSMutableAccountInfo> makeAccountInfo() override;

 private:
  Boundary& _boundary;
  SystemLogService& _log;
  platform::Mutex _mutex;
  std::map<int, std::shared_ptr<platform::LogHandle>> _categories GUARDED_BY(_mutex);
};

}  // namespace device
