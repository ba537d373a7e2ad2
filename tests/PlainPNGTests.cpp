#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "device/screen/PlainPNG.h"

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

TEST(PlainPNG, readsWhatTheLibraryWritesAndTheOtherWayRound) {
  std::mt19937 random(1);
  for (int round = 0; round < 60; ++round) {
    SCOPED_TRACE(round);
    const int width = 1 + static_cast<int>(random() % 90), height = 1 + static_cast<int>(random() % 90);
    auto picture = drawn(round % 4 == 0 ? CAIRO_FORMAT_RGB24 : CAIRO_FORMAT_ARGB32, width, height, random);
    const auto png = writtenByLibrary(picture.get());
    const auto expected = facts(readByLibrary(png));
    EXPECT_TRUE(expected == facts(device::readPlainPNG(png)));
    if (round % 4 == 0) continue;
    Bytes ours = "before";
    ASSERT_TRUE(device::writePlainPNG(picture.get(), ours));
    EXPECT_TRUE(facts(readByLibrary(BytesView(ours).substr(6))) == facts(picture));
    EXPECT_TRUE(facts(device::readPlainPNG(BytesView(ours).substr(6))) == facts(picture));
  }
}

TEST(PlainPNG, leavesWhatIsDamagedOrUnusualToTheLibrary) {
  std::mt19937 random(2);
  const auto png = writtenByLibrary(drawn(CAIRO_FORMAT_ARGB32, 20, 20, random).get());
  const auto whole = facts(device::readPlainPNG(png));
  ASSERT_NE(whole, "");
  for (std::size_t i = 0; i < png.size(); ++i) {
    auto damaged = png;
    damaged[i] = static_cast<char>(damaged[i] ^ (1 << random() % 8));
    EXPECT_EQ(device::readPlainPNG(damaged), nullptr) << i;
    EXPECT_EQ(device::readPlainPNG(BytesView(png).substr(0, i)), nullptr) << i;
  }
  EXPECT_EQ(device::readPlainPNG(writtenByLibrary(drawn(CAIRO_FORMAT_ARGB32, 1100, 1000, random).get())), nullptr)
      << "too large to be held twice";
  const Surface grey(cairo_image_surface_create(CAIRO_FORMAT_A8, 4, 4), &cairo_surface_destroy);
  EXPECT_EQ(device::readPlainPNG(writtenByLibrary(grey.get())), nullptr);
}

}  // namespace
