#include <benchmark/benchmark.h>
#include <cairo.h>

#include <cstring>
#include <memory>

#include "bench/Benchmarks.h"
#include "bench/Phone.h"
#include "platform/IconRenderer.h"
#include "plist/PropertyList.h"

// The icon renderer and the encoder against the image library's own reading and writing of the same picture.

namespace bench {

namespace {

using platform::Bytes;
using platform::BytesView;
using Surface = std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)>;
using Pen = std::unique_ptr<cairo_t, void (*)(cairo_t*)>;

constexpr char bundle[] = "/var/mobile/Library/ApplicationSync/HarluneStuff/com.example.maps";

cairo_status_t append(void* out, const unsigned char* data, unsigned length) {
  static_cast<Bytes*>(out)->append(reinterpret_cast<const char*>(data), length);
  return CAIRO_STATUS_SUCCESS;
}

cairo_status_t take(void* in, unsigned char* data, unsigned length) {
  auto& rest = *static_cast<BytesView*>(in);
  if (rest.size() < length) return CAIRO_STATUS_READ_ERROR;
  std::memcpy(data, rest.data(), length);
  rest.remove_prefix(length);
  return CAIRO_STATUS_SUCCESS;
}

/// An icon of the size that the device shows: a shaded ground that leaves the corners out, and circles on it.
Bytes drawIcon() {
  constexpr int side = 120;
  Surface surface(cairo_image_surface_create(CAIRO_FORMAT_ARGB32, side, side), cairo_surface_destroy);
  Pen pen(cairo_create(surface.get()), cairo_destroy);
  std::unique_ptr<cairo_pattern_t, void (*)(cairo_pattern_t*)> shade(cairo_pattern_create_linear(0, 0, side, side),
                                                                     cairo_pattern_destroy);
  cairo_pattern_add_color_stop_rgb(shade.get(), 0, 0.9, 0.4, 0.2);
  cairo_pattern_add_color_stop_rgb(shade.get(), 1, 0.3, 0.1, 0.6);
  cairo_arc(pen.get(), side * 0.5, side * 0.5, side * 0.6, 0, 7);
  cairo_set_source(pen.get(), shade.get());
  cairo_fill(pen.get());
  for (int circle = 1; circle < 6; ++circle) {
    cairo_set_source_rgba(pen.get(), 1, 1, 1, 0.15 * circle);
    cairo_arc(pen.get(), 20 * circle, 100 - 12 * circle, 4 * circle, 0, 7);
    cairo_fill(pen.get());
  }
  Bytes png;
  cairo_surface_write_to_png_stream(surface.get(), append, &png);
  return png;
}

void copyPicture(benchmark::State& state, const Bytes& picture) {
  for (auto _ : state) {
    BytesView rest = picture;
    Surface surface(cairo_image_surface_create_from_png_stream(take, &rest), cairo_surface_destroy);
    Bytes png;
    if (cairo_surface_write_to_png_stream(surface.get(), append, &png) != CAIRO_STATUS_SUCCESS)
      state.SkipWithError("not written");
  }
}

void renderIcon(benchmark::State& state, const Bytes& picture) {
  Phone phone;
  auto manifest = platform::Value::makeDictionary();
  manifest.dictionary()->set("KBBundleIconFile", "icon");
  phone.write(std::string(bundle) + "/Info.plist", plist::writeBinary(manifest).value());
  phone.write(std::string(bundle) + "/icon.png", picture);
  auto& renderer = phone.platform().iconRenderer;
  for (auto _ : state) {
    auto opened = renderer.KBBundleCreate(renderer.KBURLCreateWithFileSystemPath(bundle, true));
    auto image = renderer.GYCreateDeviceAppropriateHomeScreenIconImageFromBundle(opened);
    Bytes png;
    auto destination = phone.platform().imageEncoder.QGImageDestinationCreateWithData(png, "public.png", 1);
    destination->QGImageDestinationAddImage(image);
    if (!destination->QGImageDestinationFinalize()) state.SkipWithError("not rendered");
  }
}

}  // namespace

void IconBenchmarks::add() {
  Bytes picture = drawIcon();
  benchmark::RegisterBenchmark("render an icon", [=](auto& state) { renderIcon(state, picture); });
  benchmark::RegisterBenchmark("copy a picture", [=](auto& state) { copyPicture(state, picture); });
}

void IconBenchmarks::printRows(const Measurements& taken) const {
  double figure = taken["render an icon"] / taken["copy a picture"];
  printRow("render and encode an icon", decimal(figure) + " times the image library's decoding and encoding",
           "at most 1.3", figure <= 1.3);
}

}  // namespace bench
