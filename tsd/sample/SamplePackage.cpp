#include "tsd/sample/SamplePackage.h"

#include <algorithm>

#include "plist/PropertyList.h"
#include "tsd/CommandError.h"
#include "tsd/host/PackageWriter.h"

namespace tsd {
namespace {

constexpr std::uint64_t overhead = 1024;  // of the archive itself, about

}  // namespace

void writeSamplePackage(const std::string& path, const SampleApp& app, std::uint64_t size, std::uint64_t seed) {
  auto manifest = plist::writeBinary(app.manifest());
  if (!manifest) throw CommandError(path + ": its manifest cannot be written");
  PackageWriter package(path, PackageWriter::Content::stored);
  std::string folder = app.name + ".app";
  package.addFolder(folder);
  package.addFile(folder + "/Info.plist", *manifest);
  package.addFile(folder + "/" + sampleIconName, app.icon);
  std::uint64_t used = manifest->size() + app.icon.size() + overhead;
  std::uint64_t left = size > used ? size - used : 0;
  SampleNumbers numbers(seed);
  // The other files, of a few sizes, hold at most half of it.
  const std::size_t others = app.files - 3;
  const std::uint64_t share = others ? left / 2 / others : 0;
  for (std::size_t number = 0; number < others; ++number) {
    std::string inner = folder + (number % 20 < 10 ? "/Größen " : "/資料 ") + std::to_string(number / 10);
    if (number % 10 == 0) package.addFolder(inner);
    std::size_t pieceSize = share ? numbers.below(static_cast<std::size_t>(share)) : 0;
    package.addFile(inner + "/piece " + std::to_string(number), numbers.bytes(pieceSize));
    left -= pieceSize;
  }
  package.beginFile(folder + "/content.bin", left);
  while (left > 0) {
    auto some = static_cast<std::size_t>(std::min<std::uint64_t>(left, 1 << 16));
    package.append(numbers.bytes(some));
    left -= some;
  }
  package.close();
}

}  // namespace tsd
