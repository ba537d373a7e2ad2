#pragma once

#include "tsd/Canvas.h"
#include "tsd/HomePages.h"

namespace tsd {

constexpr double homeIconSide = 68;
constexpr Colour accentColour{0.05, 0.42, 0.62};
constexpr Colour failureColour{0.78, 0.16, 0.18};

/// An app's icon in a square: its own image or, where it has none, a letter on a colour that its identifier chooses,
/// with what its look and a failure put over it.
void drawHomeIcon(cairo_t* pen, const HomeIcon& icon, const Box& box);
/// The look alone in a small square, for a legend.
void drawHomeMark(cairo_t* pen, const HomeIcon& icon, const Box& box);

}  // namespace tsd
