#include "device/files/DiskPlace.h"

#include <dirent.h>
#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <memory>

#include "device/files/DevicePath.h"
#include "device/files/FileTree.h"

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
  // The system reports a link as "not a directory" here.
  if (failure == ENOTDIR && ::fstatat(parent, name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISLNK(status.st_mode))
    return ELOOP;
  return failure;
}

/// The directory that a path below `root` leads to, in one call. Nothing where the system has no such call, or when it
/// fails: the walk, name by name, then tells why.
FileDescriptor openBelow(const FileDescriptor& root, const std::string& path) {
  struct open_how how {};
  how.flags = O_PATH | O_DIRECTORY | O_CLOEXEC;
  how.resolve = RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS;
  return FileDescriptor(static_cast<int>(::syscall(SYS_openat2, root.get(), path.c_str(), &how, sizeof how)));
}

/// A name not used yet in any directory, as far as this process knows.
std::string freshTemporaryName() {
  static std::atomic<std::uint64_t> last{0};
  static const auto process = static_cast<unsigned long>(::getpid());
  char name[64];
  std::snprintf(name, sizeof name, "%lx-%llx", process, static_cast<unsigned long long>(++last));
  return std::string(temporaryFilePrefix) + name;
}

std::string joined(std::string_view directory, std::string_view name) {
  return std::string(directory == "/" ? "" : directory) + '/' + std::string(name);
}

std::string_view parentOf(std::string_view path) {
  auto slash = path.rfind('/');
  return slash == 0 ? "/" : path.substr(0, slash);
}

/// What is not there counts as removed.
int removeAt(int directory, const char* name, int flags, const std::string& path, StepWatch* watch) {
  return takeStep(watch, {Step::Kind::remove, path},
                  [&](Step&) { return ::unlinkat(directory, name, flags) == 0 || errno == ENOENT ? 0 : errno; });
}

/// Moves what is two levels below `top` up into it, so that no depth of directories needs more than two of them open.
int flattenInto(int top, const char* name, const std::string& topPath, StepWatch* watch, bool& moved) {
  FileDescriptor directory;
  if (int failure = openDirectoryAt(top, name, O_RDONLY, directory)) return failure;
  std::vector<std::string> names;
  if (int failure = namesInDirectory(directory.get(), names)) return failure;
  for (const auto& each : names) {
    std::string path = joined(joined(topPath, name), each);
    int failure = removeAt(directory.get(), each.c_str(), 0, path, watch);
    if (failure == EISDIR) failure = removeAt(directory.get(), each.c_str(), AT_REMOVEDIR, path, watch);
    if (failure == ENOTEMPTY || failure == EEXIST) {
      std::string fresh = freshTemporaryName();
      moved = true;
      failure = takeStep(watch, {Step::Kind::move, path, joined(topPath, fresh)}, [&](Step&) {
        return ::renameat(directory.get(), each.c_str(), top, fresh.c_str()) == 0 ? 0 : errno;
      });
    }
    if (failure) return failure;
  }
  return 0;
}

/// Of a directory that is open for reading, from where it was read to.
int emptyDirectory(int top, const std::string& topPath, StepWatch* watch) {
  for (bool moved = true; moved;) {
    moved = false;
    std::vector<std::string> names;
    if (int failure = namesInDirectory(top, names)) return failure;
    for (const auto& each : names) {
      std::string path = joined(topPath, each);
      int failure = removeAt(top, each.c_str(), 0, path, watch);
      if (failure == EISDIR) {
        failure = flattenInto(top, each.c_str(), topPath, watch, moved);
        if (failure == 0) failure = removeAt(top, each.c_str(), AT_REMOVEDIR, path, watch);
      }
      if (failure) return failure;
    }
    if (moved && ::lseek(top, 0, SEEK_SET) != 0) return errno;
  }
  return 0;
}

}  // namespace

int namesInDirectory(int directory, std::vector<std::string>& names) {
  alignas(dirent64) std::array<char, 16384> space;
  while (true) {
    const ssize_t filled = ::getdents64(directory, space.data(), space.size());
    // ENOENT: the directory itself has been removed.
    if (filled <= 0) return filled < 0 && errno != ENOENT ? errno : 0;
    for (ssize_t at = 0; at < filled;) {
      const auto* entry = reinterpret_cast<const dirent64*>(space.data() + at);
      at += entry->d_reclen;
      std::string_view name = entry->d_name;
      if (name != "." && name != "..") names.emplace_back(name);
    }
  }
}

