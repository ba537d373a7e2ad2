#include "device/files/DiskFileTree.h"

#include <fcntl.h>
#include <grp.h>
#include <linux/magic.h>
#include <pwd.h>
#include <sys/stat.h>
#include <sys/vfs.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <limits>
#include <map>
#include <new>

#include "device/files/DevicePath.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

using platform::Bytes;
using platform::BytesView;
using platform::Durability;
using platform::ErrorRef;
using platform::FileAttributes;
using platform::Value;

namespace {

constexpr std::size_t chunkSize = 128 * 1024;

/// The numbers of owners by name. Asking the system reads its files every time, so answers are kept: an owner's
/// number stays the same while a process runs.
class OwnerNumbers {
 public:
  /// The number under which the system's `find` knows a name; -1 for a name that is absent or unknown here, which
  /// leaves the owner as it is.
  template <class Find>
  std::uint32_t of(const Value& name, Find&& find) {
    auto text = name.string();
    if (!text) return static_cast<std::uint32_t>(-1);
    platform::Mutex::Lock lock(_mutex);
    auto place = _known.find(*text);
    if (place == _known.end()) place = _known.emplace(*text, find(std::string(*text).c_str())).first;
    return place->second;
  }

 private:
  platform::Mutex _mutex;
  std::map<std::string, std::uint32_t, std::less<>> _known GUARDED_BY(_mutex);
};

uid_t userNamed(const Value& name) {
  static OwnerNumbers users;
  return users.of(name, [](const char* text) {
    char space[4096];
    passwd entry;
    passwd* found = nullptr;
    ::getpwnam_r(text, &entry, space, sizeof space, &found);
    return found ? found->pw_uid : static_cast<uid_t>(-1);
  });
}
gid_t groupNamed(const Value& name) {
  static OwnerNumbers groups;
  return groups.of(name, [](const char* text) {
    char space[4096];
    group entry;
    group* found = nullptr;
    ::getgrnam_r(text, &entry, space, sizeof space, &found);
    return found ? found->gr_gid : static_cast<gid_t>(-1);
  });
}

void applyAttributes(const DiskPlace& place, const Value& attributes) {
  const auto* entries = attributes.dictionary();
  if (!entries || ::geteuid() != 0) return;
  uid_t owner = userNamed((*entries)[platform::FXFileOwnerAccountName]);
  gid_t group = groupNamed((*entries)[platform::FXFileGroupOwnerAccountName]);
  if (owner == static_cast<uid_t>(-1) && group == static_cast<gid_t>(-1)) return;
  // What cannot be applied is left out: the file matters, not its owner.
  [[maybe_unused]] int ignored = ::fchownat(place.directory(), place.name(), owner, group, AT_SYMLINK_NOFOLLOW);
}

/// Up to `count` bytes into `chunk`, from `offset` on; fewer at the end only.
int readChunk(int file, std::uint64_t offset, std::size_t count, Bytes& chunk) {
  std::size_t filled = 0;
  chunk.resize(count);
  while (filled < count) {
    ssize_t got = ::pread(file, chunk.data() + filled, count - filled, static_cast<off_t>(offset + filled));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return errno;
    if (got == 0) break;
    filled += static_cast<std::size_t>(got);
  }
  chunk.resize(filled);
  return 0;
}

/// `status` is that of the file.
int readWhole(int file, const struct stat& status, Bytes& contents) {
  const auto size = static_cast<std::size_t>(status.st_size);
  if (size > largestWholeRead) return EFBIG;
  contents.resize(size + 1);
  std::size_t filled = 0;
  while (true) {
    // One byte more than expected: a file that ends where it should is read in one go.
    ssize_t got = ::pread(file, contents.data() + filled, size + 1 - filled, static_cast<off_t>(filled));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return errno;
    filled += static_cast<std::size_t>(got);
    if (got == 0 || filled >= size) break;
  }
  contents.resize(filled);
  Bytes more;
  while (contents.size() > size) {
    if (int failure = readChunk(file, contents.size(), chunkSize, more)) return failure;
    if (more.empty()) break;
    contents += more;
    if (contents.size() > largestWholeRead) return EFBIG;
  }
  return 0;
}

class DiskFileWriter final : public FileWriter {
 public:
  DiskFileWriter(FileDescriptor file, std::string_view path, std::shared_ptr<StepWatch> watch)
      : _file(std::move(file)), _path(path), _watch(std::move(watch)) {}

