#include "device/services/TransactionLogService.h"

#include <utility>

namespace device {

using platform::LogHandle;
using platform::LogLevel;

static constexpr const char* className = "InstallTransactionLog";

static Crossing crossingOf(const InjectionPoint& point, std::string_view bundleID) {
  Crossing crossing{point, bundleID};
  crossing.isMessage = true;
  return crossing;
}

void TransactionLogService::initializeWithLog(std::shared_ptr<LogHandle> log) {
  _boundary.call({{className, "initializeWithLog"}}, nullptr, {{"log", log}}, [&] {
    platform::Mutex::Lock lock(_mutex);
    _log = std::move(log);
  });
}

std::shared_ptr<LogHandle> TransactionLogService::log() {
  platform::Mutex::Lock lock(_mutex);
  return _log;
}

void TransactionLogService::write(const std::string& record, bool success, std::string_view bundleID,
                                  std::string_view description) {
  auto handle = log();
  if (!handle || !handle->isEnabled(LogLevel::standard)) return;
  std::string line = record + (success ? " success " : " failure ");
  line += bundleID;
  line += ": ";
  line += description;
  handle->write(LogLevel::standard, line);
}

void TransactionLogService::logStep(int step, int party, int phase, bool success, std::string_view bundleID,
                                    std::string_view description) {
  _boundary.call(
      crossingOf({className, "logStep"}, bundleID), nullptr,
      {{"step", step}, {"party", party}, {"phase", phase}, {"success", success}, {"description", description}}, [&] {
        write("step " + std::to_string(step) + " party " + std::to_string(party) + " phase " + std::to_string(phase),
              success, bundleID, description);
      });
}

void TransactionLogService::logScenario(std::string_view scenario, int step, bool success, std::string_view bundleID,
                                        std::string_view description) {
  _boundary.call(crossingOf({className, "logScenario"}, bundleID), nullptr,
                 {{"scenario", scenario}, {"step", step}, {"success", success}, {"description", description}}, [&] {
                   write("scenario \"" + std::string(scenario) + "\" step " + std::to_string(step), success, bundleID,
                         description);
                 });
}

}  // namespace device
