#include "tsd/picture/Canvas.h"

#include <cairo-svg.h>
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

/// Marks of direction, embeddings, overrides and isolates.
bool turnsText(gunichar c) {
  return c == 0x200e || c == 0x200f || c == 0x61c || (c >= 0x202a && c <= 0x202e) || (c >= 0x2066 && c <= 0x2069);
}

/// Valid UTF-8 on one line, without what would change the direction of other text.
std::string drawable(std::string_view text) {
  std::unique_ptr<char, Free> valid(g_utf8_make_valid(text.data(), static_cast<gssize>(text.size())));
  std::string result;
  for (const char* at = valid.get(); *at; at = g_utf8_next_char(at)) {
    gunichar c = g_utf8_get_char(at);
    if (c < 0x20 || (c >= 0x7f && c < 0xa0))
      result += ' ';
    else if (!turnsText(c))
      result.append(at, static_cast<std::size_t>(g_utf8_next_char(at) - at));
  }
  return result;
}

/// Letters are placed where the font wants them, not at the nearest whole pixel: the picture is scaled.
void placeFreely(PangoLayout* layout) {
  std::unique_ptr<cairo_font_options_t, void (*)(cairo_font_options_t*)> options(cairo_font_options_create(),
                                                                                 cairo_font_options_destroy);
  cairo_font_options_set_hint_metrics(options.get(), CAIRO_HINT_METRICS_OFF);
  cairo_font_options_set_hint_style(options.get(), CAIRO_HINT_STYLE_NONE);
  PangoContext* context = pango_layout_get_context(layout);
  pango_cairo_context_set_font_options(context, options.get());
  pango_context_set_round_glyph_positions(context, FALSE);
  pango_layout_context_changed(layout);
}

Layout layOut(cairo_t* pen, std::string_view text, const TextStyle& style) {
  Layout layout(pango_cairo_create_layout(pen));
  placeFreely(layout.get());
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
  pango_layout_set_ellipsize(layout.get(),
                             style.cut == TextStyle::Cut::front ? PANGO_ELLIPSIZE_START : PANGO_ELLIPSIZE_END);
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

Canvas::Canvas(double width, double height, double scale, PictureFormat format)
    : _written(format == PictureFormat::svg ? std::make_unique<platform::Bytes>() : nullptr),
      _surface(_written ? cairo_svg_surface_create_for_stream(append, _written.get(), width, height)
                        : cairo_image_surface_create(CAIRO_FORMAT_ARGB32, static_cast<int>(std::ceil(width * scale)),
                                                     static_cast<int>(std::ceil(height * scale))),
               cairo_surface_destroy),
      _pen(cairo_create(_surface.get()), cairo_destroy) {
  if (cairo_status(_pen.get()) != CAIRO_STATUS_SUCCESS) throw CommandError("cannot make a picture of this size");
  if (_written)
    cairo_svg_surface_set_document_unit(_surface.get(), CAIRO_SVG_UNIT_PX);
  else
    cairo_scale(_pen.get(), scale, scale);
}

platform::Bytes Canvas::finish() {
  platform::Bytes bytes;
  auto status = cairo_status(_pen.get());
  if (_written && status == CAIRO_STATUS_SUCCESS) {
    cairo_surface_finish(_surface.get());
    status = cairo_surface_status(_surface.get());
    bytes = std::move(*_written);
  } else if (status == CAIRO_STATUS_SUCCESS) {
    status = cairo_surface_write_to_png_stream(_surface.get(), append, &bytes);
  }
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

std::string withoutMiddle(cairo_t* pen, std::string_view text, double width, const TextStyle& style) {
  if (widthOfText(pen, text, style) <= width) return std::string(text);
  // The end matters most: it says what went wrong; the beginning says with what.
  std::string_view front, back;
  std::string best;
  auto fits = [&](std::string_view one, std::string_view other) {
    std::string joined = std::string(one) + " … " + std::string(other);
    if (widthOfText(pen, joined, style) > width) return false;
    best = std::move(joined);
    return true;
  };
  for (bool grows = true; grows;) {
    grows = false;
    std::size_t space = text.rfind(' ', text.size() - back.size() - 2);
    if (space != std::string_view::npos && space > front.size() && fits(front, text.substr(space + 1))) {
      back = text.substr(space + 1);
      grows = true;
    }
    space = text.find(' ', front.size() + 1);
    if (space != std::string_view::npos && space + back.size() < text.size() && fits(text.substr(0, space), back)) {
      front = text.substr(0, space);
      grows = true;
    }
  }
  return best.empty() ? std::string(text) : best;
}

double widthOfText(cairo_t* pen, std::string_view text, const TextStyle& style) {
  int width = 0;
  pango_layout_get_size(layOut(pen, text, style).get(), &width, nullptr);
  return static_cast<double>(width) / PANGO_SCALE;
}

}  // namespace tsd
