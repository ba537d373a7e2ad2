#include "tsd/conduit/WholeFile.h"

#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>

#include "tsd/CommandError.h"
#include "tsd/conduit/HostFile.h"

namespace tsd {
namespace {

/// Where the bytes go, with links followed. Only a regular file may be there.
std::string targetOf(const std::string& path) {
  struct stat facts {};
  if (::stat(path.c_str(), &facts) != 0) {
    if (errno == ENOENT) return path;
    throw CommandError(path + ": " + std::strerror(errno));
  }
  if (S_ISDIR(facts.st_mode)) throw CommandError(path + ": a folder");
  if (!S_ISREG(facts.st_mode)) throw CommandError(path + ": " + sortOfFile(facts.st_mode));
  std::error_code problem;
  auto target = std::filesystem::canonical(path, problem);
  return problem ? path : target.string();
}

bool writeAll(int descriptor, platform::BytesView content) {
  while (!content.empty()) {
    ssize_t count = ::write(descriptor, content.data(), content.size());
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return false;
    content.remove_prefix(static_cast<std::size_t>(count));
  }
  return true;
}

}  // namespace

void writeWholeFile(const std::string& path, platform::BytesView content) {
  std::string target = targetOf(path);
  std::string temporary = target + ".XXXXXX";
  int descriptor = ::mkostemp(temporary.data(), O_CLOEXEC);
  if (descriptor < 0) throw CommandError(path + ": " + std::strerror(errno));
  mode_t mask = ::umask(0);
  ::umask(mask);
  bool written = ::fchmod(descriptor, 0666 & ~mask) == 0 && writeAll(descriptor, content) && ::fsync(descriptor) == 0;
  int problem = errno;
  if (::close(descriptor) != 0 && written) {
    problem = errno;
    written = false;
  }
  if (written && std::rename(temporary.c_str(), target.c_str()) == 0) return;
  if (written) problem = errno;
  ::unlink(temporary.c_str());
  throw CommandError(path + ": " + std::strerror(problem));
}

platform::Bytes readWholeFile(const std::string& path) {
  constexpr std::size_t largest = std::size_t{4} << 30;
  platform::ErrorRef error;
  auto file = HostFile::open("", path, &error);
  auto bytes = file ? file->readRest(largest, &error) : std::nullopt;
  if (!bytes) throw CommandError(path + ": " + (error ? error->description() : "cannot be read"));
  return std::move(*bytes);
}

}  // namespace tsd
