#pragma once

#include <map>
#include <set>
#include <string>
#include <vector>

#include "device/LocalDevice.h"
#include "platform/TSAsset.h"
#include "tsd/daemon/TodoList.h"
#include "tsd/daemon/TransferQueue.h"
#include "tsd/history/Outcome.h"
#include "tsd/history/Verdicts.h"

namespace tsd {

/// What is known at the end of a sync, before it is told. Everything outlives whoever looks at it.
struct SyncFacts {
  device::LocalDevice& device;
  const TransferQueue& queue;
  const Verdicts& verdicts;
  const std::vector<TodoEntry>& wanted;  // the todo list as the host gave it
  const std::vector<TodoEntry>& todo;    // as it is on the device's disk
  const std::set<std::string>& before;   // the apps that were on the device
  const std::vector<platform::TSAssetRef>& assets;
  const std::map<std::string, std::string>& reportedReasons;  // of installs that the daemon reported as failed
  std::string broken;                                         // why the sync ended early; empty if it did not
};

/// Says what became of each app that the host named or that was asked for: from what is on the device and its disk, and
/// from what the plug-in said. Used once.
class SyncOutcomes {
 public:
  explicit SyncOutcomes(const SyncFacts& facts);

  std::vector<AppOutcome> all() const;
  /// The apps that the host wanted removed and that are gone.
  std::vector<std::string> removed() const;

 private:
  struct Told {
    Outcome outcome;
    std::string reason;
  };

  Told told(const std::string& id) const;
  Told toldOfInstall(const std::string& id) const;
  Told toldOfMarked(const std::string& id, const std::string& mark) const;
  Told toldOfUnrequested(const std::string& id) const;
  Told toldOfTransferred(const std::string& id, const std::string& mark) const;
  Told toldOfRemoval(const std::string& id) const;
  Told toldOfOther(const std::string& id, const std::string& operation) const;
  bool isThere(const std::string& id) const;
  std::string markOf(const std::string& id) const;

  const SyncFacts& _facts;
  std::map<std::string, const TodoEntry*> _marks;  // an identifier's first entry, which is the one that is marked
  std::map<std::string, TodoWish> _wishes;
  std::set<std::string> _requested;
  std::map<std::string, std::uint64_t> _openInstalls;  // and whose they are
};

}  // namespace tsd