  bool write(BytesView bytes, ErrorRef* error) override {
    return answerFileOperation(writeWhole(writing(), bytes), _path, error);
  }
  bool close(bool durable, ErrorRef* error) override {
    int failure = durable ? syncFile(writing()) : 0;
    _file = FileDescriptor();
    return answerFileOperation(failure, _path, error);
  }

 private:
  FileInWriting writing() const { return {_file.get(), _path, _watch.get()}; }

  FileDescriptor _file;
  const std::string _path;
  const std::shared_ptr<StepWatch> _watch;
};

class DiskFileReader final : public FileReader {
 public:
  DiskFileReader(FileDescriptor file, std::string_view path) : _file(std::move(file)), _path(path) {}

  std::optional<Bytes> read(std::size_t count, ErrorRef* error) override {
    Bytes chunk;
    if (!answerFileOperation(readChunk(_file.get(), _next, count, chunk), _path, error)) return std::nullopt;
    _next += chunk.size();
    return chunk;
  }
  bool seek(std::uint64_t offset, ErrorRef* error) override {
    const bool isOffset = offset <= static_cast<std::uint64_t>(std::numeric_limits<off_t>::max());
    if (isOffset) _next = offset;
    return answerFileOperation(isOffset ? 0 : EINVAL, _path, error);
  }

