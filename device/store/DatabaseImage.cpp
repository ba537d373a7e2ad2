#include "device/store/DatabaseImage.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <map>
#include <string_view>

#include "device/files/DevicePath.h"
#include "device/files/FileDescriptor.h"

namespace device {

using platform::Bytes;
using platform::BytesView;
using platform::ErrorRef;

namespace {

constexpr std::size_t logHeaderSize = 32;
constexpr std::size_t frameHeaderSize = 24;
/// The format versions for reading and for writing: 1 for a file without a log.
constexpr std::size_t formatVersions = 18;
constexpr int attempts = 100;

std::uint32_t number(BytesView bytes, std::size_t at, bool bigEnds = true) {
  std::uint32_t result = 0;
  for (std::size_t i = 0; i < 4; ++i) {
    auto byte = static_cast<unsigned char>(bytes[at + (bigEnds ? i : 3 - i)]);
    result = result << 8 | byte;
  }
  return result;
}

/// The running checksum over a log; each frame carries it up to that frame.
class LogSum {
 public:
  explicit LogSum(bool bigEnds) : _bigEnds(bigEnds) {}
  void add(BytesView bytes) {
    for (std::size_t at = 0; at + 8 <= bytes.size(); at += 8) {
      _first += number(bytes, at, _bigEnds) + _second;
      _second += number(bytes, at + 4, _bigEnds) + _first;
    }
  }
  bool is(BytesView bytes, std::size_t at) const {
    return number(bytes, at) == _first && number(bytes, at + 4) == _second;
  }

 private:
  bool _bigEnds;
  std::uint32_t _first = 0;
  std::uint32_t _second = 0;
};

/// Answers an error number.
int readWhole(const std::string& path, Bytes& bytes) {
  FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  if (!file.isOpen()) return errno;
  struct stat facts {};
  if (::fstat(file.get(), &facts) != 0) return errno;
  if (!S_ISREG(facts.st_mode)) return EINVAL;
  bytes.clear();
  // It may grow meanwhile.
  std::array<char, 65536> buffer;
  ssize_t count;
  bytes.reserve(static_cast<std::size_t>(facts.st_size));
  while ((count = ::read(file.get(), buffer.data(), buffer.size())) != 0) {
    if (count > 0)
      bytes.append(buffer.data(), static_cast<std::size_t>(count));
    else if (errno != EINTR)
      return errno;
  }
  return 0;
}

/// What stays the same as long as everything written to the database is appended to its log. A log that was begun anew
/// has another header.
struct Period {
  ino_t file = 0;
  timespec written{};  // the file, when there is no log
  std::string header;  // of the log; empty: there is none

  bool operator==(const Period& other) const {
    return file == other.file && header == other.header &&
           (!header.empty() || (written.tv_sec == other.written.tv_sec && written.tv_nsec == other.written.tv_nsec));
  }
};

int periodOf(const std::string& path, Period& period) {
  struct stat facts {};
  if (::lstat(path.c_str(), &facts) != 0) return errno;
  period = {facts.st_ino, facts.st_mtim, std::string(logHeaderSize, '\0')};
  FileDescriptor log(::open((path + "-wal").c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  if (!log.isOpen() && errno != ENOENT) return errno;
  ssize_t count = log.isOpen() ? ::pread(log.get(), period.header.data(), logHeaderSize, 0) : 0;
  if (count < 0) return errno;
  period.header.resize(static_cast<std::size_t>(count));
  return 0;
}

/// Puts the pages of the log's complete commits in their places. Where the checksum is wrong a writer is at work, or
/// has died.
void applyLog(BytesView log, Bytes& image) {
  if (log.size() < logHeaderSize) return;
  std::uint32_t magic = number(log, 0);
  LogSum sum((magic & 1) != 0);
  sum.add(log.substr(0, 24));
  std::size_t pageSize = number(log, 8);
  bool isPower = pageSize >= 512 && pageSize <= 65536 && (pageSize & (pageSize - 1)) == 0;
  if ((magic & ~1U) != 0x377f0682 || !isPower || !sum.is(log, 24)) return;
  std::map<std::uint32_t, std::size_t> pages;  // of the commit being read: where in the log each page is
  for (std::size_t at = logHeaderSize; at + frameHeaderSize + pageSize <= log.size();
       at += frameHeaderSize + pageSize) {
    if (log.substr(at + 8, 8) != log.substr(16, 8)) return;
    sum.add(log.substr(at, 8));
    sum.add(log.substr(at + frameHeaderSize, pageSize));
    if (!sum.is(log, at + 16)) return;
    pages[number(log, at)] = at + frameHeaderSize;
    std::uint32_t pageCount = number(log, at + 4);
    if (pageCount == 0) continue;
    image.resize(pageCount * pageSize);
    for (auto [page, place] : pages) {
      if (page > 0 && page <= pageCount) image.replace((page - 1) * pageSize, pageSize, log.substr(place, pageSize));
    }
    pages.clear();
  }
}

}  // namespace

std::optional<Bytes> readDatabaseImage(const std::string& path, ErrorRef* error) {
  platform::setError(error, nullptr);
  auto refuse = [&](const std::string& why) {
    platform::setError(error, platform::makeError("Store", 1, path + ": " + why));
    return std::nullopt;
  };
  // The log after the file: a page that is written back to the file meanwhile is in the log too, until the log is begun
  // anew, and then the two do not belong together.
  for (int attempt = 0; attempt < attempts; ++attempt) {
    Period before, after;
    Bytes image, log;
    int failure = periodOf(path, before);
    if (failure == 0) failure = readWhole(path, image);
    if (failure == 0 && !before.header.empty()) failure = readWhole(path + "-wal", log);
    if (failure != 0 && failure != ENOENT) return refuse("not read: " + textOfErrorNumber(failure));
    if (failure == 0) failure = periodOf(path, after);
    if (failure == ENOENT && ::access(path.c_str(), F_OK) != 0)
      return refuse("not read: " + textOfErrorNumber(failure));
    if (failure != 0 || !(before == after)) continue;
    if (::access((path + "-journal").c_str(), F_OK) == 0) return refuse("it is being made");
    applyLog(log, image);
    for (std::size_t i = 0; i < 2 && image.size() > formatVersions + 1; ++i) {
      if (image[formatVersions + i] == 2) image[formatVersions + i] = 1;
    }
    return image;
  }
  return refuse("it changes too fast to be read");
}

}  // namespace device
