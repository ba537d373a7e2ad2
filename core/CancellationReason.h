#pragma once

#include <cstdint>

#include "platform/Error.h"

namespace appsync {

/// Why the plug-in cancels something of the install-coordination service: errors of the daemon's domain.
enum class CancellationCode : std::int64_t {
  installPreparationFailed = 1,
  restorePreparationFailed = 29,
  packageUnavailable = 30,  // a promise could not be attached, or the package never arrived
};

inline platform::ErrorRef cancellationReason(CancellationCode code) {
  return platform::makeError("TSError", static_cast<std::int64_t>(code));
}

}  // namespace appsync
