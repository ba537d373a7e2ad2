#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "tsd/CommonOptions.h"
#include "tsd/Console.h"

namespace tsd {

/// Shows on the console how far each app is. From any thread.
///
/// An app's percentage and phase never go back; it has 100 % only once its outcome is recorded and good.
class Progress {
 public:
  enum class Phase : std::uint8_t { waiting, placeholder, sending, installing, ended };

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
  struct Line {
    std::string id;
    std::string name;
    Phase phase = Phase::waiting;
    int percent = 0;
    int shownStep = 0;  // percent of the package, the last that was printed in plain mode
    std::string outcome;
    std::string reason;
  };
  using Instant = std::chrono::steady_clock::time_point;

  Line* find(const std::string& id);
  void enter(Line& line, Phase phase, int percent);
  void changed(const Line& line, const std::string& what, bool urgent);
  void draw();
  std::string drawn(const Line& line, std::size_t columns) const;
  std::string summary() const;

  Console& _console;
  const Goal _goal;
  const ProgressMode _mode;  // plain, tty or none
  std::mutex _mutex;
  // Guarded by _mutex.
  std::vector<Line> _lines;
  std::map<std::string, std::size_t, std::less<>> _places;
  std::string _headline;
  std::string _countingDown;  // in plain mode, the text of a countdown that has begun
  Instant _lastDrawn{};
};

}  // namespace tsd
