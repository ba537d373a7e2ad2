#include "device/screen/IconService.h"

#include <optional>
#include <string>
#include <vector>

#include "device/screen/IconImage.h"
#include "plist/PropertyList.h"

namespace device {

namespace {

constexpr const char* className = "IconRenderer";
constexpr std::uint64_t maximumIconBytes = std::uint64_t{16} << 20;
constexpr std::uint64_t maximumManifestBytes = std::uint64_t{16} << 20;

struct LocalURL final : platform::KBURL {
  LocalURL(std::string_view path, bool isDirectory) : path(path), isDirectory(isDirectory) {}
  const std::string path;
  const bool isDirectory;
};

struct LocalBundle final : platform::KBBundle {
  explicit LocalBundle(std::string directory) : directory(std::move(directory)) {}
  const std::string directory;
};

/// The file's bytes; nothing when it is not there or is larger than the limit.
std::optional<platform::Bytes> readUpTo(FileTree& files, const std::string& path, std::uint64_t most) {
  auto attributes = files.attributesOfItem(path);
  if (!attributes || attributes->isDirectory || attributes->size > most) return std::nullopt;
  return files.readFile(path);
}

std::optional<platform::Bytes> readIcon(FileTree& files, const std::string& directory) {
  auto manifest = readUpTo(files, directory + "/Info.plist", maximumManifestBytes);
  if (!manifest) return std::nullopt;
  auto info = plist::read(std::move(*manifest));
  if (!info.dictionary()) return std::nullopt;
  auto name = (*info.dictionary())["KBBundleIconFile"].string();
  if (!name || name->empty()) return std::nullopt;
  auto icon = readUpTo(files, directory + '/' + std::string(*name), maximumIconBytes);
  return icon ? icon : readUpTo(files, directory + '/' + std::string(*name) + ".png", maximumIconBytes);
}

class PNGDestination final : public platform::QGImageDestination {
 public:
  PNGDestination(Boundary& boundary, platform::Bytes& data) : _boundary(boundary), _data(data) {}
  ~PNGDestination() override { _boundary.forgetObject(static_cast<platform::QGImageDestination*>(this)); }

  void QGImageDestinationAddImage(const std::shared_ptr<const platform::GYImage>& image) override {
    _boundary.call({{"QGImageDestination", "QGImageDestinationAddImage"}}, nullptr, {{"image", image}},
                   [&] { _images.push_back(std::dynamic_pointer_cast<const IconImage>(image)); });
  }

  bool QGImageDestinationFinalize() override {
    return _boundary.call({{"QGImageDestination", "QGImageDestinationFinalize"}}, nullptr, {}, [&] {
      // A PNG holds one image, no more and no less.
      return _images.size() == 1 && _images[0] && _images[0]->encodePNG(_data);
    });
  }

 private:
  Boundary& _boundary;
  platform::Bytes& _data;
  std::vector<std::shared_ptr<const IconImage>> _images;
};

}  // namespace

int IconService::iconSize() {
  AppRecords::Lock lock(_records);
  return _records.state().settings.iconSize;
}

std::shared_ptr<const platform::KBURL> IconService::KBURLCreateWithFileSystemPath(std::string_view path,
                                                                                  bool isDirectory) {
  return _boundary.call({{className, "KBURLCreateWithFileSystemPath"}}, nullptr,
                        {{"path", path}, {"isDirectory", isDirectory}},
                        [&]() -> std::shared_ptr<const platform::KBURL> {
                          if (path.empty() || path[0] != '/') return nullptr;
                          return std::make_shared<LocalURL>(path, isDirectory);
                        });
}

std::shared_ptr<const platform::KBBundle> IconService::KBBundleCreate(
    const std::shared_ptr<const platform::KBURL>& url) {
  return _boundary.call({{className, "KBBundleCreate"}}, nullptr, {{"url", url}},
                        [&]() -> std::shared_ptr<const platform::KBBundle> {
                          auto ours = std::dynamic_pointer_cast<const LocalURL>(url);
                          bool isDirectory = false;
                          if (!ours || !_files.fileExists(ours->path, &isDirectory) || !isDirectory) return nullptr;
                          return std::make_shared<LocalBundle>(ours->path);
                        });
}

std::shared_ptr<const platform::GYImage> IconService::GYCreateDeviceAppropriateHomeScreenIconImageFromBundle(
    const std::shared_ptr<const platform::KBBundle>& bundle) {
  return _boundary.call({{className, "GYCreateDeviceAppropriateHomeScreenIconImageFromBundle"}}, nullptr,
                        {{"bundle", bundle}}, [&]() -> std::shared_ptr<const platform::GYImage> {
                          auto ours = std::dynamic_pointer_cast<const LocalBundle>(bundle);
                          auto icon = ours ? readIcon(_files, ours->directory) : std::nullopt;
                          return icon ? IconImage::fromPNG(*icon, iconSize()) : nullptr;
                        });
}

std::unique_ptr<platform::QGImageDestination> PNGEncoder::QGImageDestinationCreateWithData(platform::Bytes& data,
                                                                                           std::string_view type,
                                                                                           std::size_t count) {
  return _boundary.call({{"ImageEncoder", "QGImageDestinationCreateWithData"}}, nullptr,
                        {{"type", type}, {"count", count}}, [&]() -> std::unique_ptr<platform::QGImageDestination> {
                          if (type != "public.png" || count != 1) return nullptr;
                          return std::make_unique<PNGDestination>(_boundary, data);
                        });
}

}  // namespace device
