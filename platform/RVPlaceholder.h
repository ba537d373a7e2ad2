#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/CVInstallOptions.h"
#include "platform/Error.h"
#include "platform/RVClient.h"
#include "platform/RVPromise.h"
#include "platform/Value.h"

namespace platform {

/// What a placeholder tells about its app. Touched by its maker only, until it is handed over.
class RVPlaceholderAttributes {
 public:
  virtual ~RVPlaceholderAttributes() = default;

  /// Absent: the version is not known.
  virtual void setBundleVersion(std::optional<std::string> version) = 0;
  virtual void setLaunchProhibited(bool prohibited) = 0;

  virtual std::string describe() const = 0;
};

/// An app shown before its package is there. Configured piece by piece, closed, then attached to a coordinator;
/// shared by its maker and the coordinator. Callable from any thread.
class RVPlaceholder {
 public:
  virtual ~RVPlaceholder() = default;

  virtual bool setIconPromise(const std::shared_ptr<RVPromisedTransferToPath>& promise, ErrorRef* error = nullptr) = 0;
  /// Null: the placeholder has no store metadata.
  virtual bool setMetadata(const std::shared_ptr<CVStoreMetadata>& metadata, ErrorRef* error = nullptr) = 0;
  virtual bool setPlaceholderAttributes(const std::shared_ptr<RVPlaceholderAttributes>& attributes,
                                        ErrorRef* error = nullptr) = 0;
  /// The store's rights data of the app, opaque bytes.
  virtual bool setSinfData(BytesView data, ErrorRef* error = nullptr) = 0;
  /// Nothing can be changed afterwards.
  virtual bool setConfigurationCompleteWithError(ErrorRef* error = nullptr) = 0;
  virtual bool cancelForReason(const ErrorRef& reason, RVClientIdentifier client, ErrorRef* error = nullptr) = 0;

  virtual std::string describe() const = 0;
};

}  // namespace platform
