#pragma once

#include "tsd/picture/Canvas.h"
#include "tsd/picture/HomePages.h"

namespace tsd {

constexpr double homeIconSide = 68;
/// The height of the gauge below an icon, as a share of the icon's side.
constexpr double homeGaugeShare = 0.17;

/// An app's icon in a square: its own image or, if it has none, a letter on a colour chosen by its identifier, marked
/// according to its look and a failure, and below it how far its package has come, or that it waits.
void drawHomeIcon(cairo_t* pen, const HomeIcon& icon, const Box& box, const Theme& theme);

}  // namespace tsd
