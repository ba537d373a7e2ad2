#pragma once

#include <cstddef>
#include <map>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "device/boundary/Boundary.h"

namespace tests {

/// What holds whatever fails, seen in what crosses between a device and one plug-in object:
///
/// - nothing is thrown: no call into the plug-in was stopped by an exception, each has returned;
/// - a cancellation is by client 3, and its reason is that of the call it is made in;
/// - in a sync a coordinator is only cancelled when the service has just named client 3 as its creator, but for the end
///   of a phase, which cancels whatever waits for a package that will not come;
/// - an app that is asked for has a placeholder promise; one that is not leaves no coordinator of client 3 uncancelled;
/// - a mark is one that the call may set, and on the entry of the app that the call is about;
/// - the count of awaited placeholders is right in every message, nothing is awaited twice or let go twice, the wait is
///   five seconds for each, and what was still awaited when the object went is in its last message;
/// - every step of the install transaction log that began has ended, but for removals, which end later.
///
/// What does not hold becomes a failure of the test.
class Invariants {
 public:
  /// The records of one sync or restore, or of the object's end; everything has been delivered.
  void look(const std::vector<device::CallRecord>& records);
  /// After the object's last records: the next one begins.
  void objectIsGone();

 private:
  struct AppFacts {
    bool own = false;
    bool cancelled = false;
    bool promised = false;
  };
  struct Entry {
    std::string operation;  // empty: none
    std::string app;
    std::map<std::string, AppFacts> apps;
  };

  void enter(Entry& entry, const device::CallRecord& record);
  void readCall(Entry& entry, const device::CallRecord& record);
  void readCancellation(Entry& entry, const device::CallRecord& record);
  void readMessage(Entry& entry, std::string_view text);
  void readAwaited(std::string_view text);

  std::map<std::string, Entry> _entries;  // by thread
  std::map<std::string, int> _steps;      // begun and not ended
  std::set<std::string> _awaited;
};

}  // namespace tests
