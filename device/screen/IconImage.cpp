#include "device/screen/IconImage.h"

#include <png.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <vector>

namespace device {

namespace {

constexpr std::uint32_t maximumPixels = 4096;
constexpr double cornerShare = 0.225;  // of the side

using Surface = std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)>;
using Context = std::unique_ptr<cairo_t, void (*)(cairo_t*)>;

std::uint32_t bigEndian(const char* bytes) {
  std::uint32_t number = 0;
  for (int i = 0; i < 4; ++i) number = number << 8 | static_cast<unsigned char>(bytes[i]);
  return number;
}

/// Whether this is the header of a PNG of a size that may be decoded: the pixels cost memory before it shows whether
/// they are there at all.
bool isDrawable(platform::BytesView png) {
  constexpr char signature[] = "\x89PNG\r\n\x1a\n";
  if (png.size() < 33 || png.substr(0, 8) != platform::BytesView(signature, 8) || png.substr(12, 4) != "IHDR")
    return false;
  auto width = bigEndian(png.data() + 16);
  auto height = bigEndian(png.data() + 20);
  return width > 0 && height > 0 && width <= maximumPixels && height <= maximumPixels;
}

cairo_status_t readBytes(void* source, unsigned char* data, unsigned int length) {
  auto& rest = *static_cast<platform::BytesView*>(source);
  if (rest.size() < length) return CAIRO_STATUS_READ_ERROR;
  std::memcpy(data, rest.data(), length);
  rest.remove_prefix(length);
  return CAIRO_STATUS_SUCCESS;
}

/// A pixel as PNG has it: red, green, blue, alpha, the colours not multiplied by the alpha.
void takeApart(std::uint32_t pixel, unsigned char* out) {
  const std::uint32_t alpha = pixel >> 24;
  for (int channel = 0; channel < 3; ++channel) {
    const std::uint32_t colour = pixel >> (16 - 8 * channel) & 0xff;
    out[channel] = static_cast<unsigned char>(alpha == 0 ? 0 : (colour * 255 + alpha / 2) / alpha);
  }
  out[3] = static_cast<unsigned char>(alpha);
}

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
  if (!isDrawable(png)) return nullptr;
  Surface source(cairo_image_surface_create_from_png_stream(&readBytes, &png), &cairo_surface_destroy);
  if (cairo_surface_status(source.get()) != CAIRO_STATUS_SUCCESS) return nullptr;
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

bool IconImage::encodePNG(platform::Bytes& out) const {
  cairo_surface_flush(_surface.get());
  const int side = cairo_image_surface_get_width(_surface.get());
  const int stride = cairo_image_surface_get_stride(_surface.get());
  const unsigned char* pixels = cairo_image_surface_get_data(_surface.get());
  if (!pixels) return false;
  std::vector<unsigned char> rows(std::size_t{4} * side * side);
  for (int y = 0; y < side; ++y) {
    for (int x = 0; x < side; ++x) {
      std::uint32_t pixel = 0;
      std::memcpy(&pixel, pixels + std::ptrdiff_t{stride} * y + std::ptrdiff_t{4} * x, 4);
      takeApart(pixel, &rows[std::size_t{4} * (std::size_t(side) * y + x)]);
    }
  }
  png_image image{};
  image.version = PNG_IMAGE_VERSION;
  image.width = image.height = side;
  image.format = PNG_FORMAT_RGBA;
  image.flags = PNG_IMAGE_FLAG_FAST;  // several times as fast, and a few percent larger
  png_alloc_size_t size = PNG_IMAGE_PNG_SIZE_MAX(image);
  const std::size_t before = out.size();
  out.resize(before + size);
  const bool encoded = png_image_write_to_memory(&image, out.data() + before, &size, 0, rows.data(), 0, nullptr);
  out.resize(before + (encoded ? size : 0));
  return encoded;
}

}  // namespace device
