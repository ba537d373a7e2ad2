#include "device/records/CoordinatorRecord.h"

namespace device {

const char* nameOfKind(platform::RVCoordinatorKind kind) {
  using Kind = platform::RVCoordinatorKind;
  switch (kind) {
    case Kind::RVAppInstallCoordinator:
      return "RVAppInstallCoordinator";
    case Kind::RVInitiatingAppInstallCoordinator:
      return "RVInitiatingAppInstallCoordinator";
    case Kind::RVUpdatingAppInstallCoordinator:
      return "RVUpdatingAppInstallCoordinator";
    case Kind::RVRestoringAppInstallCoordinator:
      return "RVRestoringAppInstallCoordinator";
    case Kind::RVRestoringDemotedAppInstallCoordinator:
      return "RVRestoringDemotedAppInstallCoordinator";
  }
  return "";
}

}  // namespace device
