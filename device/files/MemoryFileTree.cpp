#include "device/files/MemoryFileTree.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "device/files/DevicePath.h"
#include "platform/TextTable.h"

namespace device {

using platform::Bytes;
using platform::BytesView;
using platform::ErrorRef;
using platform::FileAttributes;
using platform::Value;

struct MemoryFileTree::Node {
  bool isDirectory = false;
  bool executable = false;
  Bytes contents;
  // Unordered, so that finding a name takes the same time among many.
  platform::TextMap<std::shared_ptr<Node>> items;
};

/// A name in a directory. The root has no name.
struct MemoryFileTree::Place {
  std::shared_ptr<Node> directory;
  std::string name;

  bool isRoot() const { return name.empty(); }
  std::shared_ptr<Node> item() const {
    if (isRoot()) return directory;
    auto found = directory->items.find(name);
    return found == directory->items.end() ? nullptr : found->second;
  }
};

class MemoryFileTree::Writer final : public FileWriter {
 public:
  Writer(Guard guard, std::shared_ptr<Node> file) : _guard(std::move(guard)), _file(std::move(file)) {}

  bool write(BytesView bytes, ErrorRef* error) override {
    platform::setError(error, nullptr);
    platform::Mutex::Lock lock(*_guard);
    _file->contents += bytes;
    return true;
  }
  bool close(bool, ErrorRef* error) override {
    platform::setError(error, nullptr);
    return true;
  }

 private:
  const Guard _guard;
  const std::shared_ptr<Node> _file GUARDED_BY(*_guard);
};

class MemoryFileTree::Reader final : public FileReader {
 public:
  Reader(Guard guard, std::shared_ptr<Node> file) : _guard(std::move(guard)), _file(std::move(file)) {}

  std::optional<Bytes> read(std::size_t count, ErrorRef* error) override {
    platform::setError(error, nullptr);
    platform::Mutex::Lock lock(*_guard);
    Bytes chunk = _file->contents.substr(std::min<std::uint64_t>(_at, _file->contents.size()), count);
    _at += chunk.size();
    return chunk;
  }
  bool seek(std::uint64_t offset, ErrorRef* error) override {
    platform::setError(error, nullptr);
    _at = offset;
    return true;
  }

