#include "tsd/HomeIconDrawing.h"

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
constexpr Colour grey{0.50, 0.54, 0.60};

using Surface = std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)>;

cairo_status_t take(void* source, unsigned char* data, unsigned length) {
  auto& rest = *static_cast<platform::BytesView*>(source);
  if (rest.size() < length) return CAIRO_STATUS_READ_ERROR;
  std::memcpy(data, rest.data(), length);
  rest.remove_prefix(length);
  return CAIRO_STATUS_SUCCESS;
}

void traceIcon(cairo_t* pen, const Box& box) { traceRounded(pen, box, box.width * cornerShare); }

/// The same for the same identifier, always.
double hueOf(const std::string& id) {
  std::uint32_t hash = 2166136261U;
  for (unsigned char c : id) hash = (hash ^ c) * 16777619U;
  return static_cast<double>(hash % 360) / 360;
}

/// The name's first character, in bytes that belong together.
std::string initialOf(const HomeIcon& icon) {
  std::string text = icon.name.empty() ? icon.id.substr(icon.id.rfind('.') + 1) : icon.name;
  std::size_t end = 1;
  while (end < text.size() && (static_cast<unsigned char>(text[end]) & 0xc0) == 0x80) ++end;
  std::string initial = text.substr(0, end);
  if (initial.size() == 1 && initial[0] >= 'a' && initial[0] <= 'z') initial[0] = static_cast<char>(initial[0] - 32);
  return initial;
}

void drawLetter(cairo_t* pen, const HomeIcon& icon, const Box& box) {
  double hue = hueOf(icon.id);
  setColour(pen, colourOf(hue, 0.45, 0.72));
  cairo_rectangle(pen, box.x, box.y, box.width, box.height);
  cairo_fill(pen);
  drawTextInMiddle(pen, initialOf(icon), box, {box.width * 0.5, white, 1, true, TextStyle::Align::centre});
}

void drawImage(cairo_t* pen, const HomeIcon& icon, const Box& box) {
  platform::BytesView bytes = icon.image;
  Surface image(bytes.empty() ? nullptr : cairo_image_surface_create_from_png_stream(take, &bytes),
                cairo_surface_destroy);
  if (!image || cairo_surface_status(image.get()) != CAIRO_STATUS_SUCCESS) return drawLetter(pen, icon, box);
  cairo_save(pen);
  cairo_translate(pen, box.x, box.y);
  cairo_scale(pen, box.width / cairo_image_surface_get_width(image.get()),
              box.height / cairo_image_surface_get_height(image.get()));
  cairo_set_source_surface(pen, image.get(), 0, 0);
  cairo_pattern_set_filter(cairo_get_source(pen), CAIRO_FILTER_GOOD);
  cairo_paint(pen);
  cairo_restore(pen);
}

/// Takes the colour out of what was drawn.
void drainColour(cairo_t* pen, const Box& box) {
  cairo_save(pen);
  cairo_set_operator(pen, CAIRO_OPERATOR_HSL_SATURATION);
  cairo_set_source_rgb(pen, 0.5, 0.5, 0.5);
  cairo_rectangle(pen, box.x, box.y, box.width, box.height);
  cairo_fill(pen);
  cairo_restore(pen);
}

void veil(cairo_t* pen, const Box& box) {
  setColour(pen, white, 0.55);
  cairo_rectangle(pen, box.x, box.y, box.width, box.height);
  cairo_fill(pen);
}

void drawBar(cairo_t* pen, const Box& box, double progress) {
  double height = box.height * 0.11;
  Box track{box.x + box.width * 0.14, box.y + box.height * 0.74, box.width * 0.72, height};
  setColour(pen, white, 0.95);
  traceRounded(pen, {track.x - 2, track.y - 2, track.width + 4, track.height + 4}, height / 2 + 2);
  cairo_fill(pen);
  setColour(pen, grey, 0.35);
  traceRounded(pen, track, height / 2);
  cairo_fill(pen);
  double filled = std::clamp(progress, 0.0, 1.0) * track.width;
  if (filled <= 0) return;
  setColour(pen, accentColour);
  traceRounded(pen, {track.x, track.y, std::max(filled, height), height}, height / 2);
  cairo_fill(pen);
}

