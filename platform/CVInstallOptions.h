#pragma once

#include <cstdint>
#include <memory>
#include <string>

namespace platform {

/// Store metadata of an app, as the installer keeps it. Immutable; made by the installer service.
class CVStoreMetadata {
 public:
  virtual ~CVStoreMetadata() = default;
  virtual std::string describe() const = 0;
};

/// How an app is to be installed. Touched by its maker only, until it is handed to a coordinator.
class CVInstallOptions {
 public:
  virtual ~CVInstallOptions() = default;

  /// Null: the app has no store metadata.
  virtual void setHarluneMetadata(std::shared_ptr<CVStoreMetadata> metadata) = 0;
  /// An install type of the application registry.
  virtual void setObInstallType(std::uint64_t type) = 0;
  virtual void setInstallTargetType(std::uint64_t type) = 0;

  virtual std::string describe() const = 0;
};

}  // namespace platform
