// A package's archive, through the device's unpacking.

#include <cstdint>
#include <string>

#include "device/package/Package.h"
#include "fuzz/Require.h"

namespace {

using fuzz::require;

constexpr char source[] = "/package";
constexpr char target[] = "/target";
constexpr char canary[] = "/canary";

device::PackageLimits smallLimits() {
  device::PackageLimits limits;
  limits.entries = 24;
  limits.totalBytes = 8192;
  limits.nameLength = 200;
  limits.componentLength = 100;
  limits.depth = 6;
  return limits;
}

struct Unpacked {
  std::size_t items = 0;
  std::uint64_t bytes = 0;
  std::size_t depth = 0;
};

void count(device::FileTree& files, const std::string& directory, std::size_t depth, Unpacked& unpacked) {
  auto entries = files.list(directory);
  require(entries.has_value(), "what was unpacked can be listed");
  for (const auto& entry : *entries) {
    ++unpacked.items;
    unpacked.bytes += entry.size;
    unpacked.depth = std::max(unpacked.depth, depth);
    if (entry.isDirectory) count(files, directory + '/' + entry.name, depth + 1, unpacked);
  }
}

/// A tree that stays: what an input leaves in it is removed again.
device::FileTree& tree() {
  static const auto files = [] {
    auto made = device::makeMemoryFileTree();
    made->createFile(canary, "nobody's", {});
    return made;
  }();
  return *files;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const device::PackageLimits limits = smallLimits();
  auto& files = tree();
  require(files.createFile(source, {reinterpret_cast<const char*>(data), size}, {}), "room for the package");
  require(files.createDirectory(target, false, {}), "an empty target");

  platform::ErrorRef error;
  auto package = device::unpackPackage(files, source, target, limits, &error);
  require(package.has_value() == (error == nullptr), "either a package or an error", error);

  Unpacked unpacked;
  count(files, target, 1, unpacked);
  require(unpacked.items <= limits.entries, "the budget of files and folders", error);
  require(unpacked.bytes <= limits.totalBytes, "the budget of bytes", error);
  require(unpacked.depth <= limits.depth, "the limit of depth", error);
  auto top = files.list("/");
  require(top && top->size() == 3 && files.readFile(canary) == "nobody's", "nothing beside the target", error);
  if (package) {
    require(package->bytes == unpacked.bytes, "the bytes that were counted");
    require(!package->identifier.empty() && package->manifest.dictionary(), "an app's manifest");
    require(files.list(target)->size() == 1 && files.fileExists(target + ('/' + package->bundle)), "one bundle");
  }
  require(files.removeItem(target), "what was unpacked can be removed");
  return 0;
}
