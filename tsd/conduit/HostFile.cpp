#include "tsd/conduit/HostFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

namespace tsd {
namespace {

platform::ErrorRef hostError(int code, const std::string& text) { return platform::makeError("Host", code, text); }
platform::ErrorRef hostError(int code) { return hostError(code, std::strerror(code)); }

}  // namespace

bool isFileName(std::string_view name) {
  return !name.empty() && name != "." && name != ".." && name.find('/') == std::string_view::npos &&
         name.find('\0') == std::string_view::npos;
}

const char* sortOfFile(unsigned mode) {
  if (S_ISLNK(mode)) return "a symbolic link";
  if (S_ISFIFO(mode)) return "a named pipe";
  if (S_ISSOCK(mode)) return "a socket";
  if (S_ISDIR(mode)) return "a folder";
  return "a device";
}

std::optional<HostFile> HostFile::open(const std::string& folder, const std::string& name, platform::ErrorRef* error) {
  if (folder.empty()) return openAt(AT_FDCWD, name, error);
  int directory = ::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
  if (directory < 0) {
    int reason = errno;
    struct stat facts {};
    bool isLink = reason == ENOTDIR && ::lstat(folder.c_str(), &facts) == 0 && S_ISLNK(facts.st_mode);
    platform::setError(error, isLink ? hostError(ELOOP, std::string("in ") + sortOfFile(S_IFLNK)) : hostError(reason));
    return std::nullopt;
  }
  auto file = openAt(directory, name, error);
  ::close(directory);
  return file;
}

std::optional<HostFile> HostFile::openAt(int directory, const std::string& name, platform::ErrorRef* error) {
  platform::setError(error, nullptr);
  // Without waiting for a pipe's other end; the kind is checked before anything is read.
  int descriptor = ::openat(directory, name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
  if (descriptor < 0) {
    int reason = errno;
    platform::setError(error, reason == ELOOP ? hostError(reason, sortOfFile(S_IFLNK)) : hostError(reason));
    return std::nullopt;
  }
  struct stat facts {};
  if (::fstat(descriptor, &facts) != 0 || !S_ISREG(facts.st_mode)) {
    platform::setError(error, hostError(EINVAL, sortOfFile(facts.st_mode)));
    ::close(descriptor);
    return std::nullopt;
  }
  return HostFile(descriptor, static_cast<std::uint64_t>(facts.st_size));
}

HostFile::HostFile(HostFile&& other) noexcept : _descriptor(std::exchange(other._descriptor, -1)), _size(other._size) {}

HostFile::~HostFile() {
  if (_descriptor >= 0) ::close(_descriptor);
}

std::optional<platform::BytesView> HostFile::readInto(platform::Bytes& buffer, platform::ErrorRef* error) {
  platform::setError(error, nullptr);
  ssize_t got;
  do {
    got = ::read(_descriptor, buffer.data(), buffer.size());
  } while (got < 0 && errno == EINTR);
  if (got >= 0) return platform::BytesView(buffer.data(), static_cast<std::size_t>(got));
  platform::setError(error, hostError(errno));
  return std::nullopt;
}

std::optional<platform::Bytes> HostFile::read(std::size_t count, platform::ErrorRef* error) {
  // No larger than the file can be, as all of it is cleared first.
  platform::Bytes bytes(static_cast<std::size_t>(std::min<std::uint64_t>(count, _size + 1)), '\0');
  auto got = readInto(bytes, error);
  if (!got) return std::nullopt;
  bytes.resize(got->size());
  return bytes;
}

std::optional<platform::Bytes> HostFile::readRest(std::size_t limit, platform::ErrorRef* error) {
  platform::Bytes all;
  if (_size > limit) {
    platform::setError(error, hostError(EFBIG));
    return std::nullopt;
  }
  all.reserve(static_cast<std::size_t>(_size));
  while (true) {
    auto some = read(std::size_t{1} << 20, error);
    if (!some) return std::nullopt;
    if (some->empty()) return all;
    all += *some;
    if (all.size() > limit) {
      platform::setError(error, hostError(EFBIG));
      return std::nullopt;
    }
  }
}

}  // namespace tsd
