#include "MemoryFiles.h"

#include <cerrno>
#include <cstring>

namespace tiny {

using platform::BytesView;
using platform::ErrorRef;

namespace {

/// Answers for an operation: success, or failure with an error that names the path.
bool answer(int number, std::string_view path, ErrorRef* error) {
  platform::setError(
      error, number == 0 ? nullptr
                         : platform::makeError("TinyFiles", number, std::string(path) + ": " + std::strerror(number)));
  return number == 0;
}

std::string_view parentOf(std::string_view path) { return path.substr(0, path.rfind('/')); }

bool isBelow(std::string_view path, std::string_view directory) {
  return path.size() > directory.size() && path.compare(0, directory.size(), directory) == 0 &&
         path[directory.size()] == '/';
}

bool isAbsolute(std::string_view path) { return path.size() > 1 && path.front() == '/' && path.back() != '/'; }

}  // namespace

const MemoryFiles::Item* MemoryFiles::find(std::string_view path) const {
  static const Item root;
  if (path.empty()) return &root;
  auto found = _items.find(path);
  return found == _items.end() ? nullptr : &found->second;
}

int MemoryFiles::checkPlace(std::string_view path) const {
  if (!isAbsolute(path)) return EINVAL;
  const Item* parent = find(parentOf(path));
  if (!parent) return ENOENT;
  return parent->isDirectory ? 0 : ENOTDIR;
}

bool MemoryFiles::removeItem(std::string_view path, ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  auto found = _items.find(path);
  if (found == _items.end()) return answer(ENOENT, path, error);
  _items.erase(found);
  std::string front = std::string(path) + '/';
  auto below = _items.lower_bound(front);
  while (below != _items.end() && isBelow(below->first, path)) below = _items.erase(below);
  return answer(0, path, error);
}

bool MemoryFiles::createDirectory(std::string_view path, bool withIntermediateDirectories, const platform::Value&,
                                  ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  if (!isAbsolute(path)) return answer(EINVAL, path, error);
  if (const Item* there = find(path)) {
    return answer(there->isDirectory && withIntermediateDirectories ? 0 : EEXIST, path, error);
  }
  if (!withIntermediateDirectories) {
    int problem = checkPlace(path);
    if (problem == 0) _items.emplace(path, Item{});
    return answer(problem, path, error);
  }
  // Looked at before anything is made, so that a failure makes nothing.
  for (std::size_t end = path.find('/', 1); end != path.npos; end = path.find('/', end + 1)) {
    const Item* above = find(path.substr(0, end));
    if (above && !above->isDirectory) return answer(ENOTDIR, path, error);
  }
  for (std::size_t end = path.find('/', 1); end != path.npos; end = path.find('/', end + 1)) {
    _items.emplace(path.substr(0, end), Item{});
  }
  _items.emplace(path, Item{});
  return answer(0, path, error);
}

bool MemoryFiles::moveItem(std::string_view from, std::string_view to, ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  if (!find(from) || from.empty()) return answer(ENOENT, from, error);
  if (find(to)) return answer(EEXIST, to, error);
  if (isBelow(to, from)) return answer(EINVAL, to, error);
  if (int problem = checkPlace(to)) return answer(problem, to, error);
  Items moved;
  for (auto item = _items.lower_bound(from); item != _items.end();) {
    if (item->first != from && !isBelow(item->first, from)) {
      ++item;  // "a-b" sorts between "a" and what is below "a"
      if (item == _items.end() || item->first.compare(0, from.size(), from) != 0) break;
      continue;
    }
    moved.emplace(std::string(to) + item->first.substr(from.size()), std::move(item->second));
    item = _items.erase(item);
  }
  _items.merge(moved);
  return answer(0, to, error);
}

bool MemoryFiles::copyItem(std::string_view from, std::string_view to, ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  const Item* source = find(from);
  if (!source) return answer(ENOENT, from, error);
  if (source->isDirectory) return answer(EISDIR, from, error);
  return answer(write(to, platform::Bytes(source->contents)), to, error);
}

bool MemoryFiles::fileExists(std::string_view path, bool* isDirectory) {
  platform::Mutex::Lock lock(_mutex);
  const Item* item = find(path);
  if (item && isDirectory) *isDirectory = item->isDirectory;
  return item != nullptr;
}

std::optional<platform::FileAttributes> MemoryFiles::attributesOfItem(std::string_view path, ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  const Item* item = find(path);
  if (!answer(item ? 0 : ENOENT, path, error)) return std::nullopt;
  return platform::FileAttributes{item->isDirectory, item->contents.size()};
}

int MemoryFiles::write(std::string_view path, BytesView contents) {
  const Item* there = find(path);
  if (there && there->isDirectory) return EISDIR;
  if (int problem = checkPlace(path)) return problem;
  _items.insert_or_assign(std::string(path), Item{false, platform::Bytes(contents)});
  return 0;
}

bool MemoryFiles::createFile(std::string_view path, BytesView contents, const platform::Value&) {
  platform::Mutex::Lock lock(_mutex);
  return write(path, contents) == 0;
}

std::optional<platform::Bytes> MemoryFiles::readFile(std::string_view path, ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  const Item* item = find(path);
  if (!answer(!item ? ENOENT : item->isDirectory ? EISDIR : 0, path, error)) return std::nullopt;
  return item->contents;
}

bool MemoryFiles::writeAtomically(std::string_view path, BytesView contents, ErrorRef* error, platform::Durability) {
  platform::Mutex::Lock lock(_mutex);
  return answer(write(path, contents), path, error);
}

int MemoryFiles::utimes(std::string_view path, int& errorNumber) {
  platform::Mutex::Lock lock(_mutex);
  if (find(path)) return 0;  // items of this file system have no times
  errorNumber = ENOENT;
  return -1;
}

}  // namespace tiny
