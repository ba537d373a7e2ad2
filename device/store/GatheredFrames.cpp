#include "device/store/GatheredFrames.h"

#include <sqlite3.h>
#include <sys/types.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <mutex>
#include <utility>

namespace device {

namespace {

// The shape of the log, which is the same in every version of the database's format: frames of a head and a page.
constexpr off_t logHead = 32;
constexpr std::size_t frameHead = 24;
constexpr std::size_t page = 4096;
constexpr std::size_t frame = frameHead + page;
/// In a frame's head: the size of the database after a commit, and zero before the commit's last frame.
constexpr std::size_t commitAt = 4, commitEnd = 8;

static_assert(sizeof(off_t) == 8, "as the database takes places to be");

/// What this thread has been asked to write and has not written: frames of one transaction, one behind the other. An
/// error is told for the commit's last page, before the database takes any of its frames for written.
struct Gathered {
  bool isWanted = false;
  int file = -1;
  off_t place = 0;
  std::size_t size = 0;
  std::array<char, 16 * frame> bytes{};

  bool lacksPage() const { return size % frame == frameHead; }
  bool goesOnAt(int itsFile, off_t itsPlace) const {
    return size == 0 || (itsFile == file && itsPlace == place + static_cast<off_t>(size));
  }
  bool isCommitted() const {
    const char* head = bytes.data() + size - frame;
    return std::any_of(head + commitAt, head + commitEnd, [](char byte) { return byte != 0; });
  }
  void add(int itsFile, off_t itsPlace, const void* data, std::size_t count) {
    if (size == 0) file = itsFile, place = itsPlace;
    std::copy_n(static_cast<const char*>(data), count, bytes.data() + size);
    size += count;
  }
  bool write() {
    std::size_t written = 0;
    while (written < size) {
      const ssize_t count = ::pwrite(file, bytes.data() + written, size - written, place + static_cast<off_t>(written));
      if (count < 0 && errno == EINTR) continue;
      if (count == 0) errno = ENOSPC;
      if (count <= 0) break;
      written += static_cast<std::size_t>(count);
    }
    return std::exchange(size, 0) == written;
  }
  /// The transaction is none of those whose frames come all at once, such as one that the cache has no room for.
  bool giveUp() {
    isWanted = false;
    return write();
  }
};
constinit thread_local Gathered gathered;

bool isFrameHead(std::size_t size, off_t place) {
  return size == frameHead && place >= logHead && (place - logHead) % static_cast<off_t>(frame) == 0;
}

/// These two take the places of the system's.
ssize_t writeAt(int file, const void* data, std::size_t size, off_t place) {
  if (!gathered.isWanted) return ::pwrite(file, data, size, place);
  const bool isFrame = gathered.lacksPage() ? size == page : isFrameHead(size, place);
  if (!isFrame || !gathered.goesOnAt(file, place)) {
    if (gathered.size > 0 && !gathered.giveUp()) return -1;
    return ::pwrite(file, data, size, place);
  }
  gathered.add(file, place, data, size);
  bool isDone = true;
  if (!gathered.lacksPage() && gathered.isCommitted())
    isDone = gathered.write();
  else if (gathered.size == gathered.bytes.size())
    isDone = gathered.giveUp();
  return isDone ? static_cast<ssize_t>(size) : -1;
}

ssize_t readAt(int file, void* data, std::size_t size, off_t place) {
  if (gathered.isWanted && gathered.size > 0 && !gathered.giveUp()) return -1;
  return ::pread(file, data, size, place);
}

void takePlaceOfSystem() {
  auto* system = sqlite3_vfs_find("unix");
  if (!system || system->iVersion < 3 || !system->xSetSystemCall) return;
  auto replace = [&](const char* name, sqlite3_syscall_ptr call) {
    // Which of them it uses depends on how it was built; the others are not there.
    if (system->xGetSystemCall(system, name)) system->xSetSystemCall(system, name, call);
  };
  for (const char* name : {"pwrite", "pwrite64"}) replace(name, reinterpret_cast<sqlite3_syscall_ptr>(&writeAt));
  for (const char* name : {"pread", "pread64"}) replace(name, reinterpret_cast<sqlite3_syscall_ptr>(&readAt));
}

}  // namespace

GatheredFrames::GatheredFrames() {
  static std::once_flag once;
  std::call_once(once, takePlaceOfSystem);
  gathered.isWanted = true;
}

// Something is left only of a transaction that has failed.
GatheredFrames::~GatheredFrames() {
  gathered.isWanted = false;
  gathered.size = 0;
}

}  // namespace device
