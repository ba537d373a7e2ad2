#pragma once

#include <cairo.h>

#include <memory>
#include <string_view>

#include "platform/Value.h"

namespace tsd {

struct Colour {
  double red, green, blue;  // 0…1
};
/// Hue in turns, any number of them; saturation and value from 0 to 1.
Colour colourOf(double hue, double saturation, double value);

/// A place on a picture, in its units.
struct Box {
  double x, y, width, height;
};

/// A surface of pixels, and the pen that draws on it.
class Canvas {
 public:
  /// `scale` pixels for each unit. Throws a `CommandError` when there is no memory for so large a picture.
  Canvas(double width, double height, double scale = 1);

  cairo_t* pen() const { return _pen.get(); }
  /// Throws a `CommandError` when anything that was drawn could not be.
  platform::Bytes png() const;

 private:
  std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)> _surface;
  std::unique_ptr<cairo_t, void (*)(cairo_t*)> _pen;
};

/// Makes a rectangle with round corners the pen's path.
void traceRounded(cairo_t* pen, const Box& box, double radius);
void setColour(cairo_t* pen, const Colour& colour, double alpha = 1);

struct TextStyle {
  enum class Align { left, centre, right };
  double size = 12;  // of the letters, in units
  Colour colour{0, 0, 0};
  double alpha = 1;
  bool bold = false;
  Align align = Align::left;
  int lines = 1;            // at most; what does not fit ends in "…",
  bool cutsMiddle = false;  // or has it in its middle
};
/// Writes a text from anywhere into a box, at its top: any script, in its own direction. Broken UTF-8 and characters
/// that no font has become marks.
void drawText(cairo_t* pen, std::string_view text, const Box& box, const TextStyle& style);
/// The same with the text's one line in the middle of the box's height.
void drawTextInMiddle(cairo_t* pen, std::string_view text, const Box& box, const TextStyle& style);
/// How wide the text is on one line.
double widthOfText(cairo_t* pen, std::string_view text, const TextStyle& style);

}  // namespace tsd
