#include "device/DiskPlace.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <memory>

#include "device/DevicePath.h"
#include "device/FileTree.h"

namespace device {

namespace {

constexpr int directoryFlags = O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

int kindError(const struct stat& status) {
  if (S_ISREG(status.st_mode) || S_ISDIR(status.st_mode)) return 0;
  return S_ISLNK(status.st_mode) ? ELOOP : EOPNOTSUPP;
}

int openDirectoryAt(int parent, const char* name, int flags, FileDescriptor& directory) {
  directory = FileDescriptor(::openat(parent, name, flags | directoryFlags));
  if (directory.isOpen()) return 0;
  int failure = errno;
  struct stat status;
  // The system calls a link "not a directory" here.
  if (failure == ENOTDIR && ::fstatat(parent, name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISLNK(status.st_mode))
    return ELOOP;
  return failure;
}

/// A name that nothing has yet in any directory, as far as this process knows.
std::string freshTemporaryName() {
  static std::atomic<std::uint64_t> last{0};
  char name[64];
  std::snprintf(name, sizeof name, "%lx-%llx", static_cast<unsigned long>(::getpid()),
                static_cast<unsigned long long>(++last));
  return std::string(temporaryFilePrefix) + name;
}

/// Moves what is two levels below `top` up into it, so that no depth of directories needs more than two of them open.
int flattenInto(int top, const char* name) {
  FileDescriptor directory;
  if (int failure = openDirectoryAt(top, name, O_RDONLY, directory)) return failure;
  std::vector<std::string> names;
  if (int failure = namesInDirectory(directory.get(), names)) return failure;
  for (const auto& each : names) {
    if (::unlinkat(directory.get(), each.c_str(), 0) == 0 || errno == ENOENT) continue;
    if (errno != EISDIR) return errno;
    if (::unlinkat(directory.get(), each.c_str(), AT_REMOVEDIR) == 0) continue;
    if (::renameat(directory.get(), each.c_str(), top, freshTemporaryName().c_str()) != 0) return errno;
  }
  return 0;
}

int emptyDirectory(int top) {
  std::vector<std::string> names;
  do {
    names.clear();
    if (int failure = namesInDirectory(top, names)) return failure;
    for (const auto& each : names) {
      if (::unlinkat(top, each.c_str(), 0) == 0 || errno == ENOENT) continue;
      if (errno != EISDIR) return errno;
      if (int failure = flattenInto(top, each.c_str())) return failure;
      if (::unlinkat(top, each.c_str(), AT_REMOVEDIR) != 0 && errno != ENOENT) return errno;
    }
  } while (!names.empty());
  return 0;
}

}  // namespace

int namesInDirectory(int directory, std::vector<std::string>& names) {
  // The stream takes a descriptor over and has a position of its own.
  int own = ::openat(directory, ".", O_RDONLY | directoryFlags);
  if (own < 0) return errno;
  std::unique_ptr<DIR, int (*)(DIR*)> stream(::fdopendir(own), ::closedir);
  if (!stream) {
    int failure = errno;
    ::close(own);
    return failure;
  }
  while (true) {
    errno = 0;
    const dirent* entry = ::readdir(stream.get());
    if (!entry) return errno;
    std::string_view name = entry->d_name;
    if (name != "." && name != "..") names.emplace_back(name);
  }
}

int writeWhole(int file, std::string_view bytes) {
  while (!bytes.empty()) {
    ssize_t written = ::write(file, bytes.data(), bytes.size());
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return written < 0 ? errno : EIO;
    bytes.remove_prefix(static_cast<std::size_t>(written));
  }
  return 0;
}

int DiskPlace::find(const FileDescriptor& root, std::string_view path, bool makeDirectories, DiskPlace& place) {
  std::vector<std::string_view> names;
  if (int failure = splitDevicePath(path, names)) return failure;
  if (int failure = openDirectoryAt(root.get(), ".", O_PATH, place._directory)) return failure;
  place._isRoot = names.empty();
  place._name = names.empty() ? "." : names.back();
  for (std::size_t i = 0; i + 1 < names.size(); ++i) {
    std::string name(names[i]);
    FileDescriptor next;
    int failure = openDirectoryAt(place.directory(), name.c_str(), O_PATH, next);
    if (failure == ENOENT && makeDirectories) {
      if (::mkdirat(place.directory(), name.c_str(), 0777) != 0 && errno != EEXIST) return errno;
      failure = openDirectoryAt(place.directory(), name.c_str(), O_PATH, next);
    }
    if (failure) return failure;
    place._directory = std::move(next);
  }
  return 0;
}

int DiskPlace::status(struct stat& status) const {
  if (::fstatat(directory(), name(), &status, AT_SYMLINK_NOFOLLOW) != 0) return errno;
  return kindError(status);
}

int DiskPlace::mayHoldFile() const {
  struct stat found;
  int failure = status(found);
  if (failure == ENOENT) return 0;
  if (failure == 0 && S_ISDIR(found.st_mode)) return EISDIR;
  return failure;
}

int DiskPlace::openFile(FileDescriptor& file) const {
  struct stat found;
  if (int failure = status(found)) return failure;
  if (S_ISDIR(found.st_mode)) return EISDIR;
  // Somebody may have put something else there meanwhile, so it must neither block nor be taken for a file.
  file = FileDescriptor(::openat(directory(), name(), O_RDONLY | O_NONBLOCK | O_NOFOLLOW | O_CLOEXEC));
  if (!file.isOpen()) return errno;
  if (::fstat(file.get(), &found) != 0) return errno;
  return S_ISREG(found.st_mode) ? 0 : EOPNOTSUPP;
}

int DiskPlace::openDirectory(FileDescriptor& directory) const {
  return openDirectoryAt(this->directory(), name(), O_RDONLY, directory);
}

int DiskPlace::syncDirectory() const {
  FileDescriptor opened;
  if (int failure = openDirectoryAt(directory(), ".", O_RDONLY, opened)) return failure;
  // EINVAL: a file system that has nothing to flush for a directory.
  return ::fsync(opened.get()) == 0 || errno == EINVAL ? 0 : errno;
}

int DiskPlace::replaceFile(const std::function<int(int file)>& fill) const {
  if (int failure = mayHoldFile()) return failure;
  FileDescriptor file;
  std::string temporary;
  do {
    temporary = freshTemporaryName();
    file = FileDescriptor(
        ::openat(directory(), temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0666));
  } while (!file.isOpen() && errno == EEXIST);
  if (!file.isOpen()) return errno;
  int failure = fill(file.get());
  if (failure == 0 && ::fsync(file.get()) != 0) failure = errno;
  if (failure == 0 && ::renameat(directory(), temporary.c_str(), directory(), name()) != 0) failure = errno;
  if (failure != 0) ::unlinkat(directory(), temporary.c_str(), 0);
  return failure;
}

int DiskPlace::remove() const {
  constexpr int attempts = 16;  // against somebody who goes on putting things in
  if (_isRoot) return EBUSY;
  if (::unlinkat(directory(), name(), 0) == 0) return 0;
  if (errno != EISDIR) return errno;
  FileDescriptor opened;
  if (int failure = openDirectory(opened)) return failure;
  for (int i = 0; i < attempts; ++i) {
    if (int failure = emptyDirectory(opened.get())) return failure;
    if (::unlinkat(directory(), name(), AT_REMOVEDIR) == 0) return 0;
    if (errno != ENOTEMPTY && errno != EEXIST) return errno;
  }
  return ENOTEMPTY;
}

}  // namespace device
