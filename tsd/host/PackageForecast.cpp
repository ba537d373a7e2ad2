#include "tsd/host/PackageForecast.h"

#include <fcntl.h>

#include <algorithm>
#include <cstdint>

#include "device/files/DiskFileTree.h"
#include "device/package/PackageManifest.h"
#include "tsd/CommandError.h"
#include "tsd/conduit/HostFile.h"
#include "tsd/conduit/HostFolder.h"

namespace tsd {

namespace {

/// The number at the front of a part between dots; 0 if there is no number.
std::uint64_t partOf(std::string_view version, std::size_t& at) {
  std::uint64_t number = 0;
  bool isNumber = true;
  for (; at < version.size() && version[at] != '.'; ++at) {
    isNumber = isNumber && version[at] >= '0' && version[at] <= '9';
    if (isNumber && number < UINT64_MAX / 10 - 1) number = number * 10 + static_cast<std::uint64_t>(version[at] - '0');
  }
  ++at;
  return number;
}

/// Whether the version is older than the other, compared part by part.
bool isOlder(std::string_view version, std::string_view other) {
  for (std::size_t one = 0, two = 0; one < version.size() || two < other.size();) {
    auto left = partOf(version, one), right = partOf(other, two);
    if (left != right) return left < right;
  }
  return false;
}

}  // namespace

PackageForecast forecastOf(const std::string& host, const std::string& app) {
  if (!isFileName(app)) return {"the identifier cannot be a package's name", ""};
  const std::string folder = host + "/" + std::string(packagesName);
  const std::string file = app + ".pkg";
  platform::ErrorRef error;
  if (!HostFile::open(folder, file, &error)) return {folder + "/" + file + ": " + textOf(error), ""};
  device::FileDescriptor root(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  device::DiskFileTree files(std::move(root), nullptr);
  auto manifest = device::readPackageManifest(files, "/" + file, &error);
  if (!manifest) return {folder + "/" + file + ": " + textOf(error), ""};
  if (manifest->identifier != app)
    return {
        "package \"" + folder + "/" + file + "\" holds the app \"" + manifest->identifier + "\", not \"" + app + '"',
        manifest->version};
  return {"", manifest->version};
}

std::string updateText(const std::string& listed, const std::string& packaged, const std::string& present) {
  const std::string& version = packaged.empty() ? listed : packaged;
  if (version.empty()) return present.empty() ? "" : "over " + present;
  std::string text = version + (present.empty() ? "" : " over " + present);
  if (!listed.empty() && listed != version) text += " (the host's list says " + listed + ")";
  if (present.empty()) return text;
  if (version == present) return text + ", the same version again";
  return text + (isOlder(version, present) ? ", a downgrade" : "");
}

}  // namespace tsd
