#pragma once

#include <cstdint>
#include <string>

#include "platform/Error.h"

namespace device {

/// Reasons of the install-coordination service; the errors' domain is "InstallCoordination".
enum class CoordinationError : std::int64_t {
  invalid = 1,        // an argument that cannot be used
  otherKind = 2,      // the app's coordinator is of another kind than asked for
  ended = 3,          // the coordinator, promise or placeholder has ended
  alreadySet = 4,     // it already has that piece
  notSet = 5,         // it has no such piece
  noSuchApp = 6,      // neither an app nor a placeholder
  notDelivered = 7,   // a promise is complete and there is nothing at its path
  installFailed = 8,  // the underlying error says why
};

inline platform::ErrorRef coordinationError(CoordinationError code, std::string description,
                                            platform::ErrorRef underlying = nullptr) {
  return platform::makeError("InstallCoordination", static_cast<std::int64_t>(code), std::move(description),
                             std::move(underlying));
}

inline platform::ErrorRef endedError(const std::string& app) {
  return coordinationError(CoordinationError::ended, "the coordinator of " + app + " has ended");
}

}  // namespace device