void drawDots(cairo_t* pen, const Box& box) {
  Box pill{box.x + box.width * 0.24, box.y + box.height * 0.68, box.width * 0.52, box.height * 0.2};
  setColour(pen, white, 0.95);
  traceRounded(pen, pill, pill.height / 2);
  cairo_fill(pen);
  for (int dot = -1; dot <= 1; ++dot) {
    setColour(pen, accentColour);
    cairo_arc(pen, box.x + box.width * (0.5 + 0.14 * dot), pill.y + pill.height / 2, box.width * 0.045, 0, fullTurn);
    cairo_fill(pen);
  }
}

void drawOutline(cairo_t* pen, const Box& box, bool dashed) {
  double width = std::max(1.0, box.width * 0.028);
  double dash[] = {box.width * 0.09, box.width * 0.06};
  cairo_save(pen);
  traceIcon(pen, {box.x + width / 2, box.y + width / 2, box.width - width, box.height - width});
  setColour(pen, grey, dashed ? 0.95 : 0.45);
  cairo_set_line_width(pen, width);
  if (dashed) cairo_set_dash(pen, dash, 2, 0);
  cairo_stroke(pen);
  cairo_restore(pen);
}

void drawFailure(cairo_t* pen, const Box& box) {
  double radius = box.width * 0.17;
  double x = box.x + box.width - radius * 0.7;
  double y = box.y + radius * 0.7;
  setColour(pen, white);
  cairo_arc(pen, x, y, radius * 1.22, 0, fullTurn);
  cairo_fill(pen);
  setColour(pen, failureColour);
  cairo_arc(pen, x, y, radius, 0, fullTurn);
  cairo_fill(pen);
  drawTextInMiddle(pen, "!", {x - radius, y - radius, 2 * radius, 2 * radius},
                   {radius * 1.45, white, 1, true, TextStyle::Align::centre});
}

/// What lies over the picture; the pen is clipped to the icon.
void drawLook(cairo_t* pen, const HomeIcon& icon, const Box& box) {
  switch (icon.look) {
    case HomeLook::installed:
      break;
    case HomeLook::updating:
      drawBar(pen, box, icon.progress);
      break;
    case HomeLook::waiting:
      veil(pen, box);
      drawBar(pen, box, icon.progress);
      break;
    case HomeLook::restoring:
      veil(pen, box);
      drawDots(pen, box);
      break;
    case HomeLook::demoted:
      drainColour(pen, box);
      veil(pen, box);
      break;
  }
}

void drawOver(cairo_t* pen, const HomeIcon& icon, const Box& box) {
  bool placeholder = icon.look != HomeLook::installed && icon.look != HomeLook::updating;
  if (placeholder) drawOutline(pen, box, icon.look == HomeLook::demoted);
  if (icon.failed) drawFailure(pen, box);
}

}  // namespace

void drawHomeIcon(cairo_t* pen, const HomeIcon& icon, const Box& box) {
  cairo_save(pen);
  traceIcon(pen, box);
  cairo_clip(pen);
  drawImage(pen, icon, box);
  drawLook(pen, icon, box);
  cairo_restore(pen);
  drawOver(pen, icon, box);
}

void drawHomeMark(cairo_t* pen, const HomeIcon& icon, const Box& box) {
  cairo_save(pen);
  traceIcon(pen, box);
  cairo_clip(pen);
  setColour(pen, accentColour, 0.55);
  cairo_paint(pen);
  drawLook(pen, icon, box);
  cairo_restore(pen);
  drawOver(pen, icon, box);
}

}  // namespace tsd
