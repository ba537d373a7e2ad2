#include "device/files/KeptFolders.h"

#include <algorithm>
#include <utility>

namespace device {

namespace {

bool isAtOrBelow(std::string_view path, std::string_view top) {
  return path.substr(0, top.size()) == top && (path.size() == top.size() || path[top.size()] == '/');
}

}  // namespace

KeptFolders::Handle KeptFolders::find(std::string_view path) {
  platform::Mutex::Lock lock(_mutex);
  auto place = std::find_if(_folders.rbegin(), _folders.rend(), [&](const Folder& each) { return each.path == path; });
  if (place == _folders.rend()) return nullptr;
  std::rotate(_folders.rbegin(), place, place + 1);
  return _folders.back().handle;
}

std::uint64_t KeptFolders::changes() {
  platform::Mutex::Lock lock(_mutex);
  return _changes;
}

void KeptFolders::keep(std::string_view path, Handle folder, std::uint64_t changesBefore) {
  Handle last;  // closed when nobody waits for it
  platform::Mutex::Lock lock(_mutex);
  if (_changes != changesBefore) return;
  if (_folders.size() == most) {
    last = std::move(_folders.front().handle);
    _folders.erase(_folders.begin());
  }
  _folders.push_back({std::string(path), std::move(folder)});
}

void KeptFolders::forget(std::string_view path) {
  platform::Mutex::Lock lock(_mutex);
  ++_changes;
  std::erase_if(_folders, [&](const Folder& each) { return isAtOrBelow(each.path, path); });
}

void KeptFolders::clear() {
  platform::Mutex::Lock lock(_mutex);
  _folders.clear();
}

}  // namespace device
