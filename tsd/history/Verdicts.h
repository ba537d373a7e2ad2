#pragma once

#include <map>
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
  struct Verdict {
    std::optional<AppEvent> last;       // what settles its install
    std::optional<AppEvent> removal;    // how its removal ended; may be heard before or after the end of its install
    std::optional<AppEvent> exception;  // the rule that it passed although it could have been stopped
    std::optional<AppEvent> pathRefused;
    std::optional<AppEvent> markFailed;
    bool updates = false;
    bool isAwaited = false;  // by a restore, even now

    /// Why it is not installed. That it was removed first does not answer that.
    const std::optional<AppEvent>& ofInstall() const {
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
