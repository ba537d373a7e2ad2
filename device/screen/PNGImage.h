#pragma once

#include <cairo.h>

#include <memory>

#include "platform/Value.h"

namespace device {

using Surface = std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)>;

/// The picture, in the format ARGB32. Null for what is no PNG, for one of more than 4096 pixels in width or height, and
/// for one that is damaged other than in a remark.
Surface readPNG(platform::BytesView png);

/// Appends the picture, which has the format ARGB32, as a PNG. False without memory for it.
bool writePNG(cairo_surface_t* picture, platform::Bytes& out);

}  // namespace device
