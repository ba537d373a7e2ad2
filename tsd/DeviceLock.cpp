#include "tsd/DeviceLock.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <iterator>

#include "device/LocalDevice.h"
#include "tsd/CommandError.h"
#include "tsd/Console.h"

namespace tsd {
namespace {

void checkIsDevice(const std::string& folder) {
  struct stat facts {};
  if (::stat(folder.c_str(), &facts) != 0) throw CommandError(folder + ": " + std::strerror(errno));
  if (!S_ISDIR(facts.st_mode)) throw CommandError(folder + ": not a folder");
  auto isThere = [&](const char* name, mode_t sort) {
    if (::lstat((folder + name).c_str(), &facts) == 0) return (facts.st_mode & S_IFMT) == sort;
    if (errno != ENOENT) throw CommandError(folder + name + ": " + std::strerror(errno));
    return false;
  };
  if (!isThere("/device.db", S_IFREG) || !isThere("/fs", S_IFDIR)) {
    throw CommandError(folder + ": not a device ('tsd init' makes one)");
  }
}

/// The command line of this process, on one line.
std::string ownCommand() {
  std::ifstream file("/proc/self/cmdline", std::ios::binary);
  std::string text{std::istreambuf_iterator<char>(file), {}};
  while (!text.empty() && text.back() == '\0') text.pop_back();
  for (char& c : text) {
    if (c == '\0' || c == '\n') c = ' ';
  }
  return text;
}

std::string contentOf(int descriptor) {
  char buffer[1024];
  ssize_t count = ::pread(descriptor, buffer, sizeof buffer, 0);
  std::string text(buffer, count > 0 ? static_cast<std::size_t>(count) : 0);
  return printable(text.substr(0, text.find('\n')));
}

}  // namespace

DeviceLock::DeviceLock(const std::string& folder, Use use) : _use(use) {
  checkIsDevice(folder);
  std::string path = folder + "/" + std::string(device::lockName);
  bool changes = use == Use::change;
  _descriptor = ::open(path.c_str(), (changes ? O_RDWR | O_CREAT : O_RDONLY) | O_CLOEXEC | O_NOFOLLOW, 0644);
  if (_descriptor < 0 && !changes && errno == ENOENT) return;
  if (_descriptor < 0) throw CommandError(path + ": " + std::strerror(errno));
  while (::flock(_descriptor, (changes ? LOCK_EX : LOCK_SH) | LOCK_NB) != 0) {
    if (errno == EINTR) continue;
    int reason = errno;
    std::string holder = reason == EWOULDBLOCK ? contentOf(_descriptor) : "";
    ::close(_descriptor);
    if (reason != EWOULDBLOCK) throw CommandError(path + ": " + std::strerror(reason));
    throw CommandError(ExitCode::busy,
                       folder + ": in use by " + (holder.empty() ? "another process" : "process " + holder));
  }
  if (changes) noteHolder();
}

DeviceLock::~DeviceLock() {
  if (_descriptor < 0) return;
  // The file stays: removing it would let two processes lock two files of one name.
  while (_use == Use::change && ::ftruncate(_descriptor, 0) < 0 && errno == EINTR) {
  }
  ::close(_descriptor);
}

void DeviceLock::noteHolder() {
  std::string text = std::to_string(::getpid()) + " (" + ownCommand() + ")\n";
  bool noted = ::ftruncate(_descriptor, 0) == 0 && ::pwrite(_descriptor, text.data(), text.size(), 0) >= 0;
  static_cast<void>(noted);  // the lock holds without its note
}

}  // namespace tsd
