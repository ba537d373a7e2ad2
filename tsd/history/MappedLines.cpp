#include "tsd/history/MappedLines.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "tsd/CommandError.h"

namespace tsd {

namespace {

constexpr std::size_t chunkSize = std::size_t{1} << 20;

void shorten(int file, std::uint64_t size) {
  while (::ftruncate(file, static_cast<off_t>(size)) != 0 && errno == EINTR) {
  }
}

}  // namespace

MappedLines::MappedLines(const std::string& path, std::uint64_t room, std::string lastLine)
    : _file(::open(path.c_str(), O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, 0644)),
      _most(room),
      _lastLine(std::move(lastLine)) {
  if (_file.get() < 0) throw CommandError(path + ": " + std::strerror(errno));
}

MappedLines::~MappedLines() {
  if (_chunk) ::munmap(_chunk, chunkSize);
  shorten(_file.get(), _begin + _used);
}

bool MappedLines::mapNext() {
  std::uint64_t begin = _chunk ? _begin + chunkSize : 0;
  // Writing to blocks that the disk does not have would kill the process.
  if (::posix_fallocate(_file.get(), static_cast<off_t>(begin), chunkSize) != 0) return false;
  void* chunk = ::mmap(nullptr, chunkSize, PROT_READ | PROT_WRITE, MAP_SHARED, _file.get(), static_cast<off_t>(begin));
  if (chunk == MAP_FAILED) return false;
  if (_chunk) ::munmap(_chunk, chunkSize);
  _chunk = static_cast<char*>(chunk);
  _begin = begin;
  _used = 0;
  return true;
}

void MappedLines::append(std::string_view bytes) {
  while (!bytes.empty() && !_failed) {
    if (!_chunk || _used == chunkSize) _failed = !mapNext();
    if (_failed) return;
    std::size_t count = std::min(bytes.size(), chunkSize - _used);
    std::memcpy(_chunk + _used, bytes.data(), count);
    _used += count;
    bytes.remove_prefix(count);
  }
}

void MappedLines::write(std::string_view line) {
  if (_full || _failed) return;
  _full = _begin + _used + line.size() + 1 > _most;
  append(_full ? std::string_view(_lastLine) : line);
  append("\n");
}

void MappedLines::trim(const std::string& path) {
  device::FileDescriptor file(::open(path.c_str(), O_RDWR | O_CLOEXEC | O_NOFOLLOW));
  if (file.get() < 0) return;
  off_t size = ::lseek(file.get(), 0, SEEK_END);
  char buffer[4096];
  while (size > 0) {
    off_t begin = std::max<off_t>(0, size - static_cast<off_t>(sizeof buffer));
    ssize_t count = ::pread(file.get(), buffer, static_cast<std::size_t>(size - begin), begin);
    if (count != size - begin) return;
    while (size > begin && buffer[size - begin - 1] == '\0') --size;
    if (size > begin) break;
  }
  shorten(file.get(), static_cast<std::uint64_t>(size));
}

}  // namespace tsd
