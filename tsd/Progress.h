#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "tsd/CommonOptions.h"
#include "tsd/Console.h"
#include "tsd/ProgressDrawing.h"

namespace tsd {

/// Shows on the console how far each app is: on a terminal as bars that are redrawn in place, otherwise as a line for
/// each change. A thread of its own keeps the bars in the terminal's size and shows that the program is alive while
/// nothing changes: on a terminal with a moving sign, otherwise with a line now and then. From any thread.
///
/// An app's percentage and phase never go back; it has 100 % only once its outcome is recorded and good.
class Progress {
 public:
  using Phase = ProgressLine::Phase;

  /// What an app is to reach: with `placeholder` it has ended when its placeholder is shown.
  enum class Goal : std::uint8_t { installed, placeholder };

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
  /// The outcome in one word for people, with a reason where there is one.
  void ended(const std::string& id, const std::string& outcome, const std::string& reason, bool good);
  /// A line of its own about the whole, above the apps; on a terminal replaced by the next one, empty to take it away.
  void headline(const std::string& text);
  /// A headline with the seconds that are left.
  void countdown(const std::string& text, long long seconds);
  /// Takes what is redrawn in place from the console.
  void finish();

 private:
  using Instant = std::chrono::steady_clock::time_point;

  ProgressLine* find(const std::string& id);
  void enter(ProgressLine& line, Phase phase, int percent);
  void end(ProgressLine& line, const std::string& outcome, const std::string& reason, bool good);
  void changed(const ProgressLine& line, const std::string& what, bool urgent);
  void print(const std::string& text);
  void draw();
  void beat();
  void beatInPlainMode();

  Console& _console;
  const Goal _goal;
  const ProgressMode _mode;  // plain, tty or none
  const bool _colours;
  std::mutex _mutex;
  std::condition_variable _changed;
  // Guarded by _mutex.
  std::vector<ProgressLine> _lines;
  std::map<std::string, std::size_t, std::less<>> _places;
  std::string _headline;
  std::string _countingDown;  // in plain mode, the text of a countdown that has begun
  int _percent = 0;           // of all apps together
  std::size_t _endings = 0;   // apps that have ended
  Instant _lastDrawn{};
  Instant _lastChange{};   // of anything
  Instant _lastPrinted{};  // line in plain mode
  std::size_t _beats = 0;  // in place of the moving sign
  bool _over = false;
  std::thread _heart;
};

}  // namespace tsd