 private:
  const Guard _guard;
  const std::shared_ptr<Node> _file GUARDED_BY(*_guard);
  std::uint64_t _at = 0;
};

MemoryFileTree::MemoryFileTree() : _root(std::make_shared<Node>(Node{true, false, {}, {}})) {}

int MemoryFileTree::find(std::string_view path, bool makeDirectories, Place& place) const {
  std::vector<std::string_view> names;
  if (int failure = splitDevicePath(path, names)) return failure;
  place.directory = _root;
  for (std::size_t i = 0; i < names.size(); ++i) {
    place.name = names[i];
    if (i + 1 == names.size()) break;
    auto next = place.item();
    if (!next && !makeDirectories) return ENOENT;
    if (!next) {
      next = std::make_shared<Node>(Node{true, false, {}, {}});
      place.directory->items.emplace(place.name, next);
    }
    if (!next->isDirectory) return ENOTDIR;
    place.directory = std::move(next);
  }
  return 0;
}

int MemoryFileTree::findItem(std::string_view path, std::shared_ptr<Node>& node) const {
  Place place;
  if (int failure = find(path, false, place)) return failure;
  node = place.item();
  return node ? 0 : ENOENT;
}

int MemoryFileTree::findFile(std::string_view path, std::shared_ptr<Node>& node) const {
  if (int failure = findItem(path, node)) return failure;
  return node->isDirectory ? EISDIR : 0;
}

bool MemoryFileTree::removeItem(std::string_view path, ErrorRef* error) {
  platform::Mutex::Lock lock(*_guard);
  Place place;
  int failure = find(path, false, place);
  if (failure == 0 && place.isRoot()) failure = EBUSY;
  if (failure == 0 && place.directory->items.erase(place.name) == 0) failure = ENOENT;
  return answerFileOperation(failure, path, error);
}

int MemoryFileTree::makeDirectory(std::string_view path, bool intermediates) const {
  Place place;
  if (int failure = find(path, intermediates, place)) return failure;
  if (auto item = place.item()) return item->isDirectory && intermediates ? 0 : EEXIST;
  place.directory->items.emplace(place.name, std::make_shared<Node>(Node{true, false, {}, {}}));
  return 0;
}

bool MemoryFileTree::createDirectory(std::string_view path, bool withIntermediateDirectories, const Value&,
                                     ErrorRef* error) {
  platform::Mutex::Lock lock(*_guard);
  return answerFileOperation(makeDirectory(path, withIntermediateDirectories), path, error);
}

int MemoryFileTree::move(const Place& from, std::string_view to) const {
  Place place;
  if (int failure = find(to, false, place)) return failure;
  if (place.item()) return EEXIST;
  // A directory has no place inside itself.
  auto moved = from.item();
  std::shared_ptr<Node> at = _root;
  std::vector<std::string_view> names;
  splitDevicePath(to, names);
  for (std::size_t i = 0; i + 1 < names.size(); ++i) {
    at = at->items.find(names[i])->second;
    if (at == moved) return EINVAL;
  }
  from.directory->items.erase(from.name);
  place.directory->items.emplace(place.name, std::move(moved));
  return 0;
}

bool MemoryFileTree::moveItem(std::string_view from, std::string_view to, ErrorRef* error) {
  platform::Mutex::Lock lock(*_guard);
  Place source;
  int failure = find(from, false, source);
  if (failure == 0 && source.isRoot()) failure = EBUSY;
  if (failure == 0 && !source.item()) failure = ENOENT;
  if (failure) return answerFileOperation(failure, from, error);
  return answerFileOperation(move(source, to), to, error);
}

int MemoryFileTree::replaceFile(std::string_view path, BytesView contents, bool executable) const {
  Place place;
  if (int failure = find(path, false, place)) return failure;
  auto item = place.item();
  if (item && item->isDirectory) return EISDIR;
  place.directory->items[place.name] = std::make_shared<Node>(Node{false, executable, Bytes(contents), {}});
  return 0;
}

bool MemoryFileTree::copyItem(std::string_view from, std::string_view to, ErrorRef* error) {
  platform::Mutex::Lock lock(*_guard);
  std::shared_ptr<Node> source;
  if (int failure = findFile(from, source)) return answerFileOperation(failure, from, error);
  return answerFileOperation(replaceFile(to, source->contents, source->executable), to, error);
}

bool MemoryFileTree::fileExists(std::string_view path, bool* isDirectory) {
  auto attributes = attributesOfItem(path, nullptr);
  if (isDirectory) *isDirectory = attributes && attributes->isDirectory;
  return attributes.has_value();
}

std::optional<FileAttributes> MemoryFileTree::attributesOfItem(std::string_view path, ErrorRef* error) {
  platform::Mutex::Lock lock(*_guard);
  std::shared_ptr<Node> item;
  if (!answerFileOperation(findItem(path, item), path, error)) return std::nullopt;
  return FileAttributes{item->isDirectory, item->contents.size()};
}

bool MemoryFileTree::createFile(std::string_view path, BytesView contents, const Value&) {
  return writeAtomically(path, contents, nullptr, platform::Durability::fleeting);
}

std::optional<Bytes> MemoryFileTree::readFile(std::string_view path, ErrorRef* error) {
  platform::Mutex::Lock lock(*_guard);
  std::shared_ptr<Node> file;
  int failure = findFile(path, file);
  if (failure == 0 && file->contents.size() > largestWholeRead) failure = EFBIG;
  if (!answerFileOperation(failure, path, error)) return std::nullopt;
  return file->contents;
}

bool MemoryFileTree::writeAtomically(std::string_view path, BytesView contents, ErrorRef* error, platform::Durability) {
  platform::Mutex::Lock lock(*_guard);
  return answerFileOperation(replaceFile(path, contents, false), path, error);
}

int MemoryFileTree::utimes(std::string_view path, int& errorNumber) {
  platform::Mutex::Lock lock(*_guard);
  std::shared_ptr<Node> item;
  int failure = findItem(path, item);
  if (failure == 0) return 0;
  errorNumber = failure;
  return -1;
}

std::optional<std::vector<FileTree::Entry>> MemoryFileTree::list(std::string_view path, ErrorRef* error) {
  platform::Mutex::Lock lock(*_guard);
  std::shared_ptr<Node> directory;
  int failure = findItem(path, directory);
  if (failure == 0 && !directory->isDirectory) failure = ENOTDIR;
  if (!answerFileOperation(failure, path, error)) return std::nullopt;
  std::vector<Entry> entries;
  for (const auto& [name, item] : directory->items) entries.push_back({name, item->isDirectory, item->contents.size()});
  std::sort(entries.begin(), entries.end(), [](const Entry& one, const Entry& other) { return one.name < other.name; });
  return entries;
}

std::unique_ptr<FileWriter> MemoryFileTree::createNew(std::string_view path, bool executable, ErrorRef* error) {
  platform::Mutex::Lock lock(*_guard);
  Place place;
  int failure = find(path, false, place);
  if (failure == 0 && place.item()) failure = EEXIST;
  if (!answerFileOperation(failure, path, error)) return nullptr;
  auto file = std::make_shared<Node>(Node{false, executable, {}, {}});
  place.directory->items.emplace(place.name, file);
  return std::make_unique<Writer>(_guard, std::move(file));
}

std::unique_ptr<FileReader> MemoryFileTree::openForReading(std::string_view path, ErrorRef* error) {
  platform::Mutex::Lock lock(*_guard);
  std::shared_ptr<Node> file;
  if (!answerFileOperation(findFile(path, file), path, error)) return nullptr;
  return std::make_unique<Reader>(_guard, std::move(file));
}

bool MemoryFileTree::syncDirectory(std::string_view path, ErrorRef* error) {
  platform::Mutex::Lock lock(*_guard);
  std::shared_ptr<Node> directory;
  int failure = findItem(path, directory);
  if (failure == 0 && !directory->isDirectory) failure = ENOTDIR;
  return answerFileOperation(failure, path, error);
}

bool MemoryFileTree::syncItem(std::string_view path, ErrorRef* error) {
  return attributesOfItem(path, error).has_value();
}

std::unique_ptr<FileTree> makeMemoryFileTree() { return std::make_unique<MemoryFileTree>(); }

}  // namespace device
