#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "platform/Platform.h"
#include "platform/Value.h"

/// A suite of tests of what the headers in platform/ promise, for whoever implements them. It looks at the interfaces
/// alone and knows no implementation; `hosts()` gives it yours.
namespace contract {

/// One device for one test: its services, and what a test cannot do through them.
class Host {
 public:
  virtual ~Host() = default;

  /// The same as long as the host lives.
  virtual const platform::Platform& platform() = 0;

  /// Returns when everything that was caused by calls so far has been delivered to observers and completion handlers.
  /// Called from any thread, never from a callback.
  virtual void deliver() = 0;

  /// The content of a package from which the install service installs that version of the app.
  virtual platform::Bytes packageOf(const std::string& app, const std::string& version) = 0;

  /// Absolute paths of directories that the suite makes, fills and removes: one for anything, one that the install
  /// service takes packages from.
  virtual std::string scratchDirectory() { return "/var/mobile/Media/ContractScratch"; }
  virtual std::string packageDirectory() { return "/var/mobile/Media/PublicStaging/Packages"; }
};

/// A sort of host. `make` answers one without apps, without coordinators and with nothing in its directories.
struct NamedHost {
  std::string name;  // letters and digits
  std::function<std::unique_ptr<Host>()> make;
};

/// Defined by the program that runs the suite: every test runs on each of these. Called once the program runs.
std::vector<NamedHost> hosts();

}  // namespace contract