 private:
  FileDescriptor _file;
  const std::string _path;
  std::uint64_t _next = 0;
};

int moveBetween(const DiskPlace& from, const DiskPlace& to) {
  if (int failure = from.moveTo(to)) return failure;
  if (int failure = to.syncDirectory()) return failure;
  if (int failure = from.syncDirectory()) return failure;
  // The destination may lie in a directory that was made for it.
  return to.syncDirectoryAbove();
}

/// `status` is that of the file that is copied.
int copyContents(int from, const struct stat& status, const FileInWriting& to) {
  if ((status.st_mode & S_IXUSR) && ::fchmod(to.descriptor, 0755) != 0) return errno;
  Bytes chunk;
  if (static_cast<std::uint64_t>(status.st_size) < chunkSize) {
    int failure = readWhole(from, status, chunk);
    return failure ? failure : writeWhole(to, chunk);
  }
  std::uint64_t copied = 0;
  do {
    if (int failure = readChunk(from, copied, chunkSize, chunk)) return failure;
    if (int failure = writeWhole(to, chunk)) return failure;
    copied += chunk.size();
  } while (!chunk.empty());
  return 0;
}

/// So many are flushed one by one, which waits for nobody else's files. More, if they are large: to write out what
/// somebody else has written, such as the package that they came in, then takes longer than many single flushes.
constexpr std::size_t fewItems = 4;
constexpr std::size_t fewLargeItems = 64;
constexpr std::uint64_t largeItem = std::uint64_t{4} << 20;

/// The directory, where one request flushes all of its file system: some take it for nothing, or only for what they
/// keep here. Held open, so that the system tells of every write that failed from now on.
FileDescriptor openFlushable(int directory) {
  constexpr std::array<std::uint32_t, 6> known{EXT4_SUPER_MAGIC, XFS_SUPER_MAGIC, BTRFS_SUPER_MAGIC,
                                               F2FS_SUPER_MAGIC, TMPFS_MAGIC,     OVERLAYFS_SUPER_MAGIC};
  struct statfs about;
  FileDescriptor opened(::openat(directory, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!opened.isOpen() || ::fstatfs(opened.get(), &about) != 0) return FileDescriptor();
  const auto type = static_cast<std::uint32_t>(about.f_type);
  return std::find(known.begin(), known.end(), type) != known.end() ? std::move(opened) : FileDescriptor();
}

}  // namespace

DiskFileTree::DiskFileTree(FileDescriptor root, std::shared_ptr<StepWatch> watch, Use use)
    : _root(std::move(root)),
      _flushable(openFlushable(_root.get())),
      _watch(std::move(watch)),
      _kept(use == Use::alone ? std::make_unique<KeptFolders>() : nullptr) {}

bool DiskFileTree::answerChange(int failure, std::string_view path, ErrorRef* error) {
  if (failure != 0 && failure != ENOENT) _isTidy = false;
  return answerFileOperation(failure, path, error);
}

bool DiskFileTree::removeItem(std::string_view path, ErrorRef* error) {
  DiskPlace place;
  int failure = find(path, place);
  if (failure == 0) failure = place.remove();
  forget(path);
  return answerChange(failure, path, error);
}

int DiskFileTree::makeDirectory(std::string_view path, bool intermediates, const Value& attributes) const {
  DiskPlace place;
  if (int failure = find(path, intermediates, place)) return failure;
  if (place.isRoot()) return intermediates ? 0 : EEXIST;
  int failure = place.makeDirectory();
  if (failure == 0) applyAttributes(place, attributes);
  if (failure != EEXIST || !intermediates) return failure;
  struct stat status;
  if (int unknown = place.status(status)) return unknown;
  return S_ISDIR(status.st_mode) ? 0 : EEXIST;
}

bool DiskFileTree::createDirectory(std::string_view path, bool withIntermediateDirectories, const Value& attributes,
                                   ErrorRef* error) {
  return answerFileOperation(makeDirectory(path, withIntermediateDirectories, attributes), path, error);
}

bool DiskFileTree::moveItem(std::string_view from, std::string_view to, ErrorRef* error) {
  DiskPlace source, destination;
  struct stat status;
  int failure = find(from, source);
  if (failure == 0) failure = source.isRoot() ? EBUSY : source.status(status);
  if (failure) return answerFileOperation(failure, from, error);
  failure = find(to, destination);
  if (failure == 0) failure = destination.isRoot() ? EEXIST : moveBetween(source, destination);
  forget(from);
  return answerFileOperation(failure, to, error);
}

bool DiskFileTree::copyItem(std::string_view from, std::string_view to, ErrorRef* error) {
  FileDescriptor source;
  struct stat status;
  if (int failure = openFile(from, source, status)) return answerFileOperation(failure, from, error);
  DiskPlace destination;
  int failure = find(to, destination);
  if (failure == 0)
    failure =
        destination.replaceFile([&](const FileInWriting& file) { return copyContents(source.get(), status, file); });
  return answerChange(failure, to, error);
}

bool DiskFileTree::fileExists(std::string_view path, bool* isDirectory) {
  auto attributes = attributesOfItem(path, nullptr);
  if (isDirectory) *isDirectory = attributes && attributes->isDirectory;
  return attributes.has_value();
}

std::optional<FileAttributes> DiskFileTree::attributesOfItem(std::string_view path, ErrorRef* error) {
  DiskPlace place;
  struct stat status;
  int failure = find(path, place);
  if (failure == 0) failure = place.status(status);
  if (!answerFileOperation(failure, path, error)) return std::nullopt;
  bool isDirectory = S_ISDIR(status.st_mode);
  return FileAttributes{isDirectory, isDirectory ? 0 : static_cast<std::uint64_t>(status.st_size)};
}

bool DiskFileTree::putFile(std::string_view path, BytesView contents, const Value& attributes, ErrorRef* error) {
  DiskPlace place;
  int failure = find(path, place);
  if (failure == 0) failure = place.replaceFile([&](const FileInWriting& file) { return writeWhole(file, contents); });
  if (failure == 0) applyAttributes(place, attributes);
  return answerChange(failure, path, error);
}

int DiskFileTree::openFile(std::string_view path, FileDescriptor& file, struct stat& status) const {
  DiskPlace place;
  if (int failure = find(path, place)) return failure;
  return place.openFile(file, status);
}

std::optional<Bytes> DiskFileTree::readFile(std::string_view path, ErrorRef* error) {
  FileDescriptor file;
  struct stat status;
  Bytes contents;
  int failure = openFile(path, file, status);
  try {
    if (failure == 0) failure = readWhole(file.get(), status, contents);
  } catch (const std::bad_alloc&) {
    failure = ENOMEM;
  }
  if (!answerFileOperation(failure, path, error)) return std::nullopt;
  return contents;
}

bool DiskFileTree::writeAtomically(std::string_view path, BytesView contents, ErrorRef* error, Durability durability) {
  DiskPlace place;
  int failure = find(path, place);
  if (failure == 0) {
    failure = place.replaceFile([&](const FileInWriting& file) {
      const int unwritten = writeWhole(file, contents);
      // Before the rename, so that the new content is whole wherever the new name is.
      return unwritten == 0 && durability == Durability::lasting ? syncFile(file) : unwritten;
    });
  }
  if (failure == 0 && durability == Durability::lasting) failure = place.syncDirectory();
  return answerChange(failure, path, error);
}

int DiskFileTree::utimes(std::string_view path, int& errorNumber) {
  DiskPlace place;
  struct stat status;
  int failure = find(path, place);
  if (failure == 0) failure = place.status(status);
  if (failure == 0) failure = place.touch();
  if (failure == 0) return 0;
  errorNumber = failure;
  return -1;
}

std::optional<std::vector<FileTree::Entry>> DiskFileTree::list(std::string_view path, ErrorRef* error) {
  DiskPlace place;
  FileDescriptor directory;
  std::vector<std::string> names;
  int failure = find(path, place);
  if (failure == 0) failure = place.openDirectory(directory);
  if (failure == 0) failure = namesInDirectory(directory.get(), names);
  if (!answerFileOperation(failure, path, error)) return std::nullopt;
  std::sort(names.begin(), names.end());
  std::vector<Entry> entries;
  for (auto& name : names) {
    struct stat status;
    if (::fstatat(directory.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) continue;  // gone again
    if (S_ISDIR(status.st_mode))
      entries.push_back({std::move(name), true, 0});
    else if (S_ISREG(status.st_mode))
      entries.push_back({std::move(name), false, static_cast<std::uint64_t>(status.st_size)});
  }
  return entries;
}

std::unique_ptr<FileWriter> DiskFileTree::createNew(std::string_view path, bool executable, ErrorRef* error) {
  DiskPlace place;
  FileDescriptor file;
  int failure = find(path, place);
  if (failure == 0) failure = place.createFile(executable, file);
  if (!answerFileOperation(failure, path, error)) return nullptr;
  return std::make_unique<DiskFileWriter>(std::move(file), path, _watch);
}

std::unique_ptr<FileReader> DiskFileTree::openForReading(std::string_view path, ErrorRef* error) {
  FileDescriptor file;
  struct stat status;
  if (!answerFileOperation(openFile(path, file, status), path, error)) return nullptr;
  return std::make_unique<DiskFileReader>(std::move(file), path);
}

int DiskFileTree::flushDirectory(std::string_view path) const {
  DiskPlace place;
  FileDescriptor directory;
  if (int failure = find(path, place)) return failure;
  if (int failure = place.openDirectory(directory)) return failure;
  return device::syncDirectory(directory.get(), path, _watch.get());
}

int DiskFileTree::flushFile(std::string_view path) const {
  FileDescriptor file;
  struct stat status;
  if (int failure = openFile(path, file, status)) return failure;
  return syncFile({file.get(), path, _watch.get()});
}

bool DiskFileTree::syncDirectory(std::string_view path, ErrorRef* error) {
  return answerFileOperation(flushDirectory(path), path, error);
}

int DiskFileTree::flushTree(std::string_view path) const {
  return takeStep(_watch.get(), {Step::Kind::syncTree, path},
                  [&](Step&) { return ::syncfs(_flushable.get()) == 0 ? 0 : errno; });
}

bool DiskFileTree::syncItem(std::string_view path, ErrorRef* error) {
  DiskPlace place;
  struct stat status, root;
  int failure = find(path, place);
  if (failure == 0) failure = place.status(status);
  if (failure != 0) return answerFileOperation(failure, path, error);
  std::vector<Entry> items{{std::string(path), S_ISDIR(status.st_mode), 0}};
  std::uint64_t size = 0;
  const bool canBeOne = items.front().isDirectory && _flushable.isOpen() && ::fstat(_flushable.get(), &root) == 0 &&
                        root.st_dev == status.st_dev;
  for (std::size_t i = 0; i < items.size(); ++i) {
    if (!items[i].isDirectory) continue;
    std::string directory = path == "/" && i == 0 ? "" : items[i].name;
    auto entries = list(items[i].name, error);
    if (!entries) return false;
    for (const auto& entry : *entries) {
      items.push_back({directory + '/' + entry.name, entry.isDirectory, entry.size});
      size += entry.size;
    }
    if (canBeOne && items.size() > fewLargeItems) return answerFileOperation(flushTree(path), path, error);
  }
  const bool areLarge = size / items.size() >= largeItem;
  if (canBeOne && items.size() > fewItems && !areLarge) return answerFileOperation(flushTree(path), path, error);
  auto slash = path.rfind('/');
  items.push_back({std::string(slash == 0 ? "/" : path.substr(0, slash)), true, 0});
  for (const auto& item : items) {
    failure = item.isDirectory ? flushDirectory(item.name) : flushFile(item.name);
    if (failure != 0) break;
  }
  return answerFileOperation(failure, path, error);
}

std::unique_ptr<FileTree> openDiskFileTree(const std::string& root, ErrorRef* error, std::shared_ptr<StepWatch> watch) {
  // The folder itself is the owner's choice and may be reached through links.
  FileDescriptor opened(::open(root.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!answerFileOperation(opened.isOpen() ? 0 : errno, root, error)) return nullptr;
  return std::make_unique<DiskFileTree>(std::move(opened), std::move(watch));
}

}  // namespace device
