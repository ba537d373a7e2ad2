#include "tsd/Progress.h"

#include <algorithm>
#include <cmath>
#include <utility>

namespace tsd {
namespace {

constexpr int percentPlaceholder = 2;
constexpr int percentSent = 90;
constexpr int percentInstalling = 95;
constexpr int plainStep = 25;
constexpr auto redrawInterval = std::chrono::milliseconds(60);

const char* nameOfPhase(Progress::Phase phase) {
  switch (phase) {
    case Progress::Phase::waiting:
      return "waiting";
    case Progress::Phase::placeholder:
      return "placeholder shown";
    case Progress::Phase::sending:
      return "sending";
    case Progress::Phase::installing:
      return "installing";
    case Progress::Phase::ended:
      return "ended";
  }
  return "";
}

std::string percentText(int percent) {
  std::string text = std::to_string(percent);
  return std::string(3 - std::min<std::size_t>(3, text.size()), ' ') + text + " %";
}

std::string bar(int percent, std::size_t columns) {
  std::size_t full = static_cast<std::size_t>(percent) * columns / 100;
  std::string text;
  for (std::size_t i = 0; i < columns; ++i) text += i < full ? "█" : "░";
  return text;
}

}  // namespace

Progress::Progress(Console& console, ProgressMode mode, Goal goal)
    : _console(console),
      _goal(goal),
      _mode(mode != ProgressMode::automatic ? mode
            : Console::isTerminal()         ? ProgressMode::tty
                                            : ProgressMode::plain) {}

Progress::~Progress() { finish(); }

void Progress::add(const std::string& id, const std::string& name) {
  std::lock_guard lock(_mutex);
  if (Line* line = find(id)) {
    if (!name.empty()) line->name = name;
    return;
  }
  _places.emplace(id, _lines.size());
  Line line;
  line.id = id;
  line.name = name.empty() ? id : name;
  _lines.push_back(std::move(line));
}

void Progress::placeholderShown(const std::string& id) {
  std::lock_guard lock(_mutex);
  Line* line = find(id);
  if (!line || line->phase >= Phase::placeholder) return;
  bool ends = _goal == Goal::placeholder;
  enter(*line, ends ? Phase::ended : Phase::placeholder, ends ? 100 : percentPlaceholder);
  line->outcome = "placeholder on the home screen";
  changed(*line, line->outcome, ends);
}

void Progress::sending(const std::string& id, double fraction) {
  std::lock_guard lock(_mutex);
  Line* line = find(id);
  if (!line || line->phase > Phase::sending) return;
  double bounded = std::isfinite(fraction) ? std::clamp(fraction, 0.0, 1.0) : 0.0;
  int percent = percentPlaceholder + static_cast<int>(bounded * (percentSent - percentPlaceholder));
  enter(*line, Phase::sending, percent);
  int step = static_cast<int>(bounded * 100) / plainStep * plainStep;
  if (_mode == ProgressMode::plain && step <= line->shownStep) return;
  line->shownStep = step;
  // A whole package is no whole app yet.
  changed(*line, step == 100 ? "sent" : "sent " + std::to_string(step) + " %", false);
}

void Progress::installing(const std::string& id) {
  std::lock_guard lock(_mutex);
  Line* line = find(id);
  if (!line || line->phase >= Phase::installing) return;
  enter(*line, Phase::installing, percentInstalling);
  changed(*line, "installing", false);
}

void Progress::ended(const std::string& id, const std::string& outcome, const std::string& reason, bool good) {
  std::lock_guard lock(_mutex);
  Line* line = find(id);
  if (!line || line->phase == Phase::ended) return;
  enter(*line, Phase::ended, good ? 100 : line->percent);
  line->outcome = outcome;
  line->reason = reason;
  changed(*line, reason.empty() ? outcome : outcome + ": " + printable(reason), true);
}

void Progress::headline(const std::string& text) {
  std::lock_guard lock(_mutex);
  if (_headline == text) return;
  _headline = text;
  if (_mode == ProgressMode::plain && !text.empty()) _console.line(printable(text));
  if (_mode == ProgressMode::tty) draw();
}

void Progress::countdown(const std::string& text, long long seconds) {
  constexpr long long plainInterval = 10;
  {
    std::lock_guard lock(_mutex);
    bool begins = std::exchange(_countingDown, text) != text;
    if (_mode == ProgressMode::plain && !begins && seconds % plainInterval != 0) return;
  }
  headline(text + ", " + std::to_string(seconds) + " s left");
}

void Progress::finish() {
  std::lock_guard lock(_mutex);
  if (_mode == ProgressMode::tty) _console.setRegion({});
  _lines.clear();
  _places.clear();
  _headline.clear();
  _countingDown.clear();
}

Progress::Line* Progress::find(const std::string& id) {
  auto place = _places.find(id);
  return place == _places.end() ? nullptr : &_lines[place->second];
}

void Progress::enter(Line& line, Phase phase, int percent) {
  line.phase = std::max(line.phase, phase);
  line.percent = std::max(line.percent, percent);
}

void Progress::changed(const Line& line, const std::string& what, bool urgent) {
  if (_mode == ProgressMode::plain) {
    // Names may stand out of their column, as nobody could tell apart what was cut.
    constexpr std::size_t nameColumns = 24;
    _console.line(fitted(line.name, std::max(nameColumns, columnsOf(printable(line.name)))) + "  " + what);
  }
  if (_mode != ProgressMode::tty) return;
  auto now = std::chrono::steady_clock::now();
  if (urgent || now - _lastDrawn >= redrawInterval) draw();
}

void Progress::draw() {
  _lastDrawn = std::chrono::steady_clock::now();
  auto size = Console::size();
  std::vector<std::string> region;
  if (!_headline.empty()) region.push_back(fitted(_headline, size.columns - 1));
  std::size_t room = size.rows > region.size() + 3 ? size.rows - region.size() - 3 : 1;
  if (_lines.size() <= room) {
    for (const auto& line : _lines) region.push_back(drawn(line, size.columns));
  } else {
    // More apps than rows: those in motion, and one line for all.
    for (const auto& line : _lines) {
      bool moves = line.phase == Phase::sending || line.phase == Phase::installing;
      if (moves && region.size() + 1 < room) region.push_back(drawn(line, size.columns));
    }
    region.push_back(fitted(summary(), size.columns - 1));
  }
  _console.setRegion(std::move(region));
}

std::string Progress::drawn(const Line& line, std::size_t columns) const {
  std::size_t nameColumns = columns >= 72 ? 20 : 12;
  std::size_t barColumns = columns >= 72 ? 20 : columns >= 50 ? 10 : 0;
  std::string text = fitted(line.name, nameColumns) + "  ";
  if (barColumns) text += bar(line.percent, barColumns) + " ";
  text += percentText(line.percent) + "  ";
  std::size_t used = nameColumns + 2 + (barColumns ? barColumns + 1 : 0) + 7;
  std::string what = line.phase != Phase::ended ? nameOfPhase(line.phase)
                     : line.reason.empty()      ? line.outcome
                                                : line.outcome + ": " + line.reason;
  std::size_t left = columns > used + 1 ? columns - used - 1 : 1;
  return text + fitted(what, std::min(left, columnsOf(printable(what))));
}

std::string Progress::summary() const {
  std::size_t shown = 0;
  std::size_t ended = 0;
  for (const auto& line : _lines) {
    shown += line.phase != Phase::waiting;
    ended += line.phase == Phase::ended;
  }
  return std::to_string(_lines.size()) + " apps: " + std::to_string(shown) + " on the home screen, " +
         std::to_string(ended) + " ended";
}

}  // namespace tsd
