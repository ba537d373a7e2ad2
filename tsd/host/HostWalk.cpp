#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>

#include "tsd/conduit/FileConduit.h"
#include "tsd/conduit/HostFile.h"
#include "tsd/conduit/HostFolder.h"
#include "tsd/host/HostCheck.h"
#include "tsd/terminal/Suggestion.h"

// What of a host's folder no list names, or does not go to a device.

namespace tsd {

namespace fs = std::filesystem;
using Weight = Finding::Weight;

namespace {

constexpr std::string_view packageEnd = ".pkg";

std::vector<fs::path> itemsIn(const std::string& folder, std::error_code& problem) {
  std::vector<fs::path> items;
  for (fs::directory_iterator at(folder, problem), end; !problem && at != end; at.increment(problem))
    items.push_back(at->path());
  std::sort(items.begin(), items.end());
  return items;
}

std::string meantOf(const std::string& name, const std::set<std::string>& names) {
  return didYouMean(name, {names.begin(), names.end()});
}

}  // namespace

void HostCheck::checkStrays() {
  if (!_isTodoListKnown) return;
  std::error_code problem;
  const std::set<std::string_view> known{todoListName, iconLayoutName, packagesName, restoreName};
  std::set<std::string> told;
  for (const auto& each : _findings) told.insert(each.file);
  for (const auto& item : itemsIn(_host, problem)) {
    std::string name = item.filename().string();
    std::error_code ignored;
    if (known.count(name) || _named.count(name) || told.count(item.string())) continue;
    const auto facts = fs::symlink_status(item, ignored);
    const bool isFolder = fs::is_directory(facts);
    // What is neither is not pushed, which is told then.
    if (!isFolder && !fs::is_regular_file(facts)) continue;
    add({Weight::note, item.string(), 0, "",
         (isFolder ? "no entry of the todo list names this folder" : "nobody reads this file") + meantOf(name, _named),
         "rename it, or take it away"});
  }
  const std::string packages = _host + "/" + std::string(packagesName);
  for (const auto& item : itemsIn(packages, problem)) {
    std::string name = item.filename().string();
    std::error_code ignored;
    if (fs::is_directory(fs::symlink_status(item, ignored))) continue;
    bool isPackage = name.size() > packageEnd.size() &&
                     name.compare(name.size() - packageEnd.size(), packageEnd.size(), packageEnd) == 0;
    std::string app = isPackage ? name.substr(0, name.size() - packageEnd.size()) : name;
    if (isPackage && _installs.count(app)) continue;
    add({Weight::note, item.string(), 0, "",
         isPackage ? "no entry of the todo list asks for this package" + meantOf(app, _installs)
                   : "a package's name is its app's identifier with \".pkg\" behind it",
         "rename it, or take it away"});
  }
}

void HostCheck::checkPushed(const std::string& folder, std::size_t depth) {
  if (_isFull) return;
  if (depth > FileConduit::maximumDepth) {
    add({Weight::note, folder, 0, "",
         "it is not pushed: nested more than " + std::to_string(FileConduit::maximumDepth) + " deep",
         "move it up, or leave it out"});
    return;
  }
  std::error_code problem;
  for (const auto& item : itemsIn(folder, problem)) {
    std::string name = item.filename().string();
    if (depth == 0 && (name == packagesName || name == restoreName)) continue;
    ++_entries;
    struct stat facts {};
    if (::lstat(item.c_str(), &facts) != 0) {
      add({Weight::error, item.string(), 0, "", std::strerror(errno), "make it readable"});
    } else if (S_ISDIR(facts.st_mode)) {
      checkPushed(item.string(), depth + 1);
    } else if (!S_ISREG(facts.st_mode)) {
      add({Weight::note, item.string(), 0, "", std::string("it is not pushed: ") + sortOfFile(facts.st_mode),
           "put a file there"});
    } else {
      _bytes += static_cast<std::uint64_t>(facts.st_size);
    }
    if (_isFull) return;
    _isFull = _entries > FileConduit::maximumEntries || _bytes > FileConduit::maximumBytes;
    if (_isFull) {
      add({Weight::error, _host, 0, "",
           "more than " + std::to_string(FileConduit::maximumEntries) + " files and folders or " +
               std::to_string(FileConduit::maximumBytes) + " bytes are not taken",
           "leave something out"});
      return;
    }
  }
  if (problem) add({Weight::error, folder, 0, "", problem.message(), "make it readable"});
}

}  // namespace tsd
