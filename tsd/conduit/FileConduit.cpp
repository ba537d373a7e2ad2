#include "tsd/conduit/FileConduit.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <memory>

#include "platform/DevicePaths.h"
#include "tsd/CommandError.h"

namespace tsd {
namespace {

constexpr std::size_t chunkSize = std::size_t{256} << 10;

struct CloseDirectory {
  void operator()(DIR* directory) const { ::closedir(directory); }
};
using Directory = std::unique_ptr<DIR, CloseDirectory>;

/// The host has to know at once that the device takes no more; a name that no device takes concerns its file only.
bool isAboutName(const platform::ErrorRef& error) {
  return error && (error->code() == EINVAL || error->code() == ENAMETOOLONG || error->code() == EILSEQ);
}

CommandError tooMany(const std::string& path, std::size_t limit) {
  return CommandError(path + ": more than " + std::to_string(limit) + " files and folders are not taken");
}
CommandError tooMuch(const std::string& path) {
  return CommandError(path + ": more than " + std::to_string(FileConduit::maximumBytes) + " bytes are not taken");
}

/// The names in a directory, sorted.
std::vector<std::string> namesIn(DIR* directory, const std::string& path, std::size_t limit) {
  std::vector<std::string> names;
  errno = 0;
  while (const dirent* entry = ::readdir(directory)) {
    if (isFileName(entry->d_name)) names.emplace_back(entry->d_name);
    if (names.size() > limit) throw tooMany(path, limit);
    errno = 0;
  }
  if (errno != 0) throw CommandError(path + ": " + std::strerror(errno));
  std::sort(names.begin(), names.end());
  return names;
}

/// Whether the host has a todo list. Throws when there is something that cannot be read as one.
bool hasTodoList(int directory, const std::string& hostFolder) {
  std::string path = hostFolder + "/" + std::string(platform::todoListName);
  struct stat facts {};
  if (::fstatat(directory, std::string(platform::todoListName).c_str(), &facts, AT_SYMLINK_NOFOLLOW) != 0) {
    if (errno == ENOENT) return false;
    throw CommandError(path + ": " + std::strerror(errno));
  }
  if (!S_ISREG(facts.st_mode)) throw CommandError(path + ": " + sortOfFile(facts.st_mode) + ", not a file");
  platform::ErrorRef error;
  if (!HostFile::openAt(directory, std::string(platform::todoListName), &error))
    throw CommandError(path + ": " + textOf(error));
  return true;
}

}  // namespace

bool FileConduit::pushStaging(const std::string& hostFolder) {
  Directory directory(::opendir(hostFolder.c_str()));
  if (!directory) throw CommandError(hostFolder + ": " + std::strerror(errno));
  bool hasList = hasTodoList(::dirfd(directory.get()), hostFolder);
  // What an interrupted session left there does not belong to this one.
  if (_files.fileExists(platform::stagingDirectory)) {
    platform::ErrorRef error;
    if (!_files.removeItem(platform::stagingDirectory, &error))
      throw CommandError("the staging directory: " + textOf(error));
  }
  if (!hasList) return false;
  try {
    pushTree({directory.get(), hostFolder, std::string(platform::stagingDirectory), 0});
  } catch (...) {
    _files.removeItem(platform::stagingDirectory);
    throw;
  }
  return true;
}

void FileConduit::pushTree(const Level& level) {
  _entries = 0;
  _refused = 0;
  _pushedBytes = 0;
  pushDirectory(level);
  if (_refused > maximumRefusalsTold) {
    _console.message(level.hostPath + ": " + std::to_string(_refused - maximumRefusalsTold) +
                     " more files were not pushed");
  }
}

void FileConduit::pushDirectory(const Level& level) {
  platform::ErrorRef error;
  if (!_files.createDirectory(level.devicePath, true, {}, &error)) {
    if (level.depth == 0) throw CommandError("the staging directory: " + textOf(error));
    if (!isAboutName(error)) throw CommandError(level.hostPath + ": " + textOf(error));
    refuse(level.hostPath, textOf(error));
    return;
  }
  for (const auto& name : namesIn(level.directory, level.hostPath, _limits.entries)) {
    if (level.depth == 0 && (name == packagesName || name == restoreName)) continue;
    pushItem(level, name);
  }
}

void FileConduit::checkStopped() const {
  if (_isStopped && _isStopped())
    throw CommandError(ExitCode::cancelled, "stopped while the host's files were being copied");
}

void FileConduit::pushItem(const Level& level, const std::string& name) {
  checkStopped();
  std::string hostPath = level.hostPath + "/" + name;
  if (++_entries > _limits.entries) throw tooMany(hostPath, _limits.entries);
  std::string devicePath = level.devicePath + "/" + name;
  struct stat facts {};
  const int above = ::dirfd(level.directory);
  if (::fstatat(above, name.c_str(), &facts, AT_SYMLINK_NOFOLLOW) != 0) {
    return refuse(hostPath, std::strerror(errno));
  }
  if (S_ISDIR(facts.st_mode)) {
    if (level.depth + 1 > maximumDepth) {
      return refuse(hostPath, "nested more than " + std::to_string(maximumDepth) + " deep");
    }
    int opened = ::openat(above, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    if (opened < 0) return refuse(hostPath, std::strerror(errno));
    Directory directory(::fdopendir(opened));
    if (!directory) throw CommandError(hostPath + ": " + std::strerror(errno));
    return pushDirectory({directory.get(), hostPath, devicePath, level.depth + 1});
  }
  if (!S_ISREG(facts.st_mode)) return refuse(hostPath, std::string(sortOfFile(facts.st_mode)) + ", not a regular file");
  platform::ErrorRef error;
  auto file = HostFile::openAt(above, name, &error);
  if (!file) return refuse(hostPath, textOf(error));
  // If power is lost, the next sync brings the rest again; but a torn list would be taken for the host's.
  bool isTodoList = level.depth == 0 && name == platform::todoListName;
  if (auto refusal = copy(*file, hostPath, devicePath, isTodoList)) refuse(hostPath, textOf(refusal));
}

platform::ErrorRef FileConduit::copy(HostFile& file, const std::string& hostPath, std::string_view devicePath,
                                     bool durable) {
  // Before a byte of it is copied: a file may be much longer than what it takes on the host's disk.
  if (file.size() > _limits.fileBytes) {
    return platform::makeError("Host", EFBIG, "more than " + std::to_string(_limits.fileBytes) + " bytes");
  }
  if (file.size() > maximumBytes - _pushedBytes) throw tooMuch(hostPath);
  platform::ErrorRef error;
  auto writer = _files.createNew(devicePath, false, &error);
  if (!writer && isAboutName(error)) return error;
  if (!writer) throw CommandError(hostPath + ": " + textOf(error));
  std::uint64_t copied = 0;
  while (true) {
    checkStopped();
    auto bytes = file.read(chunkSize, &error);
    if (!bytes) throw CommandError(hostPath + ": " + textOf(error));
    if (bytes->empty()) break;
    _pushedBytes += bytes->size();
    if (_pushedBytes > maximumBytes) throw tooMuch(hostPath);
    if (!writer->write(*bytes, &error)) throw CommandError(hostPath + ": " + textOf(error));
    copied += bytes->size();
    if (copied == file.size() && bytes->size() < chunkSize) break;  // more was asked for
  }
  if (!writer->close(durable, &error)) throw CommandError(hostPath + ": " + textOf(error));
  return nullptr;
}

void FileConduit::pushFile(const std::string& hostFile, std::string_view devicePath) {
  platform::ErrorRef error;
  auto file = HostFile::open("", hostFile, &error);
  if (!file) throw CommandError(hostFile + ": " + textOf(error));
  std::string parent(devicePath.substr(0, devicePath.rfind('/')));
  if (!_files.createDirectory(parent, true, {}, &error)) throw CommandError(parent + ": " + textOf(error));
  if (_files.fileExists(devicePath) && !_files.removeItem(devicePath, &error)) {
    throw CommandError(std::string(devicePath) + ": " + textOf(error));
  }
  _pushedBytes = 0;
  if (auto refusal = copy(*file, hostFile, devicePath, true)) throw CommandError(hostFile + ": " + textOf(refusal));
  if (!_files.syncDirectory(parent, &error)) throw CommandError(parent + ": " + textOf(error));
}

void FileConduit::refuse(const std::string& hostPath, const std::string& why) {
  if (++_refused <= maximumRefusalsTold) _console.message(hostPath + ": not pushed: " + why);
}

}  // namespace tsd
