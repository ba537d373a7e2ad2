#include "tests/SampleContent.h"

#include <cairo.h>

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

Bytes packageOf(const std::string& identifier, const std::string& version) {
  auto manifest = plist::writeBinary(dictionaryOf(
      {{"KBBundleIdentifier", identifier}, {"KBBundleVersion", version}, {"KBBundleDisplayName", "Packaged"}}));
  return ZipArchive::of({{"Maps.app/Info.plist", *manifest}, {"Maps.app/data/tiles", "0123456789", 0104755}});
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
