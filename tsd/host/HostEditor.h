#pragma once

#include <string>
#include <vector>

#include "tsd/host/HostPackage.h"
#include "tsd/host/RestoreLists.h"

namespace tsd {

struct HostAddition {
  bool restores = false;  // the restore list gets the apps too
  Demotion demotion;      // how they stand in the demoted-apps list
  bool replaces = false;  // what the host has of them goes
};

/// Makes a host's folder with an empty todo list. Throws a `CommandError` when there is something already.
void makeHost(const std::string& host);

/// Puts apps into a host: the package, the app's folder, the lists. A source is a package, or a folder that one is made
/// of. Throws a `CommandError` that names the file when one of them is no app, or the host has it already; then the
/// host is as it was. The todo list is written last: what a kill leaves before is in nobody's way.
std::vector<HostPackage> addToHost(const std::string& host, const std::vector<std::string>& sources,
                                   const HostAddition& addition);

/// Takes apps out of a host: out of its lists first, then their files. With `uninstall` an entry stays which has the
/// device remove the app. Throws a `CommandError` when the host has nothing of one; then it is as it was.
void removeFromHost(const std::string& host, const std::vector<std::string>& apps, bool uninstall);

}  // namespace tsd