int writeWhole(const FileInWriting& file, std::string_view bytes) {
  while (!bytes.empty()) {
    std::size_t taken = 0;
    int failure = takeStep(file.watch, {Step::Kind::write, file.path, {}, bytes}, [&](Step& step) {
      ssize_t written;
      do {
        written = ::write(file.descriptor, step.bytes.data(), step.bytes.size());
      } while (written < 0 && errno == EINTR);
      if (written <= 0) return written < 0 ? errno : EIO;
      taken = static_cast<std::size_t>(written);
      step.bytes = step.bytes.substr(0, taken);
      return 0;
    });
    if (failure) return failure;
    bytes.remove_prefix(taken);
  }
  return 0;
}

int syncFile(const FileInWriting& file) {
  return takeStep(file.watch, {Step::Kind::syncFile, file.path},
                  [&](Step&) { return ::fsync(file.descriptor) == 0 ? 0 : errno; });
}

int syncDirectory(int directory, std::string_view path, StepWatch* watch) {
  return takeStep(watch, {Step::Kind::syncDirectory, path}, [&](Step&) {
    // EINVAL: a file system that has nothing to flush for a directory.
    return ::fsync(directory) == 0 || errno == EINVAL ? 0 : errno;
  });
}

int DiskPlace::find(const FileDescriptor& root, std::string_view path, bool makeDirectories, StepWatch* watch,
                    KeptFolders* kept, DiskPlace& place) {
  std::vector<std::string_view> names;
  if (int failure = splitDevicePath(path, names)) return failure;
  place._path = path;
  place._watch = watch;
  place._isRoot = names.empty();
  place._name = names.empty() ? "." : names.back();
  const std::string_view folder = place.directoryPath();
  if (kept && (place._directory = kept->find(folder))) return 0;
  const std::uint64_t changes = kept ? kept->changes() : 0;
  FileDescriptor opened = openBelow(root, folder == "/" ? "." : std::string(folder.substr(1)));
  if (!opened.isOpen()) {
    if (kept && errno == EMFILE) kept->clear();
    if (int failure = place.walk(root, names, makeDirectories, opened)) return failure;
  }
  place._directory = std::make_shared<const FileDescriptor>(std::move(opened));
  if (kept) kept->keep(folder, place._directory, changes);
  return 0;
}

int DiskPlace::walk(const FileDescriptor& root, const std::vector<std::string_view>& names, bool makeDirectories,
                    FileDescriptor& directory) const {
  if (int failure = openDirectoryAt(root.get(), ".", O_PATH, directory)) return failure;
  for (std::size_t i = 0; i + 1 < names.size(); ++i) {
    std::string name(names[i]);
    FileDescriptor next;
    int failure = openDirectoryAt(directory.get(), name.c_str(), O_PATH, next);
    if (failure == ENOENT && makeDirectories) {
      auto upTo = _path.substr(0, static_cast<std::size_t>(names[i].data() + names[i].size() - _path.data()));
      failure = takeStep(_watch, {Step::Kind::createDirectory, upTo}, [&](Step&) {
        return ::mkdirat(directory.get(), name.c_str(), 0777) == 0 || errno == EEXIST ? 0 : errno;
      });
      if (failure) return failure;
      failure = openDirectoryAt(directory.get(), name.c_str(), O_PATH, next);
    }
    if (failure) return failure;
    directory = std::move(next);
  }
  return 0;
}

std::string_view DiskPlace::directoryPath() const { return _isRoot ? "/" : parentOf(_path); }

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

int DiskPlace::openFile(FileDescriptor& file, struct stat& status) const {
  if (int failure = this->status(status)) return failure;
  if (S_ISDIR(status.st_mode)) return EISDIR;
  // Somebody may have put something else there meanwhile: opening it must neither block nor take it for a file.
  file = FileDescriptor(::openat(directory(), name(), O_RDONLY | O_NONBLOCK | O_NOFOLLOW | O_CLOEXEC));
  if (!file.isOpen()) return errno;
  if (::fstat(file.get(), &status) != 0) return errno;
  return S_ISREG(status.st_mode) ? 0 : EOPNOTSUPP;
}

