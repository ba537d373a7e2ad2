#pragma once

#include <memory>
#include <string>

#include "device/boundary/Boundary.h"
#include "platform/InstallTransactionLog.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

/// The transaction log: each record is one line in the log it was initialised with; before that, in the journal only.
class TransactionLogService final : public platform::InstallTransactionLog {
 public:
  explicit TransactionLogService(Boundary& boundary) : _boundary(boundary) {}

  void initializeWithLog(std::shared_ptr<platform::LogHandle> log) override;
  void logStep(int step, int party, int phase, bool success, std::string_view bundleID,
               std::string_view description) override;
  void logScenario(std::string_view scenario, int step, bool success, std::string_view bundleID,
                   std::string_view description) override;

 private:
  std::shared_ptr<platform::LogHandle> log();
  void write(const std::string& record, bool success, std::string_view bundleID, std::string_view description);

  Boundary& _boundary;
  platform::Mutex _mutex;
  std::shared_ptr<platform::LogHandle> _log GUARDED_BY(_mutex);
};

}  // namespace device
