#include "tsd/host/HostPackage.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <utility>
#include <vector>

#include "device/files/DiskFileTree.h"
#include "device/install/AppIdentifier.h"
#include "device/package/PackageTrial.h"
#include "device/package/UTF8Locale.h"
#include "platform/DevicePaths.h"
#include "tsd/CommandError.h"
#include "tsd/conduit/HostFile.h"
#include "tsd/conduit/HostFolder.h"
#include "tsd/host/NewItem.h"
#include "tsd/host/PackageWriter.h"

namespace tsd {

namespace fs = std::filesystem;

namespace {

constexpr std::string_view manifestName = "Info.plist";
constexpr std::string_view bundleEnd = ".app";
constexpr std::size_t pieceSize = std::size_t{1} << 18;

bool isBundleName(const std::string& name) {
  return name.size() > bundleEnd.size() &&
         name.compare(name.size() - bundleEnd.size(), bundleEnd.size(), bundleEnd) == 0;
}

/// What lies in a folder, sorted by name.
std::vector<fs::path> itemsIn(const fs::path& folder) {
  std::error_code problem;
  std::vector<fs::path> items;
  for (fs::directory_iterator at(folder, problem), end; !problem && at != end; at.increment(problem))
    items.push_back(at->path());
  if (problem) throw CommandError(folder.string() + ": " + problem.message());
  std::sort(items.begin(), items.end());
  return items;
}

struct BundleFolder {
  fs::path path;
  std::string name;  // in the package
};

BundleFolder bundleIn(const std::string& folder) {
  std::error_code problem;
  fs::path whole = fs::canonical(folder, problem);
  if (problem) throw CommandError(folder + ": " + problem.message());
  if (!fs::is_directory(whole, problem)) throw CommandError(folder + ": not a folder");
  std::string name = whole.filename().string();
  if (isBundleName(name)) return {folder, name};
  if (isThere(folder + "/" + std::string(manifestName))) return {folder, name + std::string(bundleEnd)};
  auto items = itemsIn(folder);
  if (items.size() == 1 && isBundleName(items.front().filename().string()) &&
      fs::is_directory(fs::symlink_status(items.front(), problem)))
    return {items.front(), items.front().filename().string()};
  throw CommandError(folder + ": no app is in it: neither an " + std::string(manifestName) +
                     " nor one \"NAME.app\" folder alone");
}

class Packing {
 public:
  explicit Packing(const std::string& path) : _package(path, PackageWriter::Content::deflated) {}

  void addFolder(const fs::path& folder, const std::string& name, std::size_t depth = 1) {
    if (depth > device::PackageLimits{}.depth) throw CommandError(folder.string() + ": too deep for a package");
    _package.addFolder(name);
    for (const auto& item : itemsIn(folder)) {
      std::string itemName = name + "/" + item.filename().string();
      struct stat facts {};
      if (::lstat(item.c_str(), &facts) != 0) throw CommandError(item.string() + ": " + std::strerror(errno));
      if (S_ISDIR(facts.st_mode))
        addFolder(item, itemName, depth + 1);
      else if (S_ISREG(facts.st_mode))
        addFile(item.string(), itemName, (facts.st_mode & 0100) != 0);
      else
        throw CommandError(item.string() + ": " + sortOfFile(facts.st_mode) +
                           "; a package holds files and folders alone");
    }
  }
  void close() { _package.close(); }

 private:
  void addFile(const std::string& path, const std::string& name, bool executable) {
    platform::ErrorRef error;
    auto file = HostFile::open("", path, &error);
    if (!file) throw CommandError(path + ": " + textOf(error));
    _package.beginFile(name, file->size(), executable);
    for (std::uint64_t left = file->size();;) {
      auto piece = file->read(pieceSize, &error);
      if (!piece) throw CommandError(path + ": " + textOf(error));
      if (piece->size() > left || (piece->empty() && left > 0))
        throw CommandError(path + ": somebody changed it meanwhile");
      if (piece->empty()) return;
      _package.append(*piece);
      left -= piece->size();
    }
  }

  PackageWriter _package;
};

/// The package would be packed into itself.
void refuseInside(const std::string& output, const fs::path& folder) {
  std::error_code problem;
  auto inner = fs::weakly_canonical(fs::absolute(output, problem), problem), outer = fs::canonical(folder, problem);
  if (std::mismatch(outer.begin(), outer.end(), inner.begin(), inner.end()).first == outer.end())
    throw CommandError(output + ": this is in the folder that is to be packed");
}

}  // namespace

HostPackage readHostPackage(const std::string& path, const std::string& shownPath) {
  const fs::path place(path);
  const std::string folder = place.has_parent_path() ? place.parent_path().string() : ".";
  const std::string file = "/" + place.filename().string();
  platform::ErrorRef error;
  if (!HostFile::open("", path, &error)) throw CommandError(shownPath + ": " + textOf(error));
  device::DiskFileTree files(device::FileDescriptor(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)),
                             nullptr);
  auto refuse = [&](const std::string& why) { return CommandError(shownPath + ": " + why); };
  auto first = device::tryPackage(files, file, nullptr, &error);
  if (!first) {
    // The error names the file as the tree below its folder has it.
    std::string text = textOf(error), front = "package \"" + file + "\": ";
    throw refuse(text.compare(0, front.size(), front) == 0 ? text.substr(front.size()) : text);
  }
  HostPackage app;
  app.id = first->package.identifier;
  if (!device::isAppIdentifier(app.id)) throw refuse("\"" + app.id + "\" cannot be an app's identifier");
  const auto& manifest = *std::as_const(first->package.manifest).dictionary();
  auto textAt = [&](std::string_view key) { return std::string(manifest[key].string().value_or("")); };
  app.version = textAt("KBBundleVersion");
  app.name = textAt("KBBundleDisplayName");
  if (app.name.empty()) app.name = first->package.bundle.substr(0, first->package.bundle.size() - bundleEnd.size());
  app.iconName = textAt("KBBundleIconFile");
  auto isWanted = [&](std::string_view name) {
    return name == app.iconName || name == platform::artworkFileName || name == platform::storeMetadataFileName;
  };
  auto second = device::tryPackage(files, file, isWanted, &error);
  if (!second) throw refuse("somebody changed it meanwhile");
  auto take = [&](std::string_view name) {
    auto found = second->files.find(name);
    return found == second->files.end() ? platform::Bytes() : std::move(found->second);
  };
  app.manifest = take(manifestName);
  app.artwork = take(platform::artworkFileName);
  app.metadata = take(platform::storeMetadataFileName);
  app.icon = isFileName(app.iconName) && app.iconName != manifestName ? take(app.iconName) : platform::Bytes();
  if (app.icon.empty()) app.iconName.clear();
  return app;
}

HostPackage packFolder(const std::string& folder, const std::string& output, bool replaces) {
  auto bundle = bundleIn(folder);
  refuseInside(output, folder);
  if (!replaces && isThere(output)) throw CommandError(output + ": there is something already; --replace replaces it");
  NewItem file(output, NewItem::Kind::file, replaces);
  {
    // libarchive cannot write a name that the thread's locale has no characters for.
    const device::UTF8Locale utf8;
    Packing packing(file.temporary());
    packing.addFolder(bundle.path, bundle.name);
    packing.close();
  }
  auto app = readHostPackage(file.temporary(), folder);
  file.putInPlace();
  return app;
}

}  // namespace tsd
