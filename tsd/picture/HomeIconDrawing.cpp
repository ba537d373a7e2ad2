#include "tsd/picture/HomeIconDrawing.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <memory>
#include <string>

namespace tsd {
namespace {

constexpr double fullTurn = 6.283185307179586;
constexpr double cornerShare = 0.24;  // of the side
constexpr Colour white{1, 1, 1};

using Surface = std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)>;

cairo_status_t take(void* source, unsigned char* data, unsigned length) {
  auto& rest = *static_cast<platform::BytesView*>(source);
  if (rest.size() < length) return CAIRO_STATUS_READ_ERROR;
  std::memcpy(data, rest.data(), length);
  rest.remove_prefix(length);
  return CAIRO_STATUS_SUCCESS;
}

void traceIcon(cairo_t* pen, const Box& box) { traceRounded(pen, box, box.width * cornerShare); }

/// Always the same for the same identifier.
double hueOf(const std::string& id) {
  std::uint32_t hash = 2166136261U;
  for (unsigned char c : id) hash = (hash ^ c) * 16777619U;
  return static_cast<double>(hash % 360) / 360;
}

/// The name's first character, in bytes that belong together.
std::string initialOf(const HomeIcon& icon) {
  std::string text = labelOf(icon);
  text.erase(0, text.find_first_not_of(" \t\r\n"));
  std::size_t end = 1;
  while (end < text.size() && (static_cast<unsigned char>(text[end]) & 0xc0) == 0x80) ++end;
  std::string initial = text.substr(0, end);
  if (initial.size() == 1 && initial[0] >= 'a' && initial[0] <= 'z') initial[0] = static_cast<char>(initial[0] - 32);
  return initial;
}

void drawLetter(cairo_t* pen, const HomeIcon& icon, const Box& box) {
  bool isGrey = icon.look == HomeLook::demoted;
  setColour(pen, colourOf(hueOf(icon.id), isGrey ? 0 : 0.45, isGrey ? 0.6 : 0.72));
  cairo_rectangle(pen, box.x, box.y, box.width, box.height);
  cairo_fill(pen);
  drawTextInMiddle(pen, initialOf(icon), box, {box.width * 0.5, white, 1, true, TextStyle::Align::centre});
}

/// Removes the colour from an image.
void drainColour(cairo_surface_t* image) {
  auto format = cairo_image_surface_get_format(image);
  if (format != CAIRO_FORMAT_ARGB32 && format != CAIRO_FORMAT_RGB24) return;
  cairo_surface_flush(image);
  unsigned char* row = cairo_image_surface_get_data(image);
  const auto columns = static_cast<std::size_t>(cairo_image_surface_get_width(image));
  for (int y = cairo_image_surface_get_height(image); y > 0; --y, row += cairo_image_surface_get_stride(image)) {
    for (std::size_t x = 0; x < columns; ++x) {
      std::uint32_t pixel;
      std::memcpy(&pixel, row + 4 * x, sizeof pixel);
      std::uint32_t light = ((pixel >> 16 & 0xff) * 77 + (pixel >> 8 & 0xff) * 151 + (pixel & 0xff) * 28) >> 8;
      pixel = (pixel & 0xff000000U) | light << 16 | light << 8 | light;
      std::memcpy(row + 4 * x, &pixel, sizeof pixel);
    }
  }
  cairo_surface_mark_dirty(image);
}

void drawImage(cairo_t* pen, const HomeIcon& icon, const Box& box) {
  platform::BytesView bytes = icon.image;
  Surface image(bytes.empty() ? nullptr : cairo_image_surface_create_from_png_stream(take, &bytes),
                cairo_surface_destroy);
  if (!image || cairo_surface_status(image.get()) != CAIRO_STATUS_SUCCESS) return drawLetter(pen, icon, box);
  if (icon.look == HomeLook::demoted) drainColour(image.get());
  cairo_save(pen);
  cairo_translate(pen, box.x, box.y);
  cairo_scale(pen, box.width / cairo_image_surface_get_width(image.get()),
              box.height / cairo_image_surface_get_height(image.get()));
  cairo_set_source_surface(pen, image.get(), 0, 0);
  cairo_pattern_set_filter(cairo_get_source(pen), CAIRO_FILTER_GOOD);
  cairo_paint(pen);
  cairo_restore(pen);
}

/// How far the package has come, below the icon.
void drawBar(cairo_t* pen, const Box& box, double progress, const Theme& theme) {
  double height = box.height * 0.08;
  Box track{box.x + box.width * 0.06, box.y + box.height * (1 + homeGaugeShare) - height, box.width * 0.88, height};
  setColour(pen, theme.faintInk, 0.35);
  traceRounded(pen, track, height / 2);
  cairo_fill(pen);
  double filled = std::clamp(progress, 0.0, 1.0) * track.width;
  if (filled <= 0) return;
  setColour(pen, theme.accent);
  traceRounded(pen, {track.x, track.y, std::max(filled, height), height}, height / 2);
  cairo_fill(pen);
}

/// The sign that somebody else will bring the package.
void drawDots(cairo_t* pen, const Box& box, const Theme& theme) {
  double radius = box.width * 0.04;
  for (int dot = -1; dot <= 1; ++dot) {
    setColour(pen, theme.accent);
    cairo_arc(pen, box.x + box.width * (0.5 + 0.16 * dot), box.y + box.height * (1 + homeGaugeShare) - radius, radius,
              0, fullTurn);
    cairo_fill(pen);
  }
}

/// An outline, for icons that are white or have transparent edges.
void drawOutline(cairo_t* pen, const Box& box, bool dashed, const Theme& theme) {
  double width = dashed ? std::max(1.0, box.width * 0.028) : std::max(0.6, box.width * 0.012);
  double dash[] = {box.width * 0.09, box.width * 0.06};
  cairo_save(pen);
  traceIcon(pen, {box.x + width / 2, box.y + width / 2, box.width - width, box.height - width});
  setColour(pen, dashed ? theme.faintInk : theme.ink, dashed ? 0.95 : theme.hairline);
  cairo_set_line_width(pen, width);
  if (dashed) cairo_set_dash(pen, dash, 2, 0);
  cairo_stroke(pen);
  cairo_restore(pen);
}

void drawFailure(cairo_t* pen, const Box& box, const Theme& theme) {
  double radius = box.width * 0.17;
  double x = box.x + box.width - radius * 0.7;
  double y = box.y + radius * 0.7;
  setColour(pen, theme.paper);
  cairo_arc(pen, x, y, radius * 1.22, 0, fullTurn);
  cairo_fill(pen);
  setColour(pen, theme.failure);
  cairo_arc(pen, x, y, radius, 0, fullTurn);
  cairo_fill(pen);
  drawTextInMiddle(pen, "!", {x - radius, y - radius, 2 * radius, 2 * radius},
                   {radius * 1.45, theme.paper, 1, true, TextStyle::Align::centre});
}

}  // namespace

void drawHomeIcon(cairo_t* pen, const HomeIcon& icon, const Box& box, const Theme& theme) {
  bool isMoving = icon.look == HomeLook::updating || icon.look == HomeLook::waiting;
  cairo_save(pen);
  traceIcon(pen, box);
  cairo_clip(pen);
  drawImage(pen, icon, box);
  if (icon.look != HomeLook::installed && icon.look != HomeLook::updating) {
    setColour(pen, theme.veil, 0.55);
    cairo_rectangle(pen, box.x, box.y, box.width, box.height);
    cairo_fill(pen);
  }
  cairo_restore(pen);
  drawOutline(pen, box, icon.look == HomeLook::demoted, theme);
  if (isMoving) drawBar(pen, box, icon.progress, theme);
  if (icon.look == HomeLook::restoring) drawDots(pen, box, theme);
  if (icon.failed) drawFailure(pen, box, theme);
}

}  // namespace tsd
