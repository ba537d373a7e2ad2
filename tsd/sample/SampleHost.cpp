#include "tsd/sample/SampleHost.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>

#include "platform/DevicePaths.h"
#include "platform/TodoOperation.h"
#include "tsd/CommandError.h"
#include "tsd/host/HostList.h"
#include "tsd/sample/SamplePackage.h"

namespace tsd {

using platform::Value;

namespace {

constexpr std::size_t rightsSize = 512;
constexpr const char* olderVersion = "1.0";

void makeFolder(const std::string& path) {
  std::error_code problem;
  std::filesystem::create_directories(path, problem);
  if (problem) throw CommandError(path + ": " + problem.message());
}

void writeFile(const std::string& path, platform::BytesView content) {
  std::ofstream file(path, std::ios::binary | std::ios::trunc);
  file.write(content.data(), static_cast<std::streamsize>(content.size()));
  file.close();
  if (!file) throw CommandError(path + ": " + std::strerror(errno ? errno : EIO));
}

SampleRole roleAt(std::size_t place, std::size_t count, bool demo) {
  if (!demo) return SampleRole::install;
  if (place == 0) return SampleRole::older;
  if (place + 1 == count) return SampleRole::remove;
  if (place + 2 == count) return SampleRole::badIdentifier;
  if (place + 3 == count) return SampleRole::damaged;
  return SampleRole::install;
}

}  // namespace

const char* nameOfRole(SampleRole role) {
  switch (role) {
    case SampleRole::install:
      return "install";
    case SampleRole::older:
      return "older version on the device";
    case SampleRole::damaged:
      return "damaged package";
    case SampleRole::badIdentifier:
      return "bad identifier";
    case SampleRole::remove:
      return "remove";
  }
  return "";
}

SampleHost::SampleHost(const SampleOptions& options) : _options(options) {
  SampleNumbers numbers(options.seed);
  auto apps = makeSampleApps(options.apps, numbers);
  for (std::size_t i = 0; i < apps.size(); ++i) {
    Entry entry{std::move(apps[i]), roleAt(i, apps.size(), options.demo)};
    if (options.files != 0) entry.app.files = options.files;
    if (entry.role == SampleRole::badIdentifier) entry.app.id = "com.example/../evil";
    if (entry.role != SampleRole::badIdentifier && entry.role != SampleRole::remove) _layout.push_back(entry.app.id);
    _entries.push_back(std::move(entry));
  }
  for (std::size_t i = _layout.size(); i > 1; --i) std::swap(_layout[i - 1], _layout[numbers.below(i)]);
  _rights = numbers.bytes(rightsSize * restored().size());
}

std::vector<const SampleApp*> SampleHost::restored() const {
  std::vector<const SampleApp*> apps;
  for (const auto& entry : _entries) {
    bool sound = entry.role == SampleRole::install || entry.role == SampleRole::older;
    if (sound && apps.size() < _options.restored) apps.push_back(&entry.app);
  }
  return apps;
}

void SampleHost::write() const {
  makeFolder(_options.host);
  writeTodoList();
  writeIconLayout();
  std::size_t place = 0;
  for (const auto& entry : _entries) {
    bool hasFolder = entry.role != SampleRole::badIdentifier && entry.role != SampleRole::remove;
    if (hasFolder) writeAppFolder(entry.app, place++ % 2 == 1);
  }
  writePackages();
  writeRestoreLists();
}

void SampleHost::writeTodoList() const {
  Value list = Value::makeArray();
  for (const auto& entry : _entries) {
    list.array()->append(
        entry.app.todoEntry(entry.role == SampleRole::remove ? platform::todo::remove : platform::todo::install));
  }
  writeFile(_options.host + "/" + std::string(platform::todoListName), propertyListOf(list, _options.seed % 2 == 0));
}

void SampleHost::writeIconLayout() const {
  std::size_t perPage = std::clamp<std::size_t>((_layout.size() + 1) / 2, 1, 20);
  Value pages = Value::makeArray();
  for (std::size_t i = 0; i < _layout.size();) {
    Value page = Value::makeArray();
    for (std::size_t n = 0; n < perPage && i < _layout.size(); ++n) page.array()->append(_layout[i++]);
    pages.array()->append(page);
  }
  writeFile(_options.host + "/" + std::string(platform::iconLayoutName), propertyListOf(pages, _options.seed % 2 == 1));
}

void SampleHost::writeAppFolder(const SampleApp& app, bool binary) const {
  const std::string folder = _options.host + "/" + app.id;
  makeFolder(folder);
  writeFile(folder + "/Info.plist", propertyListOf(app.manifest(), binary));
  writeFile(folder + "/" + std::string(platform::storeMetadataFileName), propertyListOf(app.storeMetadata(), !binary));
  writeFile(folder + "/" + std::string(platform::artworkFileName), app.icon);
  writeFile(folder + "/" + sampleIconName, app.icon);
}

void SampleHost::writePackages() const {
  const std::string folder = _options.host + "/Packages";
  const std::string olderFolder = folder + "/older";
  makeFolder(folder);
  std::uint64_t seed = _options.seed * 1000;
  for (const auto& entry : _entries) {
    ++seed;
    if (entry.role == SampleRole::badIdentifier) continue;
    std::string file = "/" + entry.app.id + ".pkg";
    if (entry.role != SampleRole::remove) writeSamplePackage(folder + file, entry.app, _options.packageSize, seed);
    if (entry.role == SampleRole::damaged) {
      std::error_code problem;
      auto size = std::filesystem::file_size(folder + file, problem);
      std::filesystem::resize_file(folder + file, size * 3 / 5, problem);
      if (problem) throw CommandError(folder + file + ": " + problem.message());
    }
    if (entry.role == SampleRole::older || entry.role == SampleRole::remove) {
      makeFolder(olderFolder);
      SampleApp older = entry.app;
      older.version = olderVersion;
      writeSamplePackage(olderFolder + file, older, _options.packageSize / 2, seed);
    }
  }
}

void SampleHost::writeRestoreLists() const {
  Value list = Value::makeDictionary();
  Value demoted = Value::makeDictionary();
  for (const char* key : {"AutomaticDowngrades", "IntentionalDowngrades"})
    demoted.dictionary()->set(key, Value::makeArray());
  auto apps = restored();
  for (std::size_t place = 0; place < apps.size(); ++place) {
    const auto& app = *apps[place];
    putRestored(list, {app.id, propertyListOf(app.storeMetadata(), place % 2 == 0),
                       platform::Bytes(_rights, place * rightsSize, rightsSize), app.icon});
    appendDemoted(demoted, app.id, demotionAt(place));
  }
  std::string folder = _options.host + "/Restore";
  makeFolder(folder);
  writeFile(folder + "/" + std::string(platform::restoreListName), propertyListOf(list, true));
  writeFile(folder + "/" + std::string(platform::demotedListName), propertyListOf(demoted, false));
}

}  // namespace tsd
