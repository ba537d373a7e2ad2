#pragma once

#include "tsd/picture/Canvas.h"
#include "tsd/picture/HomePages.h"

namespace tsd {

constexpr double homeIconSide = 68;
/// What an icon's gauge takes below it, as a share of its side.
constexpr double homeGaugeShare = 0.17;

/// An app's icon in a square: its own image or, where it has none, a letter on a colour that its identifier chooses,
/// with what its look and a failure put over it, and below it how far its package has come, or that it waits.
void drawHomeIcon(cairo_t* pen, const HomeIcon& icon, const Box& box, const Theme& theme);

}  // namespace tsd
