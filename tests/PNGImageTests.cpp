#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "device/screen/PNGImage.h"

namespace {

using device::Surface;
using platform::Bytes;
using platform::BytesView;

Surface drawn(cairo_format_t format, int width, int height, std::mt19937& random) {
  Surface surface(cairo_image_surface_create(format, width, height), &cairo_surface_destroy);
  auto* pixels = cairo_image_surface_get_data(surface.get());
  const int stride = cairo_image_surface_get_stride(surface.get());
  const bool isNoise = random() % 3 == 0, hasAlpha = format == CAIRO_FORMAT_ARGB32 && random() % 3 != 0;
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      const std::uint32_t alpha = hasAlpha ? (isNoise ? random() % 256 : std::uint32_t(x + y) * 5 % 256) : 255;
      std::uint32_t pixel = alpha << 24;
      for (int shift : {16, 8, 0}) {
        const std::uint32_t colour = isNoise ? random() % 256 : std::uint32_t(x * shift + y * 3) % 256;
        pixel |= (colour * alpha / 255) << shift;
      }
      std::memcpy(pixels + std::ptrdiff_t{stride} * y + std::ptrdiff_t{4} * x, &pixel, 4);
    }
  }
  cairo_surface_mark_dirty(surface.get());
  return surface;
}

Bytes writtenByLibrary(cairo_surface_t* surface) {
  Bytes bytes;
  cairo_surface_write_to_png_stream(
      surface,
      [](void* out, const unsigned char* data, unsigned length) {
        static_cast<Bytes*>(out)->append(reinterpret_cast<const char*>(data), length);
        return CAIRO_STATUS_SUCCESS;
      },
      &bytes);
  return bytes;
}

Surface readByLibrary(BytesView png) {
  return Surface(cairo_image_surface_create_from_png_stream(
                     [](void* rest, unsigned char* data, unsigned length) {
                       auto& bytes = *static_cast<BytesView*>(rest);
                       if (bytes.size() < length) return CAIRO_STATUS_READ_ERROR;
                       std::memcpy(data, bytes.data(), length);
                       bytes.remove_prefix(length);
                       return CAIRO_STATUS_SUCCESS;
                     },
                     &png),
                 &cairo_surface_destroy);
}

/// Size and pixels, those of a picture without alpha as if it had one; empty for no picture.
std::string facts(const Surface& surface) {
  if (!surface || cairo_surface_status(surface.get()) != CAIRO_STATUS_SUCCESS) return "";
  const int width = cairo_image_surface_get_width(surface.get()),
            height = cairo_image_surface_get_height(surface.get());
  const bool isOpaque = cairo_image_surface_get_format(surface.get()) == CAIRO_FORMAT_RGB24;
  std::string text = std::to_string(width) + 'x' + std::to_string(height) + ' ';
  for (int y = 0; y < height; ++y) {
    const auto* row =
        cairo_image_surface_get_data(surface.get()) + std::ptrdiff_t{cairo_image_surface_get_stride(surface.get())} * y;
    for (int x = 0; x < width; ++x) {
      std::uint32_t pixel = 0;
      std::memcpy(&pixel, row + std::ptrdiff_t{4} * x, 4);
      text += std::to_string(isOpaque ? pixel | 0xff000000 : pixel) + ',';
    }
  }
  return text;
}

TEST(PNGImage, readsWhatTheLibraryWritesAndTheOtherWayRound) {
  std::mt19937 random(1);
  for (int round = 0; round < 60; ++round) {
    SCOPED_TRACE(round);
    const int width = 1 + static_cast<int>(random() % 90), height = 1 + static_cast<int>(random() % 90);
    auto picture = drawn(round % 4 == 0 ? CAIRO_FORMAT_RGB24 : CAIRO_FORMAT_ARGB32, width, height, random);
    const auto png = writtenByLibrary(picture.get());
    const auto expected = facts(readByLibrary(png));
    EXPECT_TRUE(expected == facts(device::readPNG(png)));
    if (round % 4 == 0) continue;
    Bytes ours = "before";
    ASSERT_TRUE(device::writePNG(picture.get(), ours));
    EXPECT_TRUE(facts(readByLibrary(BytesView(ours).substr(6))) == facts(picture));
    EXPECT_TRUE(facts(device::readPNG(BytesView(ours).substr(6))) == facts(picture));
  }
}

TEST(PNGImage, refusesWhatIsDamaged) {
  std::mt19937 random(2);
  const auto png = writtenByLibrary(drawn(CAIRO_FORMAT_ARGB32, 20, 20, random).get());
  const auto whole = facts(device::readPNG(png));
  ASSERT_NE(whole, "");
  for (std::size_t i = 0; i < png.size(); ++i) {
    auto damaged = png;
    damaged[i] = static_cast<char>(damaged[i] ^ (1 << random() % 8));
    const auto found = facts(device::readPNG(damaged));
    EXPECT_TRUE(found.empty() || found == whole) << i;
    EXPECT_TRUE(i >= 33 || found.empty()) << i << " is in what says that it is a PNG, and of which size";
    const auto cut = facts(device::readPNG(BytesView(png).substr(0, i)));
    EXPECT_TRUE(cut.empty() || (i >= png.size() - 16 && cut == whole)) << i;
  }
}

TEST(PNGImage, readsGreyPicturesAndRefusesLargeOnes) {
  const Surface grey(cairo_image_surface_create(CAIRO_FORMAT_A8, 4, 4), &cairo_surface_destroy);
  const auto read = device::readPNG(writtenByLibrary(grey.get()));
  ASSERT_TRUE(read);
  EXPECT_EQ(cairo_image_surface_get_width(read.get()), 4);
  const Surface wide(cairo_image_surface_create(CAIRO_FORMAT_A8, 4097, 1), &cairo_surface_destroy);
  EXPECT_FALSE(device::readPNG(writtenByLibrary(wide.get())));
}

}  // namespace
