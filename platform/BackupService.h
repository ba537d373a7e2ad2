#pragma once

#include <memory>

#include "platform/Error.h"

namespace platform {

/// The backup service's manager.
class CLManager {
 public:
  virtual ~CLManager() = default;
  /// Whether apps of a restored backup need placeholders. False may come with an error or without.
  virtual bool tessaroShouldCreateAppPlaceholdersWithError(ErrorRef* error = nullptr) = 0;
};

/// The backup service. Callable from any thread.
class BackupService {
 public:
  virtual ~BackupService() = default;
  /// A new manager; null when none can be made.
  virtual std::shared_ptr<CLManager> makeBackupManager() = 0;
};

}  // namespace platform
