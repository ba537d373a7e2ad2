#include "device/package/PackageManifest.h"

#include <archive.h>
#include <archive_entry.h>

#include <exception>

#include "device/package/PackageSource.h"
#include "device/package/UTF8Locale.h"
#include "plist/PropertyList.h"

namespace device {

namespace {

constexpr std::size_t maximumEntries = 100'000;
constexpr std::size_t maximumManifestBytes = std::size_t{16} << 20;

platform::ErrorRef packageError(const std::string& text) { return platform::makeError("Package", 1, text); }

/// "Some.app/Info.plist"
bool isManifest(std::string_view name) {
  constexpr std::string_view end = ".app/Info.plist";
  return name.size() > end.size() && name.substr(name.size() - end.size()) == end &&
         name.find('/') == name.size() - end.size() + 4;
}

/// The manifest's bytes; nothing with a reason.
std::optional<platform::Bytes> findManifest(PackageSource& source, std::string& reason) {
  struct archive_entry* entry = nullptr;
  for (std::size_t count = 0; count < maximumEntries; ++count) {
    int status = source.next(&entry);
    if (status == ARCHIVE_EOF) break;
    if (status != ARCHIVE_OK) {
      reason = "damaged: " + source.reason();
      return std::nullopt;
    }
    const char* name = archive_entry_pathname_utf8(entry);
    if (!name || archive_entry_filetype(entry) != AE_IFREG || !isManifest(name)) continue;
    platform::Bytes bytes;
    char buffer[4096];
    la_ssize_t size = 0;
    while ((size = archive_read_data(source.archive(), buffer, sizeof buffer)) > 0 &&
           bytes.size() <= maximumManifestBytes)
      bytes.append(buffer, static_cast<std::size_t>(size));
    if (size == 0) return bytes;
    reason = size < 0 ? "its manifest is damaged: " + source.reason() : "its manifest is too large";
    return std::nullopt;
  }
  reason = "no manifest in an \".app\" folder";
  return std::nullopt;
}

std::optional<PackageManifest> manifestIn(FileTree& files, std::string_view path, std::string& reason) {
  const UTF8Locale utf8;
  PackageSource source(files);
  platform::ErrorRef error;
  if (!source.open(path, &error)) {
    reason = error ? error->description() : "unreadable";
    return std::nullopt;
  }
  auto bytes = findManifest(source, reason);
  if (!bytes) return std::nullopt;
  const platform::Value manifest = plist::read(std::move(*bytes), &error);
  const auto* facts = manifest.dictionary();
  auto identifier = facts ? (*facts)["KBBundleIdentifier"].string() : std::nullopt;
  if (!identifier || identifier->empty()) {
    reason = facts ? "its manifest has no \"KBBundleIdentifier\""
                   : "its manifest is not a dictionary" + (error ? ": " + error->description() : "");
    return std::nullopt;
  }
  return PackageManifest{std::string(*identifier), std::string((*facts)["KBBundleVersion"].string().value_or(""))};
}

}  // namespace

std::optional<PackageManifest> readPackageManifest(FileTree& files, std::string_view packagePath,
                                                   platform::ErrorRef* error) {
  std::string reason;
  try {
    if (auto manifest = manifestIn(files, packagePath, reason)) return manifest;
  } catch (const std::exception& exception) {
    reason = exception.what();
  }
  platform::setError(error, packageError("package \"" + std::string(packagePath) + "\": " + reason));
  return std::nullopt;
}

}  // namespace device
