// A bundle's icon file, through the icon service.

#include <array>
#include <cstdint>
#include <string>

#include "device/LocalDevice.h"
#include "fuzz/Require.h"
#include "platform/IconRenderer.h"
#include "plist/PropertyList.h"

namespace {

using fuzz::require;

constexpr char bundle[] = "/var/mobile/tmp/App.app";
constexpr std::size_t chunkOverhead = 12;  // length, type, checksum

std::uint32_t checksum(platform::BytesView bytes) {
  static const auto table = [] {
    std::array<std::uint32_t, 256> entries{};
    for (std::uint32_t byte = 0; byte < 256; ++byte) {
      entries[byte] = byte;
      for (int bit = 0; bit < 8; ++bit) entries[byte] = entries[byte] >> 1 ^ (entries[byte] & 1 ? 0xedb88320 : 0);
    }
    return entries;
  }();
  std::uint32_t sum = 0xffffffff;
  for (char byte : bytes) sum = sum >> 8 ^ table[(sum ^ static_cast<unsigned char>(byte)) & 0xff];
  return ~sum;
}

std::uint32_t numberAt(platform::BytesView png, std::size_t at) {
  std::uint32_t number = 0;
  for (std::size_t byte = 0; byte < 4; ++byte) number = number << 8 | static_cast<unsigned char>(png[at + byte]);
  return number;
}

/// Checksums stop a fuzzer, not somebody who means harm: every chunk gets the right one.
void correctChecksums(platform::Bytes& png) {
  for (std::size_t at = 8; png.size() >= at + chunkOverhead;) {
    std::size_t length = numberAt(png, at);
    if (length > png.size() - at - chunkOverhead) return;
    std::uint32_t sum = checksum(platform::BytesView(png).substr(at + 4, length + 4));
    at += length + chunkOverhead;
    for (std::size_t byte = 1; byte <= 4; ++byte, sum >>= 8) png[at - byte] = static_cast<char>(sum & 0xff);
  }
}

device::LocalDevice& phone() {
  static const auto device = [] {
    auto made = device::makeMemoryDevice(device::makeManualEventQueue(), {});
    platform::Value manifest = platform::Value::makeDictionary();
    manifest.dictionary()->set("KBBundleIconFile", "Icon.png");
    require(made->set("icon-size", "16"), "a small icon");
    require(made->files().createDirectory(bundle, true, {}), "a bundle");
    made->files().createFile(bundle + std::string("/Info.plist"), *plist::writeBinary(manifest), {});
    return made;
  }();
  return *device;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  platform::Bytes png(reinterpret_cast<const char*>(data), size);
  correctChecksums(png);
  phone().files().createFile(bundle + std::string("/Icon.png"), png, {});
  auto& renderer = phone().platform().iconRenderer;
  auto opened = renderer.KBBundleCreate(renderer.KBURLCreateWithFileSystemPath(bundle, true));
  require(opened != nullptr, "a bundle that is there");
  auto image = renderer.GYCreateDeviceAppropriateHomeScreenIconImageFromBundle(opened);

  std::uint64_t width = size < 24 ? 0 : numberAt(png, 16), height = size < 24 ? 0 : numberAt(png, 20);
  bool isLarge = width * height > 1 << 14;
  if (!image) return isLarge ? -1 : 0;
  require(width <= 4096 && height <= 4096, "the limit of pixels");
  platform::Bytes encoded;
  auto destination = phone().platform().imageEncoder.QGImageDestinationCreateWithData(encoded, "public.png", 1);
  destination->QGImageDestinationAddImage(image);
  require(destination->QGImageDestinationFinalize(), "an image that can be drawn can be written");
  require(encoded.size() > 24 && numberAt(encoded, 16) == 16 && numberAt(encoded, 20) == 16, "an icon of the size set");
  return isLarge ? -1 : 0;
}
