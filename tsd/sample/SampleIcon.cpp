#include "tsd/sample/SampleIcon.h"

#include <memory>

#include "tsd/picture/Canvas.h"
#include "tsd/sample/SampleApp.h"

namespace tsd {
namespace {

constexpr double side = 180;
constexpr double pi = 3.14159265358979323846;

void drawGround(cairo_t* pen, double hue) {
  Colour top = colourOf(hue, 0.55, 0.95);
  Colour bottom = colourOf(hue + 0.04, 0.75, 0.70);
  std::unique_ptr<cairo_pattern_t, void (*)(cairo_pattern_t*)> shade(cairo_pattern_create_linear(0, 0, 0, side),
                                                                     cairo_pattern_destroy);
  cairo_pattern_add_color_stop_rgb(shade.get(), 0, top.red, top.green, top.blue);
  cairo_pattern_add_color_stop_rgb(shade.get(), 1, bottom.red, bottom.green, bottom.blue);
  traceRounded(pen, {0, 0, side, side}, 40);
  cairo_set_source(pen, shade.get());
  cairo_fill_preserve(pen);
  cairo_clip(pen);
}

/// A large faint figure behind the letters, so that icons differ in more than colour.
void drawMark(cairo_t* pen, std::size_t figure) {
  cairo_set_source_rgba(pen, 1, 1, 1, 0.22);
  switch (figure) {
    case 0:
      cairo_arc(pen, side * 0.75, side * 0.25, side * 0.42, 0, 2 * pi);
      break;
    case 1:
      cairo_move_to(pen, 0, side);
      cairo_line_to(pen, side * 0.55, side * 0.2);
      cairo_line_to(pen, side, side);
      break;
    case 2:
      for (int stripe = 0; stripe < 3; ++stripe)
        cairo_rectangle(pen, 0, side * (0.15 + 0.3 * stripe), side, side * 0.12);
      break;
    default:
      cairo_arc(pen, side * 0.5, side * 1.05, side * 0.62, pi, 2 * pi);
      break;
  }
  cairo_fill(pen);
}

void drawLetters(cairo_t* pen, const std::string& letters) {
  cairo_select_font_face(pen, "sans-serif", CAIRO_FONT_SLANT_NORMAL, CAIRO_FONT_WEIGHT_BOLD);
  cairo_set_font_size(pen, 84);
  cairo_text_extents_t extents;
  cairo_text_extents(pen, letters.c_str(), &extents);
  cairo_move_to(pen, side / 2 - extents.width / 2 - extents.x_bearing,
                side / 2 - extents.height / 2 - extents.y_bearing);
  cairo_set_source_rgb(pen, 1, 1, 1);
  cairo_show_text(pen, letters.c_str());
}

}  // namespace

platform::Bytes drawSampleIcon(const std::string& name, SampleNumbers& numbers) {
  Canvas canvas(side, side);
  drawGround(canvas.pen(), static_cast<double>(numbers.below(360)) / 360);
  drawMark(canvas.pen(), numbers.below(4));
  drawLetters(canvas.pen(), name.substr(0, 2));
  return canvas.finish();
}

}  // namespace tsd
