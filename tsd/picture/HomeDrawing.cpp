#include "tsd/picture/HomeDrawing.h"

#include <algorithm>
#include <cmath>
#include <vector>

#include "tsd/picture/Canvas.h"
#include "tsd/picture/HomeIconDrawing.h"

namespace tsd {
namespace {

constexpr double pixelsPerUnit = 1.5;
constexpr double margin = 28;
constexpr double headerHeight = 64;
constexpr std::size_t iconsAcross = 4;
constexpr std::size_t leastRows = 1;
constexpr std::size_t pagesAcross = 4;
constexpr Box cell{0, 0, 104, 130};
constexpr double pagePadding = 18;
constexpr double pageGap = 22;
constexpr double pageWidth = iconsAcross * cell.width + 2 * pagePadding;
constexpr double pageNumberHeight = 16;  // within the padding below
constexpr double swatch = 28;
constexpr double legendLine = 46;
constexpr double lineHeight = 18;
constexpr double failureHeight = 2 * lineHeight + 6;
constexpr std::size_t failedListed = 5;

constexpr double legendSize = 13;

std::string counted(std::size_t count, const char* one) {
  return std::to_string(count) + " " + one + (count == 1 ? "" : "s");
}

struct LegendItem {
  HomeIcon sample;
  std::string text;
  double width = 0;
  double x = 0;
  std::size_t line = 0;
};

/// What each look in the picture means, and how often it occurs.
std::vector<LegendItem> legendOf(const HomePages& home) {
  std::vector<LegendItem> items;
  auto add = [&](std::size_t count, const char* text, HomeLook look, bool failed) {
    if (count) items.push_back({{"legend", "A", look, failed, 0.4, {}}, std::to_string(count) + " " + text});
  };
  std::size_t failed = 0;
  for (const auto& page : home.pages) {
    for (const auto& icon : page) failed += icon.failed;
  }
  for (std::size_t i = 0; i < homeLooks; ++i) {
    auto look = static_cast<HomeLook>(i);
    add(home.countOf(look), nameOfLook(look), look, false);
  }
  add(failed, "with a failed install", HomeLook::installed, true);
  return items;
}

/// The places of everything, in units.
struct Arrangement {
  std::size_t pages;   // drawn
  std::size_t across;  // pages side by side
  double pageHeight;
  double width;
  double height;
  std::vector<LegendItem> legend;
  double legendTop;
  double failuresTop;
  std::size_t failures;  // listed, the line about the others counted

  explicit Arrangement(const HomePages& home) : legend(legendOf(home)) {
    pages = std::min(home.pages.size(), homePagesDrawn);
    across = std::clamp<std::size_t>(pages, 1, pagesAcross);
    std::size_t fullest = 0;
    for (std::size_t page = 0; page < pages; ++page) fullest = std::max(fullest, home.pages[page].size());
    std::size_t rows = std::max(leastRows, (fullest + iconsAcross - 1) / iconsAcross);
    pageHeight = static_cast<double>(rows) * cell.height + 2 * pagePadding + (home.pages.size() > 1 ? 6 : 0);
    auto rowsOfPages = static_cast<double>(std::max<std::size_t>(1, (pages + across - 1) / across));
    width = static_cast<double>(across) * (pageWidth + pageGap) - pageGap + 2 * margin;
    legendTop = margin + headerHeight + rowsOfPages * (pageHeight + pageGap) + 2;
    failuresTop = legendTop + placeLegend() * legendLine + 4;
    failures = std::min(home.failed.size(), failedListed + 1);
    height = failuresTop + (failures ? 34 + static_cast<double>(failures) * failureHeight : 0) + 8;
  }

  /// Answers the number of lines.
  double placeLegend() {
    Canvas scratch(1, 1);
    double x = margin;
    std::size_t line = 0;
    for (auto& item : legend) {
      item.width = swatch + 8 + widthOfText(scratch.pen(), item.text, {legendSize}) + 4;
      if (x > margin && x + item.width > width - margin) {
        x = margin;
        ++line;
      }
      item.x = x;
      item.line = line;
      x += item.width + 20;
    }
    return legend.empty() ? 0 : static_cast<double>(line + 1);
  }