int DiskPlace::openDirectory(FileDescriptor& directory) const {
  return openDirectoryAt(this->directory(), name(), O_RDONLY, directory);
}

int DiskPlace::syncDirectory() const {
  FileDescriptor opened;
  if (int failure = openDirectoryAt(directory(), ".", O_RDONLY, opened)) return failure;
  return device::syncDirectory(opened.get(), directoryPath(), _watch);
}

int DiskPlace::syncDirectoryAbove() const {
  auto path = directoryPath();
  if (path == "/") return 0;
  FileDescriptor opened;
  // The directory is held open, so that its ".." is the one that it was found in or moved to.
  if (int failure = openDirectoryAt(directory(), "..", O_RDONLY, opened)) return failure;
  return device::syncDirectory(opened.get(), parentOf(path), _watch);
}

int DiskPlace::makeDirectory() const {
  return takeStep(_watch, {Step::Kind::createDirectory, _path},
                  [&](Step&) { return ::mkdirat(directory(), name(), 0777) == 0 ? 0 : errno; });
}

int DiskPlace::createFile(bool executable, FileDescriptor& file) const {
  return takeStep(_watch, {Step::Kind::createFile, _path}, [&](Step&) {
    file = FileDescriptor(
        ::openat(directory(), name(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, executable ? 0777 : 0666));
    return file.isOpen() ? 0 : errno;
  });
}

int DiskPlace::moveTo(const DiskPlace& target) const {
  return takeStep(_watch, {Step::Kind::move, _path, target._path}, [&](Step&) {
    if (::renameat2(directory(), name(), target.directory(), target.name(), RENAME_NOREPLACE) == 0) return 0;
    if (errno != EINVAL && errno != ENOSYS) return errno;
    // For a file system that cannot do that; not atomic towards other processes.
    struct stat status;
    if (::fstatat(target.directory(), target.name(), &status, AT_SYMLINK_NOFOLLOW) == 0) return EEXIST;
    return ::renameat(directory(), name(), target.directory(), target.name()) == 0 ? 0 : errno;
  });
}

int DiskPlace::touch() const {
  return takeStep(_watch, {Step::Kind::touch, _path}, [&](Step&) {
    return ::utimensat(directory(), name(), nullptr, AT_SYMLINK_NOFOLLOW) == 0 ? 0 : errno;
  });
}

int DiskPlace::replaceFile(const std::function<int(const FileInWriting& file)>& fill) const {
  if (int failure = mayHoldFile()) return failure;
  FileDescriptor file;
  std::string temporary;
  std::string path;
  int failure;
  do {
    temporary = freshTemporaryName();
    path = joined(directoryPath(), temporary);
    failure = takeStep(_watch, {Step::Kind::createFile, path}, [&](Step&) {
      file = FileDescriptor(
          ::openat(directory(), temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0666));
      return file.isOpen() ? 0 : errno;
    });
  } while (failure == EEXIST);
  if (!file.isOpen()) return failure;
  FileInWriting writing{file.get(), path, _watch};
  if (failure == 0) failure = fill(writing);
  if (failure == 0) {
    failure = takeStep(_watch, {Step::Kind::move, path, _path}, [&](Step&) {
      return ::renameat(directory(), temporary.c_str(), directory(), name()) == 0 ? 0 : errno;
    });
  }
  if (failure != 0) removeAt(directory(), temporary.c_str(), 0, path, _watch);
  return failure;
}

int DiskPlace::remove() const {
  constexpr int attempts = 16;  // against somebody who keeps putting things in
  if (_isRoot) return EBUSY;
  auto removeItself = [&](int flags) {
    return takeStep(_watch, {Step::Kind::remove, _path},
                    [&](Step&) { return ::unlinkat(directory(), name(), flags) == 0 ? 0 : errno; });
  };
  if (int failure = removeItself(0); failure != EISDIR) return failure;
  FileDescriptor opened;
  if (int failure = openDirectory(opened)) return failure;
  for (int i = 0; i < attempts; ++i) {
    if (int failure = emptyDirectory(opened.get(), std::string(_path), _watch)) return failure;
    int failure = removeItself(AT_REMOVEDIR);
    if (failure != ENOTEMPTY && failure != EEXIST) return failure;
    if (::lseek(opened.get(), 0, SEEK_SET) != 0) return errno;
  }
  return ENOTEMPTY;
}

}  // namespace device
