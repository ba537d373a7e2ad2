#include "tests/SampleContent.h"

#include <cairo.h>

#include <algorithm>
#include <cstdlib>
#include <iterator>
#include <vector>

#include "plist/PropertyList.h"
#include "tests/ZipArchive.h"

namespace tests {

using platform::Bytes;
using platform::Value;

Value dictionaryOf(std::initializer_list<std::pair<std::string_view, Value>> entries) {
  auto value = Value::makeDictionary();
  for (const auto& [key, entry] : entries) value.dictionary()->set(key, entry);
  return value;
}

std::size_t Dice::width() {
  static constexpr std::size_t usual[] = {0, 1, 7, 8, 9, 14, 15, 16, 25, 40}, many[] = {63, 64, 65, 255, 256, 257};
  static constexpr std::size_t most[] = {999, 1000, 1001};
  return oneIn(100) ? of(most) : oneIn(12) ? of(many) : of(usual);
}

std::size_t Dice::size() {
  static constexpr std::size_t usual[] = {0, 1, 14, 15, 255, 256, 257, 1023, 1024, 1025};
  static constexpr std::size_t edges[] = {4096, 64 << 10, 128 << 10, 256 << 10};
  return oneIn(30) ? of(edges) + below(3) - 1 : of(usual);
}

ContentShape ContentShape::drawn(Dice& dice) {
  ContentShape shape;
  shape.seed = dice.below(1u << 31);
  shape.entryKeys = dice.width();
  shape.manifestKeys = dice.width();
  shape.metadataKeys = dice.width();
  shape.files = dice.oneIn(200) ? 300 : dice.oneIn(20) ? 40 : 3 + dice.below(5);
  shape.fileSize = dice.size();
  return shape;
}

namespace {

constexpr std::string_view scripts[] = {"Maps", "Größere Karten", "Карты",           "Χάρτες", "地図帳", "خرائط",
                                        "नक़्शे",  "แผนที่",           "\U0001F5FA\uFE0F"};

/// What a host's lists hold beside what anybody asks for.
class Unread {
 public:
  explicit Unread(std::uint64_t seed) : _dice(seed) {}

  void fill(platform::Dictionary& dictionary, std::size_t keys) {
    for (std::size_t number = 0; number < keys; ++number) {
      std::string key = std::string(_dice.of(scripts)) + " " + std::to_string(dictionary.size());
      // A list of very many keys is one of short values.
      dictionary.set(key, number < 64 ? value(2) : value(0));
    }
  }

 private:
  Value value(int depth) {
    switch (_dice.below(depth > 0 ? 9 : 7)) {
      case 0:
        return _dice.oneIn(2);
      case 1:
        return static_cast<std::int64_t>(_dice.below(1u << 20)) - (1 << 19);
      case 2:
        return ~std::uint64_t{_dice.below(9)};
      case 3:
        return static_cast<double>(_dice.below(1000)) / 8;
      case 4:
        return platform::Date{static_cast<double>(_dice.below(1u << 30))};
      case 5:
        return Value::makeData(Bytes(_dice.below(40), static_cast<char>(_dice.below(256))));
      case 6:
        return text();
      case 7: {
        Value array = Value::makeArray();
        for (std::size_t left = _dice.below(5); left > 0; --left) array.array()->append(value(depth - 1));
        return array;
      }
      default: {
        Value dictionary = Value::makeDictionary();
        static constexpr std::size_t widths[] = {3, 0, 1, 8, 9, 16};
        fill(*dictionary.dictionary(), _dice.mostly(widths));
        return dictionary;
      }
    }
  }

  Value text() {
    std::string text;
    for (std::size_t words = 1 + _dice.below(_dice.oneIn(10) ? 40 : 4); words > 0; --words) text += _dice.of(scripts);
    return text;
  }

  Dice _dice;
};

}  // namespace

Value filledOut(const Value& dictionary, std::size_t keys, std::uint64_t seed) {
  const auto& entries = *dictionary.dictionary();
  // A recording that is kept has little of it.
  static const bool isRecorded = std::getenv("APPSYNC_RECORDINGS") != nullptr;
  if (isRecorded) keys = std::min(keys, entries.size() + 2);
  if (keys <= entries.size()) return dictionary;
  const std::size_t added = keys - entries.size();
  Unread unread(seed);
  auto value = Value::makeDictionary();
  unread.fill(*value.dictionary(), added / 2);
  for (const auto& [key, entry] : entries) value.dictionary()->set(key, entry);
  unread.fill(*value.dictionary(), added - added / 2);
  return value;
}

std::string nameOf(std::string_view identifier) {
  std::size_t sum = 0;
  for (char c : identifier) sum += static_cast<unsigned char>(c);
  return std::string(scripts[sum % std::size(scripts)]) + " of " + std::string(identifier);
}

Bytes packageOf(const std::string& identifier, const std::string& version, const ContentShape& shape) {
  const Value manifest = dictionaryOf(
      {{"KBBundleIdentifier", identifier}, {"KBBundleVersion", version}, {"KBBundleDisplayName", nameOf(identifier)}});
  std::vector<ZipArchive::Entry> entries = {
      {"Maps.app/Info.plist", *plist::writeBinary(filledOut(manifest, shape.manifestKeys, shape.seed))}};
  Dice dice(shape.seed);
  for (std::size_t number = 0; number < shape.files; ++number) {
    // Every other folder is listed before its files.
    std::string folder = "Maps.app/" + std::string(scripts[number % std::size(scripts)]) + '/';
    if (number % 2 == 0 && number < std::size(scripts)) entries.push_back({folder, "", 040755});
    std::size_t size = number == 0 ? shape.fileSize : dice.below(std::min<std::size_t>(shape.fileSize, 2000) + 1);
    entries.push_back({folder + "tiles " + std::to_string(number), Bytes(size, static_cast<char>('0' + number % 10)),
                       number % 3 == 0 ? 0104755u : 0100644u});
  }
  return ZipArchive::of(entries);
}

Bytes pngOf(int width, int height) {
  Bytes bytes;
  auto* surface = cairo_image_surface_create(CAIRO_FORMAT_ARGB32, width, height);
  auto* context = cairo_create(surface);
  cairo_set_source_rgb(context, 0.9, 0.3, 0.1);
  cairo_paint(context);
  cairo_destroy(context);
  cairo_surface_write_to_png_stream(
      surface,
      [](void* out, const unsigned char* data, unsigned length) {
        static_cast<Bytes*>(out)->append(reinterpret_cast<const char*>(data), length);
        return CAIRO_STATUS_SUCCESS;
      },
      &bytes);
  cairo_surface_destroy(surface);
  return bytes;
}

}  // namespace tests
