#pragma once

#include <cairo.h>

#include <memory>

#include "platform/Value.h"

namespace device {

using Surface = std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)>;

/// The picture in a PNG as nearly every icon is one: no larger than a million pixels, in red, green, blue and perhaps
/// alpha of eight bits, in one pass. Null for every other one and for what is damaged in any way, of which the image
/// library may make what it likes.
Surface readPlainPNG(platform::BytesView png);

/// Appends the picture, which has the format ARGB32, as a PNG. False without memory for it.
bool writePlainPNG(cairo_surface_t* picture, platform::Bytes& out);

}  // namespace device
