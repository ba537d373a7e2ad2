#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

namespace platform {

/// State and phase of a running install; the numbers' names are in the registry's own tables.
struct OBInstallProgress {
  std::uint64_t installState = 0;
  std::uint64_t installPhase = 0;
};

struct OBApplicationState {
  bool isInstalled = false;
  bool isPlaceholder = false;
};

struct OBDiskUsage {
  std::uint64_t staticUsage = 0;  // bytes
};

/// The registry's view of one bundle: an immutable snapshot, shared between threads.
struct OBBundleProxy {
  virtual ~OBBundleProxy() = default;

  std::optional<std::string> bundleIdentifier;
  std::optional<std::string> bundleVersion;
  std::optional<std::string> bundleURL;           // path of the bundle's directory
  std::optional<std::string> bundleContainerURL;  // path of the container around it
};

/// The registry's view of one app. Numbers are the registry's own; some of them may have no name.
struct OBApplicationProxy final : OBBundleProxy {
  std::optional<std::string> applicationIdentifier;
  std::optional<std::string> applicationType;  // "User", "System", …
  bool isInstalled = false;
  bool isPlaceholder = false;
  OBApplicationState appState;
  std::uint64_t installType = 0;
  std::optional<OBInstallProgress> installProgressSync;  // nothing when no install runs
  OBDiskUsage diskUsage;

  /// One line for the log.
  std::string describe() const {
    return "<OBApplicationProxy " + applicationIdentifier.value_or("(null)") + (isPlaceholder ? " placeholder>" : ">");
  }
};

using OBBundleProxyRef = std::shared_ptr<const OBBundleProxy>;
using OBApplicationProxyRef = std::shared_ptr<const OBApplicationProxy>;

}  // namespace platform
