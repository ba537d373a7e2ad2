#include "tsd/history/InstallEnd.h"

#include <string_view>

#include "tsd/terminal/Output.h"

namespace tsd {

InstallEnd endOf(const device::AppStatus& app) {
  using device::InstallOutcome;
  // The plug-in's cancellation reasons for an install, or a restore, that could not be prepared.
  constexpr std::string_view givenUp[] = {"TSError 1", "TSError 29"};
  std::string reason = reasonForPeople(app.lastReason);
  if (app.lastOutcome == InstallOutcome::installed) return {Outcome::installed, ""};
  if (app.lastOutcome == InstallOutcome::failed) return {Outcome::failed, reason};
  for (auto code : givenUp) {
    if (app.lastReason.substr(0, app.lastReason.find(':')) == code) return {Outcome::failed, reason};
  }
  return {Outcome::cancelled, reason};
}

}  // namespace tsd
