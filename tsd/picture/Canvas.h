#pragma once

#include <cairo.h>

#include <cstdint>
#include <memory>
#include <string>
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

/// The colours of a picture.
struct Theme {
  Colour ground, paper, ink, faintInk, accent, failure;
  Colour veil;      // covers what is not there yet
  double hairline;  // opacity of the ink round an icon
};
constexpr Theme lightTheme{{0.925, 0.933, 0.945}, {1, 1, 1},          {0.13, 0.16, 0.21}, {0.36, 0.40, 0.47},
                           {0.05, 0.42, 0.62},    {0.78, 0.16, 0.18}, {1, 1, 1},          0.22};
constexpr Theme darkTheme{{0.08, 0.094, 0.118}, {0.125, 0.149, 0.18}, {0.90, 0.92, 0.94},   {0.64, 0.68, 0.73},
                          {0.42, 0.74, 0.93},   {1.0, 0.56, 0.55},    {0.125, 0.149, 0.18}, 0.30};

enum class PictureFormat : std::uint8_t { png, svg };

/// A surface, and the pen that draws on it.
class Canvas {
 public:
  /// `scale` pixels for each unit; a vector picture has none. Throws a `CommandError` when there is no memory for so
  /// large a picture.
  Canvas(double width, double height, double scale = 1, PictureFormat format = PictureFormat::png);

  cairo_t* pen() const { return _pen.get(); }
  /// The picture as the content of a file; nothing can be drawn afterwards. Throws a `CommandError` when anything that
  /// was drawn could not be.
  platform::Bytes finish();

 private:
  std::unique_ptr<platform::Bytes> _written;  // of a vector picture, as it is drawn
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
  int lines = 1;                                 // at most; what does not fit ends in "…",
  enum class Cut { end, front } cut = Cut::end;  // or begins with it
};
/// Writes a text from outside into a box, at its top: any script, in its own direction, whatever direction marks it
/// holds. Broken UTF-8 and characters that no font has are shown as marks.
void drawText(cairo_t* pen, std::string_view text, const Box& box, const TextStyle& style);
/// The same with the text's one line in the middle of the box's height.
void drawTextInMiddle(cairo_t* pen, std::string_view text, const Box& box, const TextStyle& style);
/// The text, or as many of its first and last words as fit into the width, with "…" between them.
std::string withoutMiddle(cairo_t* pen, std::string_view text, double width, const TextStyle& style);
/// How wide the text is on one line.
double widthOfText(cairo_t* pen, std::string_view text, const TextStyle& style);

}  // namespace tsd
