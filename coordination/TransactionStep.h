#pragma once

#include <string_view>

#include "platform/InstallTransactionLog.h"

namespace appsync {

/// The steps that the plug-in records in the install transaction log.
enum class TransactionStep : int {
  install = 1,
  restore = 2,
  createCoordinator = 3,
  createPlaceholder = 4,
  copyIcon = 5,
  uninstall = 7,
};

inline void beginStep(platform::InstallTransactionLog& log, TransactionStep step, std::string_view bundleIdentifier,
                      std::string_view description) {
  log.logStep(static_cast<int>(step), 1, 1, true, bundleIdentifier, description);
}

inline void endStep(platform::InstallTransactionLog& log, TransactionStep step, bool success,
                    std::string_view bundleIdentifier, std::string_view description) {
  log.logStep(static_cast<int>(step), 1, 2, success, bundleIdentifier, description);
}

}  // namespace appsync
