#include "device/screen/PNGImage.h"

#include <spng.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

namespace device {

namespace {

constexpr std::uint32_t mostPixels = 4096;                  // across and down
constexpr std::size_t largestChunk = std::size_t{1} << 24;  // other than of pixels

using Context = std::unique_ptr<spng_ctx, void (*)(spng_ctx*)>;

std::uint32_t multiplied(std::uint32_t colour, std::uint32_t alpha) {
  const std::uint32_t product = colour * alpha + 0x80;
  return (product + (product >> 8)) >> 8;
}

/// From red, green, blue and alpha to what the drawing library has: one number, the colours multiplied by the alpha.
std::uint32_t putTogether(const unsigned char* from) {
  const std::uint32_t alpha = from[3];
  if (alpha == 0xff) return 0xff000000 | std::uint32_t{from[0]} << 16 | std::uint32_t{from[1]} << 8 | from[2];
  return alpha << 24 | multiplied(from[0], alpha) << 16 | multiplied(from[1], alpha) << 8 | multiplied(from[2], alpha);
}

void takeApart(std::uint32_t pixel, unsigned char* out) {
  const std::uint32_t alpha = pixel >> 24;
  for (int channel = 0; channel < 3; ++channel) {
    const std::uint32_t colour = pixel >> (16 - 8 * channel) & 0xff;
    const std::uint32_t whole = alpha == 0xff ? colour : alpha == 0 ? 0 : (colour * 255 + alpha / 2) / alpha;
    out[channel] = static_cast<unsigned char>(whole);
  }
  out[3] = static_cast<unsigned char>(alpha);
}

std::size_t pixelCount(cairo_surface_t* picture) {
  return std::size_t(cairo_image_surface_get_width(picture)) * std::size_t(cairo_image_surface_get_height(picture));
}

}  // namespace

Surface readPNG(platform::BytesView png) {
  Surface none(nullptr, &cairo_surface_destroy);
  const Context context(spng_ctx_new(0), &spng_ctx_free);
  if (!context) return none;
  spng_set_image_limits(context.get(), mostPixels, mostPixels);
  spng_set_chunk_limits(context.get(), largestChunk, largestChunk);
  spng_set_crc_action(context.get(), SPNG_CRC_ERROR, SPNG_CRC_DISCARD);
  spng_ihdr head{};
  if (spng_set_png_buffer(context.get(), png.data(), png.size()) != 0 || spng_get_ihdr(context.get(), &head) != 0)
    return none;
  Surface surface(
      cairo_image_surface_create(CAIRO_FORMAT_ARGB32, static_cast<int>(head.width), static_cast<int>(head.height)),
      &cairo_surface_destroy);
  unsigned char* pixels = cairo_image_surface_get_data(surface.get());
  if (!pixels) return none;
  // A row of this format has no gap behind it.
  const std::size_t size = 4 * pixelCount(surface.get());
  if (spng_decode_image(context.get(), pixels, size, SPNG_FMT_RGBA8, SPNG_DECODE_TRNS) != 0) return none;
  for (std::size_t at = 0; at < size; at += 4) {
    const std::uint32_t pixel = putTogether(pixels + at);
    std::memcpy(pixels + at, &pixel, sizeof(pixel));
  }
  cairo_surface_mark_dirty(surface.get());
  return surface;
}

bool writePNG(cairo_surface_t* picture, platform::Bytes& out) {
  cairo_surface_flush(picture);
  const unsigned char* pixels = cairo_image_surface_get_data(picture);
  const Context context(spng_ctx_new(SPNG_CTX_ENCODER), &spng_ctx_free);
  if (!pixels || !context) return false;
  std::vector<unsigned char> whole(4 * pixelCount(picture));
  for (std::size_t at = 0; at < whole.size(); at += 4) {
    std::uint32_t pixel = 0;
    std::memcpy(&pixel, pixels + at, sizeof(pixel));
    takeApart(pixel, &whole[at]);
  }
  spng_ihdr head{};
  head.width = static_cast<std::uint32_t>(cairo_image_surface_get_width(picture));
  head.height = static_cast<std::uint32_t>(cairo_image_surface_get_height(picture));
  head.bit_depth = 8;
  head.color_type = SPNG_COLOR_TYPE_TRUECOLOR_ALPHA;
  // Several times as fast as the usual level with filters, and hardly larger.
  spng_set_option(context.get(), SPNG_IMG_COMPRESSION_LEVEL, 1);
  spng_set_option(context.get(), SPNG_FILTER_CHOICE, SPNG_DISABLE_FILTERING);
  spng_set_option(context.get(), SPNG_ENCODE_TO_BUFFER, 1);
  if (spng_set_ihdr(context.get(), &head) != 0 ||
      spng_encode_image(context.get(), whole.data(), whole.size(), SPNG_FMT_PNG, SPNG_ENCODE_FINALIZE) != 0)
    return false;
  std::size_t size = 0;
  int error = 0;
  const std::unique_ptr<void, void (*)(void*)> bytes(spng_get_png_buffer(context.get(), &size, &error), &std::free);
  if (bytes) out.append(static_cast<const char*>(bytes.get()), size);
  return bytes != nullptr;
}

}  // namespace device
