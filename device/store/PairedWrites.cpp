#include "device/store/PairedWrites.h"

#include <sqlite3.h>
#include <sys/uio.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>

namespace device {

namespace {

// The shape of the log, which is the same in every version of the database's format.
constexpr off_t logHead = 32;
constexpr std::size_t frameHead = 24;
constexpr off_t page = 4096;

/// The head of a frame that this thread has been asked to write, and that its page follows at once.
struct Head {
  int file = -1;
  off_t place = 0;
  std::array<char, frameHead> bytes{};
};
constinit thread_local Head held;
static_assert(sizeof(off_t) == 8, "as the database takes places to be");

bool isFrameHead(std::size_t size, off_t place) {
  return size == frameHead && place >= logHead && (place - logHead) % (static_cast<off_t>(frameHead) + page) == 0;
}

/// Like the system's, of which it takes the place.
ssize_t writeAt(int file, const void* data, std::size_t size, off_t place) {
  if (isFrameHead(size, place)) {
    held.file = file;
    held.place = place;
    std::memcpy(held.bytes.data(), data, size);
    return static_cast<ssize_t>(size);
  }
  if (held.file != file || held.place + static_cast<off_t>(frameHead) != place)
    return ::pwrite(file, data, size, place);
  std::array<iovec, 2> both{iovec{held.bytes.data(), frameHead}, iovec{const_cast<void*>(data), size}};
  const ssize_t written = ::pwritev(file, both.data(), both.size(), held.place);
  // The database asks again when the call was interrupted, and gives the page up when it failed.
  if (written < 0) return written;
  if (written <= static_cast<ssize_t>(frameHead)) {
    // There is hardly any room. How much of the page fits counts only when all of its head is there.
    const ssize_t head = ::pwrite(file, held.bytes.data(), frameHead, held.place);
    if (head >= 0 && head < static_cast<ssize_t>(frameHead)) errno = ENOSPC;
    return head < static_cast<ssize_t>(frameHead) ? -1 : ::pwrite(file, data, size, place);
  }
  held.file = -1;
  return written - static_cast<ssize_t>(frameHead);
}

}  // namespace

void pairWritesOfLog() {
  [[maybe_unused]] static const bool done = [] {
    auto* system = sqlite3_vfs_find("unix");
    if (!system || system->iVersion < 3 || !system->xSetSystemCall) return false;
    // Which of them it uses depends on how it was built; the others are not there.
    for (const char* name : {"pwrite", "pwrite64"}) {
      if (system->xGetSystemCall(system, name))
        system->xSetSystemCall(system, name, reinterpret_cast<sqlite3_syscall_ptr>(&writeAt));
    }
    return true;
  }();
}

}  // namespace device
