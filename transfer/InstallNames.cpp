#include "transfer/InstallNames.h"

#include <cstddef>

namespace appsync {

template <std::size_t N>
static std::string nameIn(const char* const (&names)[N], const char* unknown, std::uint64_t number) {
  return number < N ? names[number] : unknown + std::to_string(number);
}

std::string nameOfInstallType(std::uint64_t type) {
  static const char* const names[] = {
      "OBInstallTypeNone", "OBInstallTypeStoreDownload",   "OBInstallTypeRestore",   "OBInstallTypeAutomaticDownload",
      "OBInstallTypeSync", "OBInstallTypeAutomaticUpdate", "OBInstallTypeMigration", "OBInstallTypeDowngrade"};
  return nameIn(names, "Unknown Install Type: ", type);
}

std::string nameOfInstallState(std::uint64_t state) {
  static const char* const names[] = {"OBInstallStateWaiting",  "OBInstallStateActive", "OBInstallStatePaused",
                                      "OBInstallStateCanceled", "OBInstallStateFailed", "OBInstallStateFinished"};
  return nameIn(names, "Unknown Install State: ", state);
}

std::string nameOfInstallPhase(std::uint64_t phase) {
  static const char* const names[] = {"OBInstallPhaseLoading", "OBInstallPhaseInstalling",
                                      "OBInstallPhaseRestoringData", "OBInstallPhaseInstallingPlaceholder"};
  return nameIn(names, "Unknown Install Phase: ", phase);
}

}  // namespace appsync
