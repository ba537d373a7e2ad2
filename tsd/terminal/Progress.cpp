#include "tsd/terminal/Progress.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <new>
#include <utility>

#include "tsd/StartThread.h"

namespace tsd {

using Lock = platform::Mutex::Lock;

namespace {

constexpr int percentPlaceholder = 2;
constexpr int percentSent = 90;
constexpr int percentInstalling = 95;
constexpr int plainStep = 25;
constexpr auto redrawInterval = std::chrono::milliseconds(60);

// While nothing changes.
constexpr auto signInterval = std::chrono::milliseconds(125);
constexpr auto plainInterval = std::chrono::seconds(10);
constexpr auto quietUntilTold = std::chrono::seconds(5);
constexpr const char* movingSigns[] = {"⠋", "⠙", "⠹", "⠸", "⠼", "⠴", "⠦", "⠧", "⠇", "⠏"};

std::string secondsText(std::chrono::steady_clock::duration time) {
  return std::to_string(std::chrono::duration_cast<std::chrono::seconds>(time).count()) + " s";
}

}  // namespace

Progress::Progress(Console& console, ProgressMode mode, Goal goal)
    : _console(console),
      _goal(goal),
      _mode(mode != ProgressMode::automatic ? mode
            : Console::isTerminal()         ? ProgressMode::tty
                                            : ProgressMode::plain),
      _colours(Console::wantsColours()) {
  if (_mode != ProgressMode::none) _heart = startThread([this] { live(); });
}

Progress::~Progress() {
  finish();
  {
    Lock lock(_mutex);
    _over = true;
    _changed.notifyAll();
  }
  if (_heart.joinable()) _heart.join();
}

void Progress::add(const std::string& id, const std::string& name) {
  Lock lock(_mutex);
  if (ProgressLine* line = find(id)) {
    if (!name.empty()) line->name = name;
    return;
  }
  _places.emplace(id, _lines.size());
  ProgressLine line;
  line.id = id;
  line.name = name.empty() ? id : name;
  _lines.push_back(std::move(line));
}

void Progress::placeholderShown(const std::string& id) {
  Lock lock(_mutex);
  ProgressLine* line = find(id);
  if (!line || line->phase >= Phase::placeholder) return;
  constexpr const char* shown = "placeholder on the home screen";
  if (_goal == Goal::placeholder) return end(*line, shown, "", true);
  enter(*line, Phase::placeholder, percentPlaceholder);
  changed(*line, shown, false);
}

void Progress::sending(const std::string& id, double fraction) {
  Lock lock(_mutex);
  ProgressLine* line = find(id);
  if (!line || line->phase > Phase::sending) return;
  double bounded = std::isfinite(fraction) ? std::clamp(fraction, 0.0, 1.0) : 0.0;
  int percent = percentPlaceholder + static_cast<int>(bounded * (percentSent - percentPlaceholder));
  enter(*line, Phase::sending, percent);
  int step = static_cast<int>(bounded * 100) / plainStep * plainStep;
  _lastChange = std::chrono::steady_clock::now();
  if (_mode == ProgressMode::plain && step <= line->shownStep) return;
  line->shownStep = step;
  // A complete package is not yet a complete app.
  changed(*line, step == 100 ? "sent" : "sent " + std::to_string(step) + " %", false);
}

void Progress::installing(const std::string& id) {
  Lock lock(_mutex);
  ProgressLine* line = find(id);
  if (!line || line->phase >= Phase::installing) return;
  enter(*line, Phase::installing, percentInstalling);
  changed(*line, "installing", false);
}

void Progress::ended(const std::string& id, const std::string& outcome, const std::string& reason, bool good) {
  Lock lock(_mutex);
  ProgressLine* line = find(id);
  if (!line || line->phase == Phase::ended) return;
  end(*line, outcome, reason, good);
}

void Progress::headline(const std::string& text) {
  Lock lock(_mutex);
  if (_headline == text) return;
  _headline = text;
  _lastChange = std::chrono::steady_clock::now();
  if (_mode == ProgressMode::plain && !text.empty()) print(printable(text));
  _mustDraw = true;
  _changed.notifyAll();
}

void Progress::countdown(const std::string& text, long long seconds) {
  constexpr long long plainSeconds = 10;
  {
    Lock lock(_mutex);
    bool begins = std::exchange(_countingDown, text) != text;
    if (_mode == ProgressMode::plain && !begins && seconds % plainSeconds != 0) return;
  }
  headline(text + ", " + std::to_string(seconds) + " s left");
}

void Progress::finish() {
  Lock lock(_mutex);
  _mustDraw = false;
  if (_heart.joinable()) {
    _changed.notifyAll();
    _changed.wait(_mutex, [this]() REQUIRES(_mutex) { return _unsaid.empty() && !_writing; });
  }
  _lines.clear();
  _places.clear();
  _headline.clear();
  _countingDown.clear();
  _percent = 0;
  _endings = 0;
  lock.unlock();
  if (_mode == ProgressMode::tty) _console.setRegion({});
}

ProgressLine* Progress::find(const std::string& id) {
  auto place = _places.find(id);
  return place == _places.end() ? nullptr : &_lines[place->second];
}

void Progress::enter(ProgressLine& line, Phase phase, int percent) {
  line.phase = std::max(line.phase, phase);
  line.percent = std::max(line.percent, percent);
}

void Progress::end(ProgressLine& line, const std::string& outcome, const std::string& reason, bool good) {
  enter(line, Phase::ended, good ? 100 : line.percent);
  line.good = good;
  line.outcome = outcome;
  line.reason = reason;
  line.endedAs = ++_endings;
  changed(line, reason.empty() ? outcome : outcome + ": " + printable(reason), true);
}

void Progress::changed(const ProgressLine& line, const std::string& what, bool urgent) {
  auto now = std::chrono::steady_clock::now();
  _lastChange = now;
  if (_mode == ProgressMode::plain) {
    // Names may be wider than their column: names that were cut could not be told apart.
    constexpr std::size_t nameColumns = 24;
    print(fitted(line.name, std::max(nameColumns, columnsOf(printable(line.name)))) + "  " + what);
  }
  if (_mode != ProgressMode::tty || (!urgent && now - _lastDrawn < redrawInterval)) return;
  _mustDraw = true;
  _changed.notifyAll();
}

void Progress::print(const std::string& text) {
  _lastPrinted = std::chrono::steady_clock::now();
  _unsaid.push_back(text);
  _changed.notifyAll();
}

std::vector<TerminalLine> Progress::drawing() {
  auto now = std::chrono::steady_clock::now();
  _lastDrawn = now;
  // Apps that join later must not lower it.
  _percent = std::max(_percent, percentOf(_lines));
  std::string headline;
  if (!_headline.empty()) {
    headline = std::string(movingSigns[_beats % std::size(movingSigns)]) + " " + _headline;
    if (now - _lastChange >= quietUntilTold) headline += " (nothing new for " + secondsText(now - _lastChange) + ")";
  }
  return drawProgress(headline, _lines, _percent, Console::size(), _colours);
}

/// For want of memory a drawing or a line may be missing, but nothing that is shown is lost.
void Progress::live() {
  for (bool over = false; !over;) {
    try {
      beat();
      over = true;
    } catch (const std::bad_alloc&) {
    }
  }
}

void Progress::beat() {
  Lock lock(_mutex);
  while (!_over) {
    if (_unsaid.empty() && !_mustDraw) {
      _changed.waitFor(_mutex, signInterval);
      if (_over || _headline.empty() || _mustDraw || !_unsaid.empty()) continue;
      ++_beats;
      _mustDraw = true;
      if (_mode == ProgressMode::plain) beatInPlainMode();
      continue;
    }
    const auto lines = std::exchange(_unsaid, {});
    bool draws = std::exchange(_mustDraw, false) && _mode == ProgressMode::tty;
    auto region = draws ? drawing() : std::vector<TerminalLine>();
    _writing = true;
    lock.unlock();
    try {
      for (const auto& each : lines) _console.line(each);
      if (draws) _console.setRegion(std::move(region));
    } catch (const std::bad_alloc&) {
    }
    lock.lock();
    _writing = false;
    _changed.notifyAll();
  }
}

void Progress::beatInPlainMode() {
  auto now = std::chrono::steady_clock::now();
  if (now - _lastPrinted < plainInterval) return;
  bool moved = _lastChange > _lastPrinted;
  std::string text =
      printable(_headline) + ": " + (moved ? "going on" : "nothing new for " + secondsText(now - _lastChange));
  print(_lines.empty() ? text : text + ", " + endedOf(_lines));
}

}  // namespace tsd
