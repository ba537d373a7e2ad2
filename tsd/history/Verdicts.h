#pragma once

#include <map>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "platform/Mutex.h"
#include "tsd/history/AppStory.h"
#include "tsd/history/Outcome.h"

namespace tsd {

/// What the plug-in said of each app while it worked, from the records of the journal. A plan and a sync ask here, so
/// that both give the same reasons. Heard under the journal's lock, asked from any thread.
class Verdicts {
 public:
  struct Verdict {
    std::optional<AppEvent> last;       // that settles its install
    std::optional<AppEvent> removal;    // how its removal ended, which may be told before or after the former
    std::optional<AppEvent> exception;  // the rule that it passed though it might have been stopped
    std::optional<AppEvent> pathRefused;
    std::optional<AppEvent> markFailed;
    bool updates = false;
    bool isAwaited = false;  // by a restore, still

    /// Why it is not installed. That it was removed first is no answer to that.
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
  /// Why no app is removed; empty: they are.
  std::string removalsRestricted() const;
  /// Why the restore did nothing; nothing when it did.
  std::optional<AppEvent> restoreDeclined() const;
  /// The transfers that came to a bad end since this was last asked.
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
  std::set<std::string, std::less<>> _declined GUARDED_BY(_mutex);  // the device did not begin with them any more
};

/// The outcome that an app has by such an event, when that settles it.
std::optional<Outcome> outcomeOf(AppEvent::Kind kind);

}  // namespace tsd
