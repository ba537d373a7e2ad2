#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <string>
#include <thread>
#include <vector>

#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"
#include "tsd/CommonOptions.h"
#include "tsd/terminal/Console.h"
#include "tsd/terminal/ProgressDrawing.h"

namespace tsd {

/// Shows on the console how far each app is: on a terminal as bars that are redrawn in place, otherwise as a line for
/// each change. A thread of its own writes them, so that whoever reports a change never waits for the terminal; it
/// adapts the bars to the terminal's size and shows that the program is alive while nothing changes: on a terminal by
/// a moving sign, otherwise by a line now and then. From any thread.
///
/// An app's percentage and phase never go back; it has 100 % only once its outcome is recorded and good.
class Progress {
 public:
  using Phase = ProgressLine::Phase;

  /// What an app has to reach: with `placeholder` it has ended when its placeholder is shown.
  enum class Goal : std::uint8_t { installed, placeholder };

  /// Throws a `CommandError` when the system has no thread left.
  Progress(Console& console, ProgressMode mode, Goal goal = Goal::installed);
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  /// The app appears; its name may be empty.
  void add(const std::string& id, const std::string& name);
  void placeholderShown(const std::string& id);
  /// `fraction` of the package has been sent, from 0 to 1.
  void sending(const std::string& id, double fraction);
  void installing(const std::string& id);
  /// The outcome in a word for people, with a reason if there is one.
  void ended(const std::string& id, const std::string& outcome, const std::string& reason, bool good);
  /// A separate line about the whole, above the apps; on a terminal the next one replaces it, and an empty one removes
  /// it.
  void headline(const std::string& text);
  /// A headline with the seconds that are left.
  void countdown(const std::string& text, long long seconds);
  /// When it returns everything reported is on the console, and nothing is redrawn in place any more.
  void finish();

 private:
  using Instant = std::chrono::steady_clock::time_point;

  ProgressLine* find(const std::string& id) REQUIRES(_mutex);
  static void enter(ProgressLine& line, Phase phase, int percent);
  void end(ProgressLine& line, const std::string& outcome, const std::string& reason, bool good) REQUIRES(_mutex);
  void changed(const ProgressLine& line, const std::string& what, bool urgent) REQUIRES(_mutex);
  void print(const std::string& text) REQUIRES(_mutex);
  void live() EXCLUDES(_mutex);
  void beat() EXCLUDES(_mutex);
  void beatInPlainMode() REQUIRES(_mutex);
  /// The lines that the console should now show in place.
  std::vector<TerminalLine> drawing() REQUIRES(_mutex);

  Console& _console;
  const Goal _goal;
  const ProgressMode _mode;  // plain, tty or none
  const bool _colours;
  platform::Mutex _mutex;
  platform::Condition _changed;
  std::vector<ProgressLine> _lines GUARDED_BY(_mutex);
  std::map<std::string, std::size_t, std::less<>> _places GUARDED_BY(_mutex);
  std::string _headline GUARDED_BY(_mutex);
  std::string _countingDown GUARDED_BY(_mutex);         // in plain mode, the text of a countdown that has begun
  int _percent GUARDED_BY(_mutex) = 0;                  // of all apps together
  std::size_t _endings GUARDED_BY(_mutex) = 0;          // apps that have ended
  std::vector<std::string> _unsaid GUARDED_BY(_mutex);  // lines of the plain mode, for the heart to write
  bool _mustDraw GUARDED_BY(_mutex) = false;            // at once
  bool _writing GUARDED_BY(_mutex) = false;             // the heart is writing to the console
  Instant _lastDrawn GUARDED_BY(_mutex){};
  Instant _lastChange GUARDED_BY(_mutex){};   // of anything
  Instant _lastPrinted GUARDED_BY(_mutex){};  // line in plain mode
  std::size_t _beats GUARDED_BY(_mutex) = 0;  // in place of the moving sign
  bool _over GUARDED_BY(_mutex) = false;
  std::thread _heart;
};

}  // namespace tsd
