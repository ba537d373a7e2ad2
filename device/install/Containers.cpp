#include "device/install/Containers.h"

#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>

#include "platform/DevicePaths.h"
#include "plist/PropertyList.h"

namespace device {

namespace {

constexpr std::uint64_t maximumIconBytes = std::uint64_t{16} << 20;
constexpr std::string_view iconName = "Icon.png";

/// Drawn anew for each container, so that no name is ever used twice. Nothing when the system has no random numbers.
std::optional<std::string> drawName() {
  std::array<unsigned char, 16> drawn{};
  if (::getentropy(drawn.data(), drawn.size()) != 0) return std::nullopt;
  constexpr char digits[] = "0123456789ABCDEF";
  std::string name;
  for (std::size_t i = 0; i < drawn.size(); ++i) {
    if (i == 4 || i == 6 || i == 8 || i == 10) name += '-';
    name += digits[drawn[i] >> 4];
    name += digits[drawn[i] & 15];
  }
  return name;
}

/// Store metadata comes from the host; what XML cannot carry is kept in binary.
std::optional<platform::Bytes> bytesOfMetadata(const platform::Value& metadata, platform::ErrorRef* error) {
  auto bytes = plist::writeXML(metadata, error);
  return bytes ? bytes : plist::writeBinary(metadata, error);
}

/// What stands for the metadata in the checksum: they may be changed while the app is a placeholder, and are whole
/// whenever they can be read.
std::optional<platform::Bytes> traceOfMetadata(bool isThere) {
  return isThere ? std::optional<platform::Bytes>("metadata") : std::nullopt;
}

/// A checksum over contents in their order; FNV-1a.
class FilesSum {
 public:
  void add(const std::optional<platform::Bytes>& content) {
    mix(content ? std::to_string(content->size()) + '/' : "-");
    if (content) mix(*content);
  }
  std::uint64_t value() const { return _value == 0 ? 1 : _value; }

 private:
  void mix(std::string_view bytes) {
    for (unsigned char byte : bytes) _value = (_value ^ byte) * 0x100000001b3;
  }

  std::uint64_t _value = 0xcbf29ce484222325;
};

}  // namespace

std::optional<std::string> Containers::makeFresh(platform::ErrorRef* error) {
  for (int attempt = 0; attempt < 4; ++attempt) {
    const auto name = drawName();
    if (!name) break;
    std::string container = std::string(containersDirectory) + '/' + *name;
    platform::ErrorRef reason;
    bool made = _files.createDirectory(container, false, {}, &reason);
    if (!made && reason->code() == ENOENT) made = _files.createDirectory(container, true, {}, &reason);
    if (!made && reason->code() == EEXIST) continue;
    platform::setError(error, reason);
    return made ? std::optional(container) : std::nullopt;
  }
  platform::setError(error, platform::makeError("FileSystem", 17, "no fresh container name"));
  return std::nullopt;
}

bool Containers::writeNew(const std::string& path, platform::BytesView content, platform::ErrorRef* error) {
  auto writer = _files.createNew(path, false, error);
  return writer && writer->write(content, error) && writer->close(false, error);
}

std::optional<std::uint64_t> Containers::writePlaceholder(const std::string& container, const std::string& bundle,
                                                          platform::Value info,
                                                          const std::optional<std::string>& iconPath,
                                                          const platform::Value& metadata, platform::ErrorRef* error) {
  std::string directory = container + '/' + bundle;
  if (!_files.createDirectory(directory, false, {}, error)) return std::nullopt;
  FilesSum sum;
  auto write = [&](const std::string& path, const std::optional<platform::Bytes>& content) {
    sum.add(content);
    return content && writeNew(path, *content, error);
  };
  std::optional<platform::Bytes> icon;
  if (iconPath) {
    auto attributes = _files.attributesOfItem(*iconPath);
    if (attributes && !attributes->isDirectory && attributes->size <= maximumIconBytes)
      icon = _files.readFile(*iconPath);
    if (icon) info.dictionary()->set("KBBundleIconFile", iconName);
  }
  if (!write(directory + '/' + std::string(iconName), icon) && icon) return std::nullopt;
  if (!write(directory + "/Info.plist", plist::writeBinary(info, error))) return std::nullopt;
  sum.add(traceOfMetadata(!metadata.isAbsent()));
  if (!metadata.isAbsent() && !writeMetadata(container, metadata, error)) return std::nullopt;
  return sum.value();
}

std::uint64_t Containers::placeholderSum(const std::string& container, const std::string& bundle) {
  FilesSum sum;
  sum.add(_files.readFile(container + '/' + bundle + '/' + std::string(iconName)));
  sum.add(_files.readFile(container + '/' + bundle + "/Info.plist"));
  auto metadata = _files.readFile(container + '/' + std::string(platform::storeMetadataFileName));
  if (metadata && plist::read(*metadata).isAbsent())
    sum.add(metadata);  // torn
  else
    sum.add(traceOfMetadata(metadata.has_value()));
  return sum.value();
}

bool Containers::writeMetadata(const std::string& container, const platform::Value& metadata,
                               platform::ErrorRef* error) {
  auto bytes = bytesOfMetadata(metadata, error);
  return bytes && writeNew(container + '/' + std::string(platform::storeMetadataFileName), *bytes, error);
}

bool Containers::copyMetadata(const std::string& from, const std::string& to, platform::ErrorRef* error) {
  auto name = '/' + std::string(platform::storeMetadataFileName);
  if (!_files.fileExists(from + name)) return true;
  auto bytes = _files.readFile(from + name, error);
  return bytes && writeNew(to + name, *bytes, error);
}

bool Containers::sync(const std::string& container, platform::ErrorRef* error) {
  return _files.syncItem(container, error);
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
