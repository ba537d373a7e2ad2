#include "core/AppsClient.h"
#include "core/Say.h"
#include "platform/FileSystem.h"
#include "platform/IconRenderer.h"

namespace appsync {

using namespace platform;

bool AppsClient::_makeIconFromBundlePath(const Platform& platform, const std::optional<std::string>& bundlePath,
                                         std::string_view saveTo) {
  Bytes data;
  if (!bundlePath) {
    sayError(platform, "missing bundlePath");
    return false;
  }
  auto url = platform.iconRenderer.KBURLCreateWithFileSystemPath(*bundlePath, true);
  if (!url) {
    sayError(platform, "couldn't create URL");
    return false;
  }
  auto bundle = platform.iconRenderer.KBBundleCreate(url);
  if (!bundle) {
    sayError(platform, "couldn't create bundle from URL");
    return false;
  }
  auto image = platform.iconRenderer.GYCreateDeviceAppropriateHomeScreenIconImageFromBundle(bundle);
  if (!image) {
    sayError(platform, "couldn't create PN icon from bundle");
    return false;
  }
  auto destination = platform.imageEncoder.QGImageDestinationCreateWithData(data, "public.png", 1);
  if (!destination) {
    sayError(platform, "couldn't create image");
    return false;
  }
  destination->QGImageDestinationAddImage(image);
  if (!destination->QGImageDestinationFinalize()) {
    sayError(platform, "Couldn't finalize image");
    return false;
  }
  // Each sync draws the icons anew.
  if (!platform.fileSystem.writeAtomically(saveTo, data, nullptr, Durability::fleeting)) {
    sayError(platform, "Couldn't save image file to %{public}@", saveTo);
    return false;
  }
  return true;
}

}  // namespace appsync
