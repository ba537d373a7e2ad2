#include "device/screen/IconImage.h"

#include "device/screen/PNGImage.h"

namespace device {

namespace {

constexpr double cornerShare = 0.225;  // of the side

using Context = std::unique_ptr<cairo_t, void (*)(cairo_t*)>;

void traceRoundedSquare(cairo_t* context, double side) {
  constexpr double quarter = 1.5707963267948966;
  double radius = side * cornerShare;
  cairo_new_sub_path(context);
  cairo_arc(context, side - radius, radius, radius, -quarter, 0);
  cairo_arc(context, side - radius, side - radius, radius, 0, quarter);
  cairo_arc(context, radius, side - radius, radius, quarter, 2 * quarter);
  cairo_arc(context, radius, radius, radius, 2 * quarter, 3 * quarter);
  cairo_close_path(context);
}

}  // namespace

std::shared_ptr<const IconImage> IconImage::fromPNG(platform::BytesView png, int size) {
  const Surface source = readPNG(png);
  if (!source) return nullptr;
  Surface target(cairo_image_surface_create(CAIRO_FORMAT_ARGB32, size, size), &cairo_surface_destroy);
  {
    Context context(cairo_create(target.get()), &cairo_destroy);
    traceRoundedSquare(context.get(), size);
    cairo_clip(context.get());
    const double across = double(size) / cairo_image_surface_get_width(source.get());
    const double down = double(size) / cairo_image_surface_get_height(source.get());
    cairo_scale(context.get(), across, down);
    cairo_set_source_surface(context.get(), source.get(), 0, 0);
    // From half the size on, a pixel and its neighbours are all that counts, which takes a quarter of the time.
    const bool needsAll = across < 0.5 || down < 0.5;
    cairo_pattern_set_filter(cairo_get_source(context.get()), needsAll ? CAIRO_FILTER_GOOD : CAIRO_FILTER_BILINEAR);
    cairo_pattern_set_extend(cairo_get_source(context.get()), CAIRO_EXTEND_PAD);
    cairo_paint(context.get());
    if (cairo_status(context.get()) != CAIRO_STATUS_SUCCESS) return nullptr;
  }
  if (cairo_surface_status(target.get()) != CAIRO_STATUS_SUCCESS) return nullptr;
  return std::make_shared<IconImage>(target.release());
}

bool IconImage::encodePNG(platform::Bytes& out) const { return writePNG(_surface.get(), out); }

}  // namespace device
