#pragma once

#include <cstdint>
#include <string>
#include <utility>

#include "platform/Error.h"

namespace device {

/// Codes of the errors of the device as a whole; their domain is "LocalDevice".
enum class LocalDeviceError : std::int64_t {
  failed = 1,
  notADevice = 2,      // what is there is not a device, or is damaged: a record in it cannot be understood
  notEmpty = 3,        // a new device was to be made where something else is
  unknownSetting = 4,  // no such key, or no such value of the key
  noSuchApp = 5,
  busyApp = 6,  // another install of the app is running
};
inline platform::ErrorRef localDeviceError(LocalDeviceError code, std::string description,
                                           platform::ErrorRef underlying = nullptr) {
  return platform::makeError("LocalDevice", static_cast<std::int64_t>(code), std::move(description),
                             std::move(underlying));
}

/// For `return fail(error, …)`.
inline bool fail(platform::ErrorRef* out, platform::ErrorRef error) {
  platform::setError(out, std::move(error));
  return false;
}

}  // namespace device
