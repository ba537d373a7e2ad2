#pragma once

#include <cairo.h>

#include <memory>
#include <string>

#include "platform/IconRenderer.h"
#include "platform/Value.h"

namespace device {

/// An image in memory.
class IconImage final : public platform::GYImage {
 public:
  explicit IconImage(cairo_surface_t* surface) : _surface(surface, &cairo_surface_destroy) {}

  /// The image of a PNG scaled to a square of `size` pixels with rounded corners. Null when the bytes are not a PNG
  /// that can be drawn, or claim more than 4096 pixels in either direction.
  static std::shared_ptr<const IconImage> fromPNG(platform::BytesView png, int size);

  /// Appends the image as a PNG.
  bool encodePNG(platform::Bytes& out) const;

 private:
  std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)> _surface;
};

}  // namespace device
