#include "device/package/PackageTrial.h"

#include <cerrno>
#include <memory>
#include <utility>

#include "device/DeviceErrors.h"

namespace device {

namespace {

constexpr std::string_view target = "/target";

bool isInTarget(std::string_view path) {
  return path.size() > target.size() && path.substr(0, target.size()) == target && path[target.size()] == '/';
}

// One more than a manifest may have, so that one which is too large is seen to be.
constexpr std::size_t maximumKept = (std::size_t{16} << 20) + 1;

struct TriedFile {
  bool isKept = false;
  std::uint64_t size = 0;
  platform::Bytes content;
};

class CountingWriter final : public FileWriter {
 public:
  explicit CountingWriter(TriedFile& file) : _file(file) {}
  bool write(platform::BytesView bytes, platform::ErrorRef* error) override {
    platform::setError(error, nullptr);
    _file.size += bytes.size();
    if (_file.isKept) _file.content += bytes.substr(0, maximumKept - _file.content.size());
    return true;
  }
  bool close(bool, platform::ErrorRef* error) override {
    platform::setError(error, nullptr);
    return true;
  }

 private:
  TriedFile& _file;
};

/// Reads the package from the tree below; what is unpacked of it is counted, and kept where it is wanted.
class TrialTree final : public FileTree {
 public:
  TrialTree(FileTree& below, const std::function<bool(std::string_view)>& isWanted)
      : _below(below), _isWanted(isWanted) {}

  platform::TextMap<TriedFile>& files() { return _files; }

  bool createDirectory(std::string_view, bool, const platform::Value&, platform::ErrorRef* error) override {
    platform::setError(error, nullptr);
    return true;
  }
  std::unique_ptr<FileWriter> createNew(std::string_view path, bool, platform::ErrorRef* error) override {
    platform::setError(error, nullptr);
    auto name = nameOf(path);
    TriedFile& file = _files[std::string(name)];
    file.isKept = name == "Info.plist" || (_isWanted && _isWanted(name));
    return std::make_unique<CountingWriter>(file);
  }
  std::optional<platform::FileAttributes> attributesOfItem(std::string_view path, platform::ErrorRef* error) override {
    if (!isInTarget(path)) return _below.attributesOfItem(path, error);
    auto file = _files.find(nameOf(path));
    if (file == _files.end()) return nothing(error), std::nullopt;
    return platform::FileAttributes{false, file->second.size};
  }
  std::optional<platform::Bytes> readFile(std::string_view path, platform::ErrorRef* error) override {
    auto file = _files.find(nameOf(path));
    if (file == _files.end()) return nothing(error), std::nullopt;
    return file->second.content;
  }
  std::unique_ptr<FileReader> openForReading(std::string_view path, platform::ErrorRef* error) override {
    return _below.openForReading(path, error);
  }

  // Nothing of this is asked for when a package is unpacked.
  bool removeItem(std::string_view, platform::ErrorRef* error) override { return nothing(error); }
  bool moveItem(std::string_view, std::string_view, platform::ErrorRef* error) override { return nothing(error); }
  bool copyItem(std::string_view, std::string_view, platform::ErrorRef* error) override { return nothing(error); }
  bool fileExists(std::string_view, bool*) override { return false; }
  bool createFile(std::string_view, platform::BytesView, const platform::Value&) override { return false; }
  bool writeAtomically(std::string_view, platform::BytesView, platform::ErrorRef* error,
                       platform::Durability) override {
    return nothing(error);
  }
  int utimes(std::string_view, int& errorNumber) override {
    errorNumber = ENOTSUP;
    return -1;
  }
  std::optional<std::vector<Entry>> list(std::string_view, platform::ErrorRef* error) override {
    return nothing(error), std::nullopt;
  }
  bool syncDirectory(std::string_view, platform::ErrorRef* error) override { return nothing(error); }
  bool syncItem(std::string_view, platform::ErrorRef* error) override { return nothing(error); }

 private:
  /// Below the ".app" folder.
  static std::string_view nameOf(std::string_view path) {
    auto slash = path.find('/', target.size() + 1);
    return slash == path.npos ? std::string_view() : path.substr(slash + 1);
  }
  static bool nothing(platform::ErrorRef* error) {
    return fail(error, platform::makeError("FileSystem", ENOENT, "there is no such file"));
  }

  FileTree& _below;
  const std::function<bool(std::string_view)>& _isWanted;
  platform::TextMap<TriedFile> _files;
};

}  // namespace

std::optional<TriedPackage> tryPackage(FileTree& files, std::string_view packagePath,
                                       const std::function<bool(std::string_view)>& isWanted,
                                       platform::ErrorRef* error) {
  TrialTree tree(files, isWanted);
  auto package = unpackPackage(tree, packagePath, std::string(target), {}, error);
  if (!package) return std::nullopt;
  TriedPackage tried{std::move(*package), {}};
  for (auto& [name, file] : tree.files()) {
    if (file.isKept && file.size < maximumKept) tried.files.try_emplace(name, std::move(file.content));
  }
  return tried;
}

}  // namespace device