  Box page(std::size_t number) const {
    std::size_t row = number / across;
    return {margin + static_cast<double>(number % across) * (pageWidth + pageGap),
            margin + headerHeight + static_cast<double>(row) * (pageHeight + pageGap), pageWidth, pageHeight};
  }
};

/// What everything is drawn with.
struct Sheet {
  const Canvas& canvas;
  const Theme& theme;
};

void drawHeader(const Sheet& sheet, const Arrangement& place, const HomePages& home, const std::string& title) {
  TextStyle big{22, sheet.theme.ink, 1, true};
  TextStyle small{13, sheet.theme.faintInk};
  double width = place.width - 2 * margin;
  std::string facts = counted(home.icons(), "app");
  if (home.pages.size() > 1) facts += " on " + counted(home.pages.size(), "page");
  if (home.pages.size() > place.pages) facts += ", the first " + std::to_string(place.pages) + " shown";
  drawText(sheet.canvas.pen(), title, {margin, margin - 6, width - (home.syncing ? 130 : 0), 30}, big);
  if (place.pages) drawText(sheet.canvas.pen(), facts, {margin, margin + 24, width, 20}, small);
  if (!home.syncing) return;
  Box pill{place.width - margin - 112, margin - 2, 112, 26};
  setColour(sheet.canvas.pen(), sheet.theme.accent, 0.14);
  traceRounded(sheet.canvas.pen(), pill, 13);
  cairo_fill(sheet.canvas.pen());
  drawTextInMiddle(sheet.canvas.pen(), "sync running", pill,
                   {12, sheet.theme.accent, 1, true, TextStyle::Align::centre});
}

/// The name, and below it how far a package has come.
void drawLabel(const Sheet& sheet, const HomeIcon& icon, const Box& box) {
  cairo_t* pen = sheet.canvas.pen();
  bool moves = icon.look == HomeLook::updating || icon.look == HomeLook::waiting;
  TextStyle style{12.5, icon.look == HomeLook::installed || moves ? sheet.theme.ink : sheet.theme.faintInk};
  style.align = TextStyle::Align::centre;
  style.lines = moves ? 1 : 2;
  drawText(pen, labelOf(icon), box, style);
  if (!moves) return;
  int percent = static_cast<int>(std::clamp(icon.progress, 0.0, 1.0) * 100);
  style.colour = sheet.theme.accent;
  style.bold = true;
  style.size = 11.5;
  drawText(pen, percent ? std::to_string(percent) + " %" : nameOfLook(icon.look),
           {box.x, box.y + 16, box.width, box.height - 16}, style);
}

void drawPage(const Sheet& sheet, const Box& box, const std::vector<HomeIcon>& icons) {
  cairo_t* pen = sheet.canvas.pen();
  for (int ring = 4; ring > 0; --ring) {  // a soft shadow
    setColour(pen, sheet.theme.ink, 0.015);
    traceRounded(pen, {box.x - ring, box.y - ring + 2, box.width + 2.0 * ring, box.height + 2.0 * ring}, 22.0 + ring);
    cairo_fill(pen);
  }
  setColour(pen, sheet.theme.paper);
  traceRounded(pen, box, 22);
  cairo_fill(pen);
  for (std::size_t i = 0; i < icons.size(); ++i) {
    std::size_t row = i / iconsAcross;
    double x = box.x + pagePadding + static_cast<double>(i % iconsAcross) * cell.width;
    double y = box.y + pagePadding + static_cast<double>(row) * cell.height;
    Box icon{x + (cell.width - homeIconSide) / 2, y + 6, homeIconSide, homeIconSide};
    drawHomeIcon(pen, icons[i], icon, sheet.theme);
    drawLabel(sheet, icons[i], {x + 3, y + 6 + homeIconSide * (1 + homeGaugeShare) + 6, cell.width - 6, 34});
  }
}

void drawPageNumber(const Sheet& sheet, const Box& page, std::size_t number, std::size_t count) {
  drawTextInMiddle(sheet.canvas.pen(), std::to_string(number) + " of " + std::to_string(count),
                   {page.x, page.y + page.height - pageNumberHeight - 6, page.width, pageNumberHeight},
                   {11, sheet.theme.faintInk, 1, false, TextStyle::Align::centre});
}

void drawNothing(const Sheet& sheet, const Arrangement& place) {
  Box box = place.page(0);
  drawPage(sheet, box, {});
  drawTextInMiddle(sheet.canvas.pen(), "No apps on the home screen", box,
                   {15, sheet.theme.faintInk, 1, false, TextStyle::Align::centre});
}

void drawLegend(const Sheet& sheet, const Arrangement& place) {
  for (const auto& item : place.legend) {
    double y = place.legendTop + static_cast<double>(item.line) * legendLine;
    drawHomeIcon(sheet.canvas.pen(), item.sample, {item.x, y, swatch, swatch}, sheet.theme);
    drawTextInMiddle(sheet.canvas.pen(), item.text, {item.x + swatch + 8, y, item.width, swatch},
                     TextStyle{legendSize, sheet.theme.ink});
  }
}

void drawFailures(const Sheet& sheet, const Arrangement& place, const HomePages& home) {
  if (home.failed.empty()) return;
  double width = place.width - 2 * margin;
  double y = place.failuresTop;
  setColour(sheet.canvas.pen(), sheet.theme.faintInk, 0.25);
  cairo_rectangle(sheet.canvas.pen(), margin, y, width, 1);
  cairo_fill(sheet.canvas.pen());
  drawText(sheet.canvas.pen(), "Gone after a failed install", {margin, y + 10, width, lineHeight},
           {13, sheet.theme.failure, 1, true});
  y += 34;
  for (std::size_t i = 0; i < place.failures; ++i, y += failureHeight) {
    bool isRest = i == failedListed;
    const std::string rest = "and " + std::to_string(home.failed.size() - i) + " more";
    TextStyle name{13, sheet.theme.ink};
    name.cut = TextStyle::Cut::front;
    drawText(sheet.canvas.pen(), isRest ? rest : home.failed[i].id, {margin, y, width, lineHeight}, name);
    if (isRest) break;
    TextStyle style{12, sheet.theme.faintInk};
    drawText(sheet.canvas.pen(), withoutMiddle(sheet.canvas.pen(), home.failed[i].reason, width, style),
             {margin, y + lineHeight, width, lineHeight}, style);
  }
}

}  // namespace

platform::Bytes drawHome(const HomePages& home, const std::string& title, const Theme& theme, PictureFormat format) {
  Arrangement place(home);
  Canvas canvas(place.width, place.height, pixelsPerUnit, format);
  Sheet sheet{canvas, theme};
  setColour(canvas.pen(), theme.ground);
  cairo_paint(canvas.pen());
  drawHeader(sheet, place, home, title);
  for (std::size_t i = 0; i < place.pages; ++i) {
    drawPage(sheet, place.page(i), home.pages[i]);
    if (home.pages.size() > 1) drawPageNumber(sheet, place.page(i), i + 1, home.pages.size());
  }
  if (place.pages == 0) drawNothing(sheet, place);
  drawLegend(sheet, place);
  drawFailures(sheet, place, home);
  return canvas.finish();
}

}  // namespace tsd
