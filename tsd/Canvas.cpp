#include "tsd/Canvas.h"

#include <pango/pangocairo.h>

#include <cmath>
#include <new>
#include <string>

#include "tsd/CommandError.h"

namespace tsd {
namespace {

constexpr double quarterTurn = 1.5707963267948966;

struct Free {
  void operator()(PangoLayout* layout) const { g_object_unref(layout); }
  void operator()(PangoFontDescription* font) const { pango_font_description_free(font); }
  void operator()(char* text) const { g_free(text); }
};
using Layout = std::unique_ptr<PangoLayout, Free>;

cairo_status_t append(void* target, const unsigned char* bytes, unsigned length) {
  try {
    static_cast<platform::Bytes*>(target)->append(reinterpret_cast<const char*>(bytes), length);
    return CAIRO_STATUS_SUCCESS;
  } catch (const std::bad_alloc&) {
    return CAIRO_STATUS_NO_MEMORY;
  }
}

/// Valid UTF-8 on one line.
std::string drawable(std::string_view text) {
  std::unique_ptr<char, Free> valid(g_utf8_make_valid(text.data(), static_cast<gssize>(text.size())));
  std::string result(valid.get());
  for (char& c : result) {
    if (static_cast<unsigned char>(c) < 0x20 || c == 0x7f) c = ' ';
  }
  return result;
}

Layout layOut(cairo_t* pen, std::string_view text, const TextStyle& style) {
  Layout layout(pango_cairo_create_layout(pen));
  std::unique_ptr<PangoFontDescription, Free> font(pango_font_description_from_string("sans-serif"));
  pango_font_description_set_absolute_size(font.get(), style.size * PANGO_SCALE);
  if (style.bold) pango_font_description_set_weight(font.get(), PANGO_WEIGHT_BOLD);
  pango_layout_set_font_description(layout.get(), font.get());
  std::string line = drawable(text);
  pango_layout_set_text(layout.get(), line.data(), static_cast<int>(line.size()));
  return layout;
}

Layout layOutIn(cairo_t* pen, std::string_view text, const Box& box, const TextStyle& style) {
  Layout layout = layOut(pen, text, style);
  pango_layout_set_width(layout.get(), static_cast<int>(box.width * PANGO_SCALE));
  pango_layout_set_height(layout.get(), -style.lines);
  pango_layout_set_wrap(layout.get(), PANGO_WRAP_WORD_CHAR);
  pango_layout_set_ellipsize(layout.get(), style.cutsMiddle ? PANGO_ELLIPSIZE_MIDDLE : PANGO_ELLIPSIZE_END);
  pango_layout_set_alignment(layout.get(), style.align == TextStyle::Align::left     ? PANGO_ALIGN_LEFT
                                           : style.align == TextStyle::Align::centre ? PANGO_ALIGN_CENTER
                                                                                     : PANGO_ALIGN_RIGHT);
  return layout;
}

void show(cairo_t* pen, const Layout& layout, double x, double y, const TextStyle& style) {
  setColour(pen, style.colour, style.alpha);
  cairo_move_to(pen, x, y);
  pango_cairo_show_layout(pen, layout.get());
}

}  // namespace

Colour colourOf(double hue, double saturation, double value) {
  auto part = [&](double shift) {
    double k = std::fmod(shift + hue * 6, 6);
    return value - value * saturation * std::fmax(0, std::fmin(std::fmin(k, 4 - k), 1));
  };
  return {part(5), part(3), part(1)};
}

Canvas::Canvas(double width, double height, double scale)
    : _surface(cairo_image_surface_create(CAIRO_FORMAT_ARGB32, static_cast<int>(std::ceil(width * scale)),
                                          static_cast<int>(std::ceil(height * scale))),
               cairo_surface_destroy),
      _pen(cairo_create(_surface.get()), cairo_destroy) {
  if (cairo_status(_pen.get()) != CAIRO_STATUS_SUCCESS) throw CommandError("cannot make a picture of this size");
  cairo_scale(_pen.get(), scale, scale);
}

platform::Bytes Canvas::png() const {
  platform::Bytes bytes;
  auto status = cairo_status(_pen.get());
  if (status == CAIRO_STATUS_SUCCESS) status = cairo_surface_write_to_png_stream(_surface.get(), append, &bytes);
  if (status != CAIRO_STATUS_SUCCESS)
    throw CommandError(std::string("cannot draw the picture: ") + cairo_status_to_string(status));
  return bytes;
}

void traceRounded(cairo_t* pen, const Box& box, double radius) {
  double right = box.x + box.width;
  double bottom = box.y + box.height;
  cairo_new_sub_path(pen);
  cairo_arc(pen, right - radius, box.y + radius, radius, -quarterTurn, 0);
  cairo_arc(pen, right - radius, bottom - radius, radius, 0, quarterTurn);
  cairo_arc(pen, box.x + radius, bottom - radius, radius, quarterTurn, 2 * quarterTurn);
  cairo_arc(pen, box.x + radius, box.y + radius, radius, 2 * quarterTurn, 3 * quarterTurn);
  cairo_close_path(pen);
}

void setColour(cairo_t* pen, const Colour& colour, double alpha) {
  cairo_set_source_rgba(pen, colour.red, colour.green, colour.blue, alpha);
}

void drawText(cairo_t* pen, std::string_view text, const Box& box, const TextStyle& style) {
  show(pen, layOutIn(pen, text, box, style), box.x, box.y, style);
}

void drawTextInMiddle(cairo_t* pen, std::string_view text, const Box& box, const TextStyle& style) {
  Layout layout = layOutIn(pen, text, box, style);
  int height = 0;
  pango_layout_get_size(layout.get(), nullptr, &height);
  show(pen, layout, box.x, box.y + (box.height - static_cast<double>(height) / PANGO_SCALE) / 2, style);
}

double widthOfText(cairo_t* pen, std::string_view text, const TextStyle& style) {
  int width = 0;
  pango_layout_get_size(layOut(pen, text, style).get(), &width, nullptr);
  return static_cast<double>(width) / PANGO_SCALE;
}

}  // namespace tsd
