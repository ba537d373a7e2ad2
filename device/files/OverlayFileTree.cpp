#include "device/files/OverlayFileTree.h"

#include <algorithm>
#include <utility>

namespace device {

using platform::Bytes;
using platform::BytesView;
using platform::ErrorRef;
using platform::FileAttributes;
using platform::Value;
using Lock = platform::Mutex::Lock;

bool OverlayFileTree::showsBelow(std::string_view path, bool* isDirectory) const {
  if (_above->fileExists(path)) return false;
  for (std::size_t end = path.find('/', 1); !_hidden.empty(); end = path.find('/', end + 1)) {
    if (_hidden.count(path.substr(0, end))) return false;
    if (end == std::string_view::npos) break;
  }
  return _below->fileExists(path, isDirectory);
}

FileTree& OverlayFileTree::treeOf(std::string_view path) const {
  if (showsBelow(path)) return *_below;
  raiseParent(path, nullptr);
  return *_above;
}

bool OverlayFileTree::raiseParent(std::string_view path, ErrorRef* error) const {
  std::size_t slash = path.rfind('/');
  return slash == 0 || slash == std::string_view::npos || raise(path.substr(0, slash), error);
}

bool OverlayFileTree::raise(std::string_view path, ErrorRef* error) const {
  bool isDirectory = false;
  if (_above->fileExists(path)) return true;
  if (!raiseParent(path, error)) return false;
  if (!showsBelow(path, &isDirectory)) return true;
  if (isDirectory) return _above->createDirectory(path, true, {}, error);
  auto contents = _below->readFile(path, error);
  return contents && _above->writeAtomically(path, *contents, error);
}

bool OverlayFileTree::makeWay(std::string_view path, ErrorRef* error) const {
  bool isDirectory = false;
  return raiseParent(path, error) && (!showsBelow(path, &isDirectory) || !isDirectory || raise(path, error));
}

bool OverlayFileTree::raiseWhole(const std::string& path, ErrorRef* error) const {
  if (!raise(path, error)) return false;
  bool isDirectory = false;
  if (!_above->fileExists(path, &isDirectory) || !isDirectory) return true;
  auto entries = merged(path, error);
  return entries && std::all_of(entries->begin(), entries->end(), [&](const Entry& entry) REQUIRES(_guard) {
           return raiseWhole(path + '/' + entry.name, error);
         });
}

std::optional<std::vector<FileTree::Entry>> OverlayFileTree::merged(const std::string& path, ErrorRef* error) const {
  std::string front = path == "/" ? path : path + '/';
  std::vector<Entry> entries;
  // A directory in memory hides the one below only if that was removed or moved away.
  if (auto below = _below->list(path)) {
    for (auto& entry : *below) {
      if (showsBelow(front + entry.name)) entries.push_back(std::move(entry));
    }
  }
  bool isAbove = _above->fileExists(path);
  if (auto above = isAbove || entries.empty() ? treeOf(path).list(path, error) : std::vector<Entry>()) {
    if (isAbove) entries.insert(entries.end(), above->begin(), above->end());
  } else {
    return std::nullopt;
  }
  std::sort(entries.begin(), entries.end(), [](const Entry& one, const Entry& other) { return one.name < other.name; });
  return entries;
}

bool OverlayFileTree::removeItem(std::string_view path, ErrorRef* error) {
  Lock lock(_guard);
  if (!showsBelow(path) && (!raiseParent(path, error) || !_above->removeItem(path, error))) return false;
  platform::setError(error, nullptr);
  _hidden.emplace(path);
  return true;
}

bool OverlayFileTree::createDirectory(std::string_view path, bool withIntermediateDirectories, const Value& attributes,
                                      ErrorRef* error) {
  Lock lock(_guard);
  return raise(path, error) && _above->createDirectory(path, withIntermediateDirectories, attributes, error);
}

bool OverlayFileTree::moveItem(std::string_view from, std::string_view to, ErrorRef* error) {
  Lock lock(_guard);
  if (!raiseWhole(std::string(from), error) || !raise(to, error) || !raiseParent(to, error)) return false;
  if (!_above->moveItem(from, to, error)) return false;
  _hidden.emplace(from);
  _hidden.emplace(to);
  return true;
}

bool OverlayFileTree::copyItem(std::string_view from, std::string_view to, ErrorRef* error) {
  Lock lock(_guard);
  return raise(from, error) && makeWay(to, error) && _above->copyItem(from, to, error);
}

bool OverlayFileTree::fileExists(std::string_view path, bool* isDirectory) {
  Lock lock(_guard);
  return _above->fileExists(path, isDirectory) || showsBelow(path, isDirectory);
}

std::optional<FileAttributes> OverlayFileTree::attributesOfItem(std::string_view path, ErrorRef* error) {
  Lock lock(_guard);
  return treeOf(path).attributesOfItem(path, error);
}

bool OverlayFileTree::createFile(std::string_view path, BytesView contents, const Value& attributes) {
  Lock lock(_guard);
  return makeWay(path, nullptr) && _above->createFile(path, contents, attributes);
}

std::optional<Bytes> OverlayFileTree::readFile(std::string_view path, ErrorRef* error) {
  Lock lock(_guard);
  return treeOf(path).readFile(path, error);
}

bool OverlayFileTree::writeAtomically(std::string_view path, BytesView contents, ErrorRef* error,
                                      platform::Durability durability) {
  Lock lock(_guard);
  return makeWay(path, error) && _above->writeAtomically(path, contents, error, durability);
}

int OverlayFileTree::utimes(std::string_view path, int& errorNumber) {
  Lock lock(_guard);
  raise(path, nullptr);
  return _above->utimes(path, errorNumber);
}

std::optional<std::vector<FileTree::Entry>> OverlayFileTree::list(std::string_view path, ErrorRef* error) {
  Lock lock(_guard);
  platform::setError(error, nullptr);
  return merged(std::string(path), error);
}

std::unique_ptr<FileWriter> OverlayFileTree::createNew(std::string_view path, bool executable, ErrorRef* error) {
  Lock lock(_guard);
  if (!raiseParent(path, error) || !raise(path, error)) return nullptr;
  return _above->createNew(path, executable, error);
}

std::unique_ptr<FileReader> OverlayFileTree::openForReading(std::string_view path, ErrorRef* error) {
  Lock lock(_guard);
  return treeOf(path).openForReading(path, error);
}

bool OverlayFileTree::syncDirectory(std::string_view path, ErrorRef* error) {
  Lock lock(_guard);
  return treeOf(path).syncDirectory(path, error);
}

bool OverlayFileTree::syncItem(std::string_view path, ErrorRef* error) {
  // What was changed is in memory; the rest is as it was.
  return attributesOfItem(path, error).has_value();
}

}  // namespace device
