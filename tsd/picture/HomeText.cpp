#include "tsd/picture/HomeText.h"

#include <algorithm>
#include <cmath>

#include "tsd/terminal/Output.h"
#include "tsd/terminal/TerminalText.h"

namespace tsd {
namespace {

constexpr std::size_t barColumns = 8;

/// How a page is divided: as many apps in a row as the home screen has, or as a narrow line takes.
struct Layout {
  explicit Layout(std::size_t width) {
    constexpr std::size_t frame = 4, mostAcross = 4, leastCell = 16, mostCell = 30;
    std::size_t inside = width > frame ? width - frame + 1 : 1;
    iconsAcross = std::clamp<std::size_t>(inside / (leastCell + 1), 1, mostAcross);
    cellColumns = std::clamp(inside / iconsAcross - 1, leastCell, mostCell);
    lineColumns = iconsAcross * (cellColumns + 1) - 1;
  }

  std::size_t iconsAcross;
  std::size_t cellColumns;  // of an app
  std::size_t lineColumns;  // within the frame
};

std::string repeated(const char* sign, std::size_t count) {
  std::string text;
  for (std::size_t i = 0; i < count; ++i) text += sign;
  return text;
}

const char* signOf(HomeLook look) {
  switch (look) {
    case HomeLook::installed:
      return "■";
    case HomeLook::updating:
      return "▣";
    case HomeLook::waiting:
      return "□";
    case HomeLook::restoring:
      return "◌";
    case HomeLook::demoted:
      return "▫";
  }
  return " ";
}

/// "████░░░░ 50 %"
std::string whatOf(const HomeIcon& icon) {
  if (icon.failed) return "! last failed";
  if (icon.look == HomeLook::installed) return "";
  bool isMoving = icon.look == HomeLook::waiting || icon.look == HomeLook::updating;
  auto percent = static_cast<std::size_t>(std::floor(std::clamp(icon.progress, 0.0, 1.0) * 100));
  if (!isMoving || percent == 0) return nameOfLook(icon.look);
  std::size_t full = percent * barColumns / 100;
  return repeated("█", full) + repeated("░", barColumns - full) + " " + std::to_string(percent) + " %";
}

std::string pageText(const Layout& layout, const std::vector<HomeIcon>& page, const std::string& heading) {
  // Each app's cell ends with a space; that of the last one is beyond the line.
  auto line = [&](std::string inside) {
    inside.pop_back();
    return "│ " + fitted(inside, layout.lineColumns) + " │\n";
  };
  std::string text = "╭─ " + heading + " " + repeated("─", layout.lineColumns - columnsOf(heading) - 1) + "╮\n";
  for (std::size_t first = 0; first < page.size(); first += layout.iconsAcross) {
    std::string names, whats;
    for (std::size_t i = first; i < std::min(page.size(), first + layout.iconsAcross); ++i) {
      names += signOf(page[i].look) + std::string(" ") + fitted(labelOf(page[i]), layout.cellColumns - 2) + " ";
      whats += "  " + fitted(whatOf(page[i]), layout.cellColumns - 2) + " ";
    }
    text += line(names);
    if (whats.find_first_not_of(' ') != std::string::npos) text += line(whats);
  }
  return text + "╰" + repeated("─", layout.lineColumns + 2) + "╯\n";
}

}  // namespace

std::string homeInText(const HomePages& home, const std::string& title) {
  std::string text;
  const Layout layout(lineWidth());
  for (std::size_t i = 0; i < home.pages.size(); ++i) {
    std::string number = ", " + std::to_string(i + 1) + " of " + std::to_string(home.pages.size());
    std::size_t room = layout.lineColumns - std::min(layout.lineColumns, columnsOf(number) + 2);
    text += pageText(layout, home.pages[i], fitted(title, std::min(room, columnsOf(printable(title)))) + number);
  }
  if (home.pages.empty()) text += printable(title) + ": no apps on the home screen.\n";
  std::string legend;
  for (std::size_t i = 0; i < homeLooks; ++i) {
    auto look = static_cast<HomeLook>(i);
    if (std::size_t count = home.countOf(look))
      legend +=
          std::string(legend.empty() ? "" : ", ") + signOf(look) + " " + std::to_string(count) + " " + nameOfLook(look);
  }
  if (!legend.empty()) text += wrappedLine("", legend);
  for (const auto& app : home.failed) text += wrappedLine("Gone after a failed install: ", app.id + ": " + app.reason);
  if (home.syncing) text += wrappedLine("", "The home screen shows that a sync is running.");
  return text;
}

}  // namespace tsd
