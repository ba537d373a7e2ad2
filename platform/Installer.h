#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/CVInstallOptions.h"
#include "platform/Value.h"

namespace platform {

/// The installer service. Callable from any thread.
class Installer {
 public:
  virtual ~Installer() = default;

  /// The apps uninstalled since the list was last cleared: a dictionary keyed by bundle identifier; absent when the
  /// installer cannot tell.
  virtual Value CorvaneLookupUninstalled() = 0;
  /// Forgets those entries. 0 on success.
  virtual int CorvaneClearUninstalled(const std::vector<std::string>& bundleIdentifiers) = 0;

  /// Takes a dictionary. Null when given none.
  virtual std::shared_ptr<CVStoreMetadata> makeStoreMetadata(const Value& dictionary) = 0;
  virtual std::shared_ptr<CVInstallOptions> makeInstallOptions() = 0;
};

}  // namespace platform
