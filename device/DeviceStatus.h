#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/InstallCoordination.h"
#include "platform/OBNumbers.h"
#include "platform/SystemLog.h"

namespace device {

/// One message of the system log as it was written.
struct LogRecord {
  platform::LogLevel level;
  std::string category;  // "8", "15", "0"; the category's name for handles of a subsystem
  std::string message;
};

/// What an install that the store runs looks like from outside. Every fact can be set, also to numbers that have no
/// name.
struct StoreInstall {
  std::uint64_t installType = platform::installType::storeDownload;
  std::uint64_t installState = platform::installState::active;
  std::uint64_t installPhase = platform::installPhase::loading;
  bool paused = false;
  bool hasProgress = true;
  bool createsCoordinator = true;
  bool systemBundle = false;
  std::string applicationType = "User";
};

/// How an app stands on the device: `gone` when only its last outcome is left of it.
enum class AppState : std::uint8_t { gone, placeholder, updating, installed };
/// How an app's last install ended.
enum class InstallOutcome : std::uint8_t { none, installed, failed, cancelled };

/// "placeholder", "updating", "installed"; empty for one that is gone.
const char* nameOfState(AppState state);
/// "INSTALLED", "FAILED", "CANCELED"; empty for `none`.
const char* nameOfOutcome(InstallOutcome outcome);
std::optional<InstallOutcome> outcomeOfName(std::string_view name);
/// "initiating", "updating", "restoring", "restoring-demoted"; empty for the base kind.
const char* shortNameOfKind(platform::RVCoordinatorKind kind);

/// One app as the device shows it.
struct AppStatus {
  std::string id;
  std::string name;
  std::string version;  // empty when not known
  AppState state = AppState::gone;
  std::uint64_t installType = 0;
  std::string type;     // "User" or "System"
  double progress = 0;  // 0…1 of a running install
  InstallOutcome lastOutcome = InstallOutcome::none;
  std::string lastReason;  // text of the failure, if any

  bool isOnDevice() const { return state != AppState::gone; }
  bool operator==(const AppStatus&) const = default;
};
struct CoordinatorStatus {
  std::string app;
  platform::RVCoordinatorKind kind = platform::RVCoordinatorKind::RVInitiatingAppInstallCoordinator;
  std::uint64_t client = 0;
  bool hasPlaceholder = false;
  bool promisesPackage = false;     // somebody is to deliver the package
  std::uint64_t packageClient = 0;  // who, if not the coordinator's own client; otherwise 0
  double fraction = 0;              // of the package that has come

  bool operator==(const CoordinatorStatus&) const = default;
};
/// The canonical state of a device: the same for two devices that differ only in container names.
struct DeviceStatus {
  std::vector<AppStatus> apps;                  // sorted by id; with those of which only an outcome is left
  std::vector<CoordinatorStatus> coordinators;  // sorted by app
  std::vector<std::string> home;                // flattened, in order
  /// The home screen's pages as the host set them, one for a layout without pages. Apps that it does not name stand
  /// in `home` alone.
  std::vector<std::vector<std::string>> pages;
  std::uint64_t syncing = 0;  // state of the home screen's sync notification

  bool operator==(const DeviceStatus&) const = default;
};

}  // namespace device
