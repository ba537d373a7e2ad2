#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/Error.h"
#include "platform/RVClient.h"

namespace platform {

/// A piece of an install that its maker will deliver. Shared by its maker and whatever it is attached to.
/// Callable from any thread.
class RVPromise {
 public:
  virtual ~RVPromise() = default;

  /// A fraction from 0 to 1.
  virtual void setPercentComplete(double fraction) = 0;
  /// True delivers the piece: what it is attached to goes on with it.
  virtual void setComplete(bool complete) = 0;
  virtual bool isComplete() = 0;
  virtual bool cancelForReason(const ErrorRef& reason, RVClientIdentifier client, ErrorRef* error = nullptr) = 0;

  virtual std::string describe() const = 0;
};

/// A file that will appear at a path.
class RVPromisedTransferToPath : public RVPromise {
 public:
  /// Path of a file URL.
  virtual void setTransferPath(std::string_view path) = 0;
};

/// Data that reaches the service by some other way.
class RVPromisedOutOfBandTransfer : public RVPromise {};

}  // namespace platform
