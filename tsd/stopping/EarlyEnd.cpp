#include "tsd/stopping/EarlyEnd.h"

#include "device/boundary/Boundary.h"

namespace tsd {

EarlyEnd::Operation::Operation(EarlyEnd* earlyEnd) : _earlyEnd(earlyEnd) {
  if (_earlyEnd) _earlyEnd->_inside = std::this_thread::get_id();
}

EarlyEnd::Operation::~Operation() {
  if (_earlyEnd) _earlyEnd->_inside = std::thread::id();
}

platform::ErrorRef EarlyEnd::declines(std::string_view service, std::string_view operation) const {
  if (!_stop.requested() || _inside.load() != std::this_thread::get_id()) return nullptr;
  // Without the todo list there is no app to remove and no entry to mark, so that what was not reached stays as the
  // host gave it.
  bool begins = service == "IconRenderer" || operation == "coordinatorForAppWithBundleID" ||
                operation == "uninstallAppWithBundleID" || (service == "FileSystem" && operation == "readFile");
  return begins ? device::Boundary::declinedError("a stop was asked for") : nullptr;
}

}  // namespace tsd
