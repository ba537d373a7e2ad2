#pragma once

#include <atomic>
#include <string_view>
#include <thread>

#include "platform/Error.h"
#include "tsd/stopping/StopSignal.h"

namespace tsd {

/// Lets an operation of the plug-in that works through many apps end early once a stop is requested: the device
/// declines the calls by which the operation would begin one more app, or mark one that was not begun as failed. The
/// plug-in takes each for that app's failure and goes on to the next, so that it ends soon and properly. What was begun
/// stays as it is.
class EarlyEnd {
 public:
  explicit EarlyEnd(const StopSignal& stop) : _stop(stop) {}

  /// While it lives the calling thread is inside such an operation. One at a time.
  class Operation {
   public:
    explicit Operation(EarlyEnd* earlyEnd);
    ~Operation();
    Operation(const Operation&) = delete;
    Operation& operator=(const Operation&) = delete;

   private:
    EarlyEnd* const _earlyEnd;  // null: the operation does not end early
  };

  /// Why a call of the plug-in is declined; absent if it is not. From any thread.
  platform::ErrorRef declines(std::string_view service, std::string_view operation) const;

 private:
  const StopSignal& _stop;
  std::atomic<std::thread::id> _inside;  // none when there is no operation
};

}  // namespace tsd
