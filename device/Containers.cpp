#include "device/Containers.h"

#include <array>
#include <cstdint>
#include <random>

#include "plist/PropertyList.h"

namespace device {

namespace {

constexpr std::uint64_t maximumIconBytes = std::uint64_t{16} << 20;
constexpr std::string_view iconName = "Icon.png";

/// Drawn anew for each container, so that a name is never used again.
std::string drawName() {
  static thread_local std::random_device source;
  constexpr char digits[] = "0123456789ABCDEF";
  std::string name;
  for (int i = 0; i < 32; ++i) {
    if (i == 8 || i == 12 || i == 16 || i == 20) name += '-';
    name += digits[source() % 16];
  }
  return name;
}

}  // namespace

std::optional<std::string> Containers::makeFresh(platform::ErrorRef* error) {
  for (int attempt = 0; attempt < 4; ++attempt) {
    std::string container = std::string(containersDirectory) + '/' + drawName();
    if (_files.fileExists(container)) continue;
    if (!_files.createDirectory(container, true, {}, error)) return std::nullopt;
    return container;
  }
  platform::setError(error, platform::makeError("FileSystem", 17, "no fresh container name"));
  return std::nullopt;
}

bool Containers::writeNew(const std::string& path, platform::BytesView content, bool durable,
                          platform::ErrorRef* error) {
  auto writer = _files.createNew(path, false, error);
  return writer && writer->write(content, error) && writer->close(durable, error);
}

bool Containers::writePlaceholder(const std::string& container, const std::string& bundle, platform::Value info,
                                  const std::optional<std::string>& iconPath, const platform::Value& metadata,
                                  platform::ErrorRef* error) {
  std::string directory = container + '/' + bundle;
  if (!_files.createDirectory(directory, false, {}, error)) return false;
  if (iconPath) {
    auto attributes = _files.attributesOfItem(*iconPath);
    std::optional<platform::Bytes> icon;
    if (attributes && !attributes->isDirectory && attributes->size <= maximumIconBytes)
      icon = _files.readFile(*iconPath);
    if (icon) {
      if (!writeNew(directory + '/' + std::string(iconName), *icon, false, error)) return false;
      info.dictionary()->set("KBBundleIconFile", iconName);
    }
  }
  auto bytes = plist::writeBinary(info, error);
  if (!bytes || !writeNew(directory + "/Info.plist", *bytes, false, error)) return false;
  return metadata.isAbsent() || writeMetadata(container, metadata, false, error);
}

bool Containers::writeMetadata(const std::string& container, const platform::Value& metadata, bool durable,
                               platform::ErrorRef* error) {
  auto bytes = plist::writeXML(metadata, error);
  // Store metadata comes from the host; what XML cannot carry is kept in the other form.
  if (!bytes) bytes = plist::writeBinary(metadata, error);
  return bytes && writeNew(container + '/' + std::string(storeMetadataName), *bytes, durable, error);
}

bool Containers::copyMetadata(const std::string& from, const std::string& to, platform::ErrorRef* error) {
  auto name = '/' + std::string(storeMetadataName);
  if (!_files.fileExists(from + name)) return true;
  auto bytes = _files.readFile(from + name, error);
  return bytes && writeNew(to + name, *bytes, true, error);
}

bool Containers::sync(const std::string& container, platform::ErrorRef* error) {
  return _files.syncDirectory(container, error) && _files.syncDirectory(containersDirectory, error);
}

void Containers::remove(const std::string& container) {
  if (container.size() > containersDirectory.size() + 1 &&
      container.compare(0, containersDirectory.size(), containersDirectory) == 0)
    _files.removeItem(container);
}

void Containers::removeAllBut(const std::set<std::string>& containers) {
  auto entries = _files.list(containersDirectory);
  if (!entries) return;
  for (const auto& entry : *entries) {
    std::string path = std::string(containersDirectory) + '/' + entry.name;
    if (!containers.count(path)) _files.removeItem(path);
  }
}

}  // namespace device
