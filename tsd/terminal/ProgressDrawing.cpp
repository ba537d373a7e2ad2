#include "tsd/terminal/ProgressDrawing.h"

#include <algorithm>
#include <numeric>

namespace tsd {
namespace {

using Colour = TerminalLine::Colour;
using Phase = ProgressLine::Phase;

constexpr std::size_t mostBarsInCrowd = 10;
constexpr std::size_t percentColumns = 5;

const char* nameOfPhase(Phase phase) {
  switch (phase) {
    case Phase::waiting:
      return "waiting";
    case Phase::placeholder:
      return "placeholder shown";
    case Phase::sending:
      return "sending";
    case Phase::installing:
      return "installing";
    case Phase::ended:
      return "ended";
  }
  return "";
}

/// Columns of a line's parts; 0: the part is left out.
struct Columns {
  std::size_t name, bar, what;

  explicit Columns(std::size_t width) {
    bar = width >= 100 ? 30 : width >= 71 ? 20 : width >= 50 ? 10 : 0;
    name = width >= 100 ? 28 : width >= 71 ? 20 : width >= 50 ? 16 : width >= 30 ? 12 : 0;
    if (name == 0) name = width > percentColumns + 1 ? width - percentColumns - 1 : 1;
    std::size_t used = name + 1 + (bar ? bar + 1 : 0) + percentColumns + 2;
    what = width >= used + 6 ? width - used : 0;
  }
};

std::string percentText(int percent) {
  std::string text = std::to_string(percent) + " %";
  return std::string(percentColumns - std::min(percentColumns, text.size()), ' ') + text;
}

std::string repeated(const char* sign, std::size_t count) {
  std::string text;
  for (std::size_t i = 0; i < count; ++i) text += sign;
  return text;
}

TerminalLine drawn(const ProgressLine& line, const std::string& what, std::size_t width, bool colours) {
  Columns columns(width);
  TerminalLine result(colours);
  bool isBad = line.phase == Phase::ended && !line.good;
  Colour colour = line.good ? Colour::good : isBad ? Colour::bad : Colour::busy;
  result.add(fitted(line.name, columns.name) + " ");
  if (columns.bar) {
    std::size_t full = static_cast<std::size_t>(line.percent) * columns.bar / 100;
    result.add(repeated("█", full), colour);
    result.add(repeated("░", columns.bar - full), Colour::dim);
    result.add(" ");
  }
  // Without the words, a sign has to show that the app will get no further.
  bool isSign = isBad && columns.what == 0;
  result.add(isSign ? "  ✗  " : percentText(line.percent), isSign ? colour : Colour::none);
  if (columns.what) {
    std::string text = printable(what);
    result.add("  ");
    result.add(fitted(text, std::min(columns.what, columnsOf(text))),
               line.phase == Phase::ended ? colour : Colour::none);
  }
  return result;
}

std::string whatOf(const ProgressLine& line) {
  if (line.phase != Phase::ended) return nameOfPhase(line.phase);
  return line.reason.empty() ? line.outcome : line.outcome + ": " + line.reason;
}

/// Which apps to show when there is room for `room` of them, in their order: those that interest a person most.
std::vector<const ProgressLine*> chosen(const std::vector<ProgressLine>& lines, std::size_t room) {
  std::vector<const ProgressLine*> result;
  for (const auto& line : lines) {
    if (line.phase >= Phase::sending) result.push_back(&line);
  }
  auto before = [](const ProgressLine* one, const ProgressLine* other) {
    return one->phase != other->phase ? one->phase < other->phase : one->endedAs > other->endedAs;
  };
  std::stable_sort(result.begin(), result.end(), before);
  if (result.size() > room) result.resize(room);
  std::sort(result.begin(), result.end());
  return result;
}

TerminalLine drawnTogether(const std::vector<ProgressLine>& lines, int percent, std::size_t width, bool colours) {
  ProgressLine all;
  all.name = std::to_string(lines.size()) + " apps";
  all.percent = percent;
  auto shown = std::count_if(lines.begin(), lines.end(), [](auto& line) { return line.phase != Phase::waiting; });
  return drawn(all, std::to_string(shown) + " shown, " + endedOf(lines), width, colours);
}

}  // namespace

std::string endedOf(const std::vector<ProgressLine>& lines) {
  auto ended = std::count_if(lines.begin(), lines.end(), [](auto& line) { return line.phase == Phase::ended; });
  return std::to_string(ended) + " of " + std::to_string(lines.size()) + " ended";
}

int percentOf(const std::vector<ProgressLine>& lines) {
  if (lines.empty()) return 0;
  auto sum = std::accumulate(lines.begin(), lines.end(), std::size_t{0},
                             [](std::size_t all, auto& line) { return all + static_cast<std::size_t>(line.percent); });
  return static_cast<int>(sum / lines.size());
}

std::vector<TerminalLine> drawProgress(const std::string& headline, const std::vector<ProgressLine>& lines, int percent,
                                       Console::Size size, bool colours) {
  // The last column stays free: a sign there makes some terminals begin another row.
  std::size_t width = std::max<std::size_t>(2, size.columns) - 1;
  std::vector<TerminalLine> rows;
  if (!headline.empty()) {
    rows.emplace_back(colours);
    rows.back().add(fitted(headline, std::min(width, columnsOf(printable(headline)))));
  }
  std::size_t room = size.rows > rows.size() + 3 ? size.rows - rows.size() - 3 : 1;
  if (lines.size() <= room) {
    for (const auto& line : lines) rows.push_back(drawn(line, whatOf(line), width, colours));
    return rows;
  }
  for (const auto* line : chosen(lines, std::min(room - 1, mostBarsInCrowd)))
    rows.push_back(drawn(*line, whatOf(*line), width, colours));
  rows.push_back(drawnTogether(lines, percent, width, colours));
  return rows;
}

}  // namespace tsd
