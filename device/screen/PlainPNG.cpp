#include "device/screen/PlainPNG.h"

#include <libdeflate.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string_view>
#include <vector>

namespace device {

using platform::Bytes;
using platform::BytesView;

namespace {

constexpr BytesView signature("\x89PNG\r\n\x1a\n", 8);
constexpr std::size_t mostPixels = std::size_t{1} << 20;
constexpr unsigned char trueColour = 2, trueColourWithAlpha = 6;

/// Of a chunk: its length, its kind, and the checksum behind it.
constexpr std::size_t aroundChunk = 12;

std::uint32_t bigEndian(const char* bytes) {
  std::uint32_t number = 0;
  for (int i = 0; i < 4; ++i) number = number << 8 | static_cast<unsigned char>(bytes[i]);
  return number;
}

void appendBigEndian(Bytes& out, std::uint32_t number) {
  for (int shift = 24; shift >= 0; shift -= 8) out += static_cast<char>(number >> shift & 0xff);
}

/// The next chunk, taken off the bytes; nothing when it is not whole.
struct Chunk {
  BytesView kind;
  BytesView content;
};
std::optional<Chunk> takeChunk(BytesView& rest) {
  if (rest.size() < aroundChunk) return std::nullopt;
  const std::uint32_t length = bigEndian(rest.data());
  if (length > rest.size() - aroundChunk) return std::nullopt;
  const BytesView summed = rest.substr(4, 4 + std::size_t{length});
  if (libdeflate_crc32(0, summed.data(), summed.size()) != bigEndian(rest.data() + 8 + length)) return std::nullopt;
  rest.remove_prefix(aroundChunk + length);
  return Chunk{summed.substr(0, 4), summed.substr(4)};
}

/// Whether a chunk says nothing of how the pixels are to be understood.
bool isRemark(BytesView kind) {
  constexpr std::array<BytesView, 10> remarks{"bKGD", "cHRM", "gAMA", "iCCP", "iTXt",
                                              "pHYs", "sRGB", "tEXt", "tIME", "zTXt"};
  return std::find(remarks.begin(), remarks.end(), kind) != remarks.end();
}

struct Packed {
  std::uint32_t width = 0;
  std::uint32_t height = 0;
  std::size_t channels = 0;
  Bytes rows;
};

bool readHead(const Chunk& chunk, Packed& picture) {
  if (chunk.kind != "IHDR" || chunk.content.size() != 13) return false;
  picture.width = bigEndian(chunk.content.data());
  picture.height = bigEndian(chunk.content.data() + 4);
  const auto colour = static_cast<unsigned char>(chunk.content[9]);
  picture.channels = colour == trueColourWithAlpha ? 4 : 3;
  // Eight bits, and the only ways of packing and of filtering that there are, in one pass.
  const bool isPlain = chunk.content[8] == 8 && (colour == trueColour || colour == trueColourWithAlpha) &&
                       chunk.content.substr(10) == BytesView("\0\0\0", 3);
  return isPlain && picture.width > 0 && picture.height > 0 && picture.width <= mostPixels &&
         picture.height <= mostPixels / picture.width;
}

std::optional<Packed> readPacked(BytesView png) {
  if (png.substr(0, signature.size()) != signature) return std::nullopt;
  png.remove_prefix(signature.size());
  Packed picture;
  auto chunk = takeChunk(png);
  if (!chunk || !readHead(*chunk, picture)) return std::nullopt;
  bool isOver = false;
  while ((chunk = takeChunk(png))) {
    if (chunk->kind == "IEND") return picture;
    const bool isRows = chunk->kind == "IDAT";
    // The rows' chunks follow one another.
    if (isRows ? isOver : !isRemark(chunk->kind)) return std::nullopt;
    if (isRows) picture.rows += chunk->content;
    isOver = !isRows && !picture.rows.empty();
  }
  return std::nullopt;
}

/// The channels of a pixel side by side, so that one instruction does for all of them; half of it is unused.
using Lanes = short __attribute__((vector_size(16)));
using Narrow = unsigned char __attribute__((vector_size(8)));

template <std::size_t channels>
Lanes lanesOf(const unsigned char* pixel) {
  Narrow bytes{};
  std::memcpy(&bytes, pixel, channels);
  return __builtin_convertvector(bytes, Lanes);
}

Lanes either(Lanes condition, Lanes one, Lanes other) { return (condition & one) | (~condition & other); }
Lanes magnitude(Lanes number) { return either(number < 0, -number, number); }

/// The neighbour that a byte is most like: left, above, or left of that.
Lanes likeliest(Lanes left, Lanes above, Lanes corner) {
  const Lanes toLeft = magnitude(above - corner), toAbove = magnitude(left - corner);
  const Lanes toCorner = magnitude(left + above - corner - corner);
  return either((toLeft <= toAbove) & (toLeft <= toCorner), left, either(toAbove <= toCorner, above, corner));
}

/// Adds to each byte what was expected of it by those of the neighbouring pixels, left of the row being nothing.
template <std::size_t channels, class Expected>
void add(unsigned char* row, const unsigned char* above, std::size_t length, Expected&& expected) {
  Lanes left{}, corner{};
  for (std::size_t i = 0; i < length; i += channels) {
    const Lanes up = lanesOf<channels>(above + i);
    left = (lanesOf<channels>(row + i) + expected(left, up, corner)) & 0xff;
    corner = up;
    const auto bytes = __builtin_convertvector(left, Narrow);
    std::memcpy(row + i, &bytes, channels);
  }
}

/// False for a filter that there is not.
template <std::size_t channels>
bool unfilter(unsigned char filter, unsigned char* row, const unsigned char* above, std::size_t length) {
  switch (filter) {
    case 0:
      return true;
    case 1:
      add<channels>(row, above, length, [](Lanes left, Lanes, Lanes) { return left; });
      return true;
    case 2:
      for (std::size_t i = 0; i < length; ++i) row[i] = static_cast<unsigned char>(row[i] + above[i]);
      return true;
    case 3:
      add<channels>(row, above, length, [](Lanes left, Lanes up, Lanes) { return (left + up) >> 1; });
      return true;
    case 4:
      add<channels>(row, above, length, likeliest);
      return true;
    default:
      return false;
  }
}

std::uint32_t multiplied(std::uint32_t colour, std::uint32_t alpha) {
  const std::uint32_t product = colour * alpha + 0x80;
  return (product + (product >> 8)) >> 8;
}

/// As the drawing library has it: the colours multiplied by the alpha.
std::uint32_t putTogether(const unsigned char* from, std::size_t channels) {
  const std::uint32_t alpha = channels == 4 ? from[3] : 0xff;
  if (alpha == 0xff) return 0xff000000 | std::uint32_t{from[0]} << 16 | std::uint32_t{from[1]} << 8 | from[2];
  return alpha << 24 | multiplied(from[0], alpha) << 16 | multiplied(from[1], alpha) << 8 | multiplied(from[2], alpha);
}

/// As PNG has it: red, green, blue, alpha, the colours not multiplied by the alpha.
void takeApart(std::uint32_t pixel, unsigned char* out) {
  const std::uint32_t alpha = pixel >> 24;
  for (int channel = 0; channel < 3; ++channel) {
    const std::uint32_t colour = pixel >> (16 - 8 * channel) & 0xff;
    const std::uint32_t whole = alpha == 0xff ? colour : alpha == 0 ? 0 : (colour * 255 + alpha / 2) / alpha;
    out[channel] = static_cast<unsigned char>(whole);
  }
  out[3] = static_cast<unsigned char>(alpha);
}

void appendChunk(Bytes& out, BytesView kind, BytesView content) {
  appendBigEndian(out, static_cast<std::uint32_t>(content.size()));
  const std::size_t begin = out.size();
  out += kind;
  out += content;
  appendBigEndian(out, libdeflate_crc32(0, out.data() + begin, out.size() - begin));
}

/// The rows, each behind the number of its filter, which is none.
std::vector<unsigned char> rowsOf(cairo_surface_t* picture) {
  const auto width = static_cast<std::size_t>(cairo_image_surface_get_width(picture));
  const auto height = static_cast<std::size_t>(cairo_image_surface_get_height(picture));
  const auto stride = static_cast<std::size_t>(cairo_image_surface_get_stride(picture));
  const unsigned char* pixels = cairo_image_surface_get_data(picture);
  std::vector<unsigned char> rows((1 + 4 * width) * height);
  auto* out = rows.data();
  for (std::size_t y = 0; y < height; ++y) {
    ++out;
    for (std::size_t x = 0; x < width; ++x, out += 4) {
      std::uint32_t pixel = 0;
      std::memcpy(&pixel, pixels + stride * y + 4 * x, 4);
      takeApart(pixel, out);
    }
  }
  return rows;
}

}  // namespace

Surface readPlainPNG(BytesView png) {
  Surface none(nullptr, &cairo_surface_destroy);
  const auto picture = readPacked(png);
  if (!picture) return none;
  const std::size_t length = picture->width * picture->channels;
  // The row above the first one is empty.
  std::vector<unsigned char> rows(length + (1 + length) * picture->height);
  std::unique_ptr<libdeflate_decompressor, void (*)(libdeflate_decompressor*)> unpacking(
      libdeflate_alloc_decompressor(), &libdeflate_free_decompressor);
  if (!unpacking ||
      libdeflate_zlib_decompress(unpacking.get(), picture->rows.data(), picture->rows.size(), rows.data() + length,
                                 rows.size() - length, nullptr) != LIBDEFLATE_SUCCESS)
    return none;
  Surface surface(cairo_image_surface_create(CAIRO_FORMAT_ARGB32, static_cast<int>(picture->width),
                                             static_cast<int>(picture->height)),
                  &cairo_surface_destroy);
  unsigned char* pixels = cairo_image_surface_get_data(surface.get());
  if (!pixels) return none;
  const auto stride = static_cast<std::size_t>(cairo_image_surface_get_stride(surface.get()));
  const unsigned char* above = rows.data();
  for (std::size_t y = 0; y < picture->height; ++y) {
    unsigned char* row = rows.data() + length + (1 + length) * y + 1;
    const bool isKnown =
        picture->channels == 4 ? unfilter<4>(row[-1], row, above, length) : unfilter<3>(row[-1], row, above, length);
    if (!isKnown) return none;
    above = row;
    for (std::size_t x = 0; x < picture->width; ++x) {
      const std::uint32_t pixel = putTogether(row + x * picture->channels, picture->channels);
      std::memcpy(pixels + stride * y + 4 * x, &pixel, 4);
    }
  }
  cairo_surface_mark_dirty(surface.get());
  return surface;
}

bool writePlainPNG(cairo_surface_t* picture, Bytes& out) {
  constexpr int quickest = 1;  // several times as fast as the usual level, and hardly larger
  const auto rows = rowsOf(picture);
  std::unique_ptr<libdeflate_compressor, void (*)(libdeflate_compressor*)> packing(
      libdeflate_alloc_compressor(quickest), &libdeflate_free_compressor);
  if (!packing) return false;
  Bytes packed(libdeflate_zlib_compress_bound(packing.get(), rows.size()), '\0');
  packed.resize(libdeflate_zlib_compress(packing.get(), rows.data(), rows.size(), packed.data(), packed.size()));
  if (packed.empty()) return false;
  Bytes head;
  appendBigEndian(head, static_cast<std::uint32_t>(cairo_image_surface_get_width(picture)));
  appendBigEndian(head, static_cast<std::uint32_t>(cairo_image_surface_get_height(picture)));
  head += BytesView("\x08\x06\0\0\0", 5);
  out += signature;
  appendChunk(out, "IHDR", head);
  appendChunk(out, "sRGB", BytesView("\0", 1));
  appendChunk(out, "IDAT", packed);
  appendChunk(out, "IEND", "");
  return true;
}

}  // namespace device
