#pragma once

#include <optional>
#include <string>

#include "platform/Value.h"

namespace platform {

/// A store account under which apps on the device were obtained.
class TSMutableAccountInfo {
 public:
  virtual ~TSMutableAccountInfo() = default;

  virtual void setVantorID(std::optional<std::string> identifier) = 0;
  /// A number (integer or real value), or absent.
  virtual void setDSID(Value number) = 0;
  virtual void setAltDSID(std::optional<std::string> identifier) = 0;

  /// One line for the log.
  virtual std::string describe() const = 0;
};

}  // namespace platform
