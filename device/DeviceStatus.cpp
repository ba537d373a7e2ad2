#include "device/DeviceStatus.h"

namespace device {

const char* nameOfState(AppState state) {
  switch (state) {
    case AppState::gone:
      return "";
    case AppState::placeholder:
      return "placeholder";
    case AppState::updating:
      return "updating";
    case AppState::installed:
      return "installed";
  }
  return "";
}

const char* nameOfOutcome(InstallOutcome outcome) {
  switch (outcome) {
    case InstallOutcome::none:
      return "";
    case InstallOutcome::installed:
      return "INSTALLED";
    case InstallOutcome::failed:
      return "FAILED";
    case InstallOutcome::cancelled:
      return "CANCELED";
  }
  return "";
}

std::optional<InstallOutcome> outcomeOfName(std::string_view name) {
  for (auto outcome :
       {InstallOutcome::none, InstallOutcome::installed, InstallOutcome::failed, InstallOutcome::cancelled}) {
    if (name == nameOfOutcome(outcome)) return outcome;
  }
  return std::nullopt;
}

const char* shortNameOfKind(platform::RVCoordinatorKind kind) {
  using Kind = platform::RVCoordinatorKind;
  switch (kind) {
    case Kind::RVAppInstallCoordinator:
      return "";
    case Kind::RVInitiatingAppInstallCoordinator:
      return "initiating";
    case Kind::RVUpdatingAppInstallCoordinator:
      return "updating";
    case Kind::RVRestoringAppInstallCoordinator:
      return "restoring";
    case Kind::RVRestoringDemotedAppInstallCoordinator:
      return "restoring-demoted";
  }
  return "";
}

}  // namespace device
