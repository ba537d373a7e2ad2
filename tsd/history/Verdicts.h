#pragma once

#include <atomic>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"
#include "tsd/history/AppStory.h"
#include "tsd/history/Outcome.h"

namespace tsd {

/// What the plug-in said of each app while it worked, from the records of the journal. A plan and a sync both ask here,
/// so that they give the same reasons. `hear` runs under the journal's lock; questions come from any thread.
class Verdicts {
 public:
  /// Shared and mostly null, as there is a verdict for each of many apps.
  using EventRef = std::shared_ptr<const AppEvent>;
  struct Verdict {
    EventRef last;       // what settles its install
    EventRef removal;    // how its removal ended; may be heard before or after the end of its install
    EventRef exception;  // the rule that it passed although it could have been stopped
    EventRef pathRefused;
    EventRef markFailed;
    bool updates = false;
    bool isAwaited = false;  // by a restore, even now

    /// Why it is not installed. That it was removed first does not answer that.
    const EventRef& ofInstall() const {
      return !last && removal && removal->kind == AppEvent::Kind::removalFailed ? removal : last;
    }
  };
  struct Ending {
    std::string app;
    Outcome outcome;
    std::string reason;
  };

  Verdicts();

  void hear(const device::CallRecord& record);
  /// Forgets everything, for the next run.
  void restart();

  /// How many records it has heard in all.
  std::uint64_t heard() const { return _count; }
  Verdict of(const std::string& app) const;
  /// Why no app is removed; empty: apps are removed.
  std::string removalsRestricted() const;
  /// Why the restore did nothing; nothing if it did something.
  std::optional<AppEvent> restoreDeclined() const;
  /// The transfers that have failed since this was last asked.
  std::vector<Ending> takeEndings();

 private:
  void take(const AppEvent& event) REQUIRES(_mutex);

  std::vector<AppEvent> _heard;  // of one record; as the story, guarded by the journal's lock
  AppStory _story;
  std::atomic<std::uint64_t> _count = 0;

  mutable platform::Mutex _mutex;
  std::map<std::string, Verdict, std::less<>> _verdicts GUARDED_BY(_mutex);
  std::string _removalsRestricted GUARDED_BY(_mutex);
  std::optional<AppEvent> _restoreDeclined GUARDED_BY(_mutex);
  std::vector<Ending> _endings GUARDED_BY(_mutex);
  std::set<std::string, std::less<>> _declined GUARDED_BY(_mutex);  // the device declined to begin with them
};

/// The outcome that such an event settles, if any.
std::optional<Outcome> outcomeOf(AppEvent::Kind kind);

}  // namespace tsd
