#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/boundary/Boundary.h"

namespace tsd {

/// Something that happened to one app.
struct AppEvent {
  enum class Kind : std::uint8_t {
    goneUntold,          // it is not on the device; the host is not told, as the app is about to be installed
    deleted,             // it was removed on the device, which the host is told
    removing,            // the host wants it removed
    removed,             // … and it is
    removalFailed,       // … and it is not
    considered,          // its turn in the order in which packages are asked for
    refused,             // its identifier, or its entry of the restore list
    pathRefused,         // the path of its package
    skipped,             // `text` is the rule, `fact` what the rule saw
    notAllowed,          // installing apps is restricted
    chosen,              // it passes a rule that could have stopped it
    updates,             // it is already installed
    preparing,           // its install is being prepared
    prepared,            // … and is: its package is asked for
    preparationFailed,   // … and is not
    attached,            // its placeholder is handed to the device
    shown,               // … and is on the home screen
    transferring,        // its package is on the way
    arrived,             // … and has arrived
    transferFailed,      // … or has not
    installing,          // the device has all it needs
    installed,           // the end of an install
    failed,              // the install failed
    cancelled,           // the install was cancelled: `text` says by whom, `fact` why
    prioritized,         // the person wants it first
    reported,            // the daemon's own report of an install
    marked,              // its entry of the todo list was changed, and is on disk
    markFailed,          // … and is not
    restoring,           // its restore is being prepared
    restored,            // … and is: its placeholder is handed to the device
    restoreFailed,       // … and is not
    leftToStore,         // the store is to deliver its package
    awaited,             // the restore waits for its placeholder
    awaitEnded,          // … and does not any more
    removalsRestricted,  // no app is removed, whatever the host wants; concerns no single app
    restoreDeclined      // the backup service wants no placeholders; concerns no single app
  };

  Kind kind;
  std::string app;
  std::chrono::microseconds time{};  // since the device was opened
  std::string text;                  // for people, without the app's name
  std::string fact;                  // what else is known; may be empty

  /// "removing: the fact" in one line.
  std::string line() const { return fact.empty() ? text : text + ": " + fact; }
};
/// "deleted", "preparationFailed", …
const char* nameOfKind(AppEvent::Kind kind);

/// What happened to apps, from the records of a run's journal, given in their order. Everything that turns records into
/// events is here: the calls into the plug-in, and the plug-in's messages about what it does.
class AppStory {
 public:
  using Listener = std::function<void(const AppEvent& event)>;

  explicit AppStory(Listener listener) : _listener(std::move(listener)) {}

  /// Answers whether the record told of an app.
  bool hear(const device::CallRecord& record);
  /// How far the app's package has come; nothing if it is not on the way.
  std::optional<double> fractionOf(const std::string& app) const;

 private:
  using Kind = AppEvent::Kind;

  void tell(Kind kind, std::string_view app, std::string text, std::string fact = {});
  void hearCall(const device::CallRecord& record);
  void hearMessage(std::string_view text);
  void hearInProgress(std::string_view list);
  void hearWrite(const device::CallRecord& record);
  std::string takeFact(std::string_view app);

  Listener _listener;
  std::chrono::microseconds _now{};
  bool _told = false;
  std::map<std::string, std::string> _called;              // by thread: the app whose package's end is being reported
  std::map<std::string, std::string, std::less<>> _facts;  // by app: what was seen before the rule that uses it
  std::map<std::string, double> _fractions;                // by app: of the package on its way
  struct Mark {
    std::string app;
    std::string word;
  };
  std::map<std::string, Mark> _marks;  // by thread: what is about to be written into the todo list
  std::string _thread;
};

/// "the store", "the sync", "client 7"; 0 is the person.
std::string nameOfClient(std::uint64_t client);

}  // namespace tsd
