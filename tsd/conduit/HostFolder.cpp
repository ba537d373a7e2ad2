#include "tsd/conduit/HostFolder.h"

#include <dirent.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <memory>
#include <utility>
#include <vector>

#include "plist/PropertyList.h"
#include "tsd/CommandError.h"
#include "tsd/conduit/HostFile.h"
#include "tsd/terminal/Suggestion.h"

namespace tsd {

namespace {

constexpr std::size_t maximumList = std::size_t{1} << 30;

constexpr std::array<std::string_view, 4> hostNames{todoListName, iconLayoutName, packagesName, restoreName};
constexpr std::array<std::string_view, 2> restoreNames{restoreListName, demotedListName};

struct CloseDirectory {
  void operator()(DIR* directory) const { ::closedir(directory); }
};

std::vector<std::string> namesIn(const std::string& folder) {
  std::unique_ptr<DIR, CloseDirectory> directory(::opendir(folder.c_str()));
  if (!directory) throw CommandError(folder + ": " + (errno == ENOTDIR ? "not a folder" : std::strerror(errno)));
  std::vector<std::string> names;
  errno = 0;
  while (const dirent* entry = ::readdir(directory.get())) {
    if (isFileName(entry->d_name)) names.emplace_back(entry->d_name);
    errno = 0;
  }
  if (errno != 0) throw CommandError(folder + ": " + std::strerror(errno));
  std::sort(names.begin(), names.end());
  return names;
}

/// Appends a sentence about each file whose name is nearly that of one of the known ones that is missing.
template <std::size_t count>
void findMisspelled(const std::string& folder, const std::vector<std::string>& present,
                    const std::array<std::string_view, count>& known, std::vector<std::string>& found) {
  auto isPresent = [&](std::string_view name) { return std::binary_search(present.begin(), present.end(), name); };
  std::vector<std::string> missing;
  for (auto name : known) {
    if (!isPresent(name)) missing.emplace_back(name);
  }
  for (const auto& name : present) {
    if (std::find(known.begin(), known.end(), name) != known.end()) continue;
    if (auto meant = didYouMean(name, missing); !meant.empty())
      found.push_back(folder + "/" + name + ": not a file that a host has" + meant);
  }
}

const char* nameOf(platform::Value::Kind kind) {
  return kind == platform::Value::Kind::array ? "an array" : "a dictionary";
}

}  // namespace

std::vector<std::string> misspelledFiles(const std::string& folder) {
  std::vector<std::string> found;
  findMisspelled(folder, namesIn(folder), hostNames, found);
  const std::string restore = folder + "/" + std::string(restoreName);
  if (std::error_code problem; std::filesystem::is_directory(std::filesystem::symlink_status(restore, problem)))
    findMisspelled(restore, namesIn(restore), restoreNames, found);
  return found;
}

void requireHostFolder(const std::string& folder) {
  const auto names = namesIn(folder);
  auto has = [&](std::string_view name) { return std::binary_search(names.begin(), names.end(), name); };
  if (has("device.db") && has("fs")) throw CommandError(folder + ": this is a device, not a host");
  if (auto misspelled = misspelledFiles(folder); !misspelled.empty()) throw CommandError(misspelled.front());
  for (auto name : {packagesName, restoreName}) {
    const std::string path = folder + "/" + std::string(name);
    std::error_code problem;
    if (std::filesystem::is_symlink(std::filesystem::symlink_status(path, problem)))
      throw CommandError(path + ": a symbolic link, which is not followed");
  }
  if (std::none_of(hostNames.begin(), hostNames.end(), has)) {
    throw CommandError(folder + ": nothing of a host is in it: no " + std::string(todoListName) + ", " +
                       std::string(iconLayoutName) + ", " + std::string(packagesName) + " or " +
                       std::string(restoreName));
  }
}

bool isThere(const std::string& path) {
  std::error_code problem;
  auto facts = std::filesystem::symlink_status(path, problem);
  if (facts.type() == std::filesystem::file_type::none) throw CommandError(path + ": " + problem.message());
  return std::filesystem::exists(facts);
}

platform::Value readHostList(const std::string& path, platform::Value::Kind kind) {
  if (!isThere(path)) return {};
  platform::ErrorRef error;
  auto file = HostFile::open("", path, &error);
  auto bytes = file ? file->readRest(maximumList, &error) : std::nullopt;
  if (!bytes) throw CommandError(path + ": " + textOf(error));
  platform::Value list = plist::read(std::move(*bytes), &error);
  if (list.isAbsent()) throw CommandError(path + ": " + textOf(error));
  if (list.kind() != kind) throw CommandError(path + ": it is not " + nameOf(kind));
  return list;
}

}  // namespace tsd
