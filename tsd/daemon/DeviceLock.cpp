#include "tsd/daemon/DeviceLock.h"

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
#include "tsd/conduit/HostFile.h"
#include "tsd/terminal/Console.h"

namespace tsd {
namespace {

/// The command line of a process, on one line; empty when there is no such process.
std::string commandOf(const std::string& process) {
  std::ifstream file("/proc/" + process + "/cmdline", std::ios::binary);
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

void DeviceLock::requireDevice(const std::string& folder) {
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

DeviceLock::DeviceLock(const std::string& folder) {
  requireDevice(folder);
  std::string path = folder + "/" + std::string(device::lockName);
  _file = device::FileDescriptor(
      ::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY, 0644));
  struct stat facts {};
  if (!_file.isOpen() || ::fstat(_file.get(), &facts) != 0)
    throw CommandError(path + ": " + (errno == ELOOP ? sortOfFile(S_IFLNK) : std::strerror(errno)));
  // It is cut and written to: it is to be no other's.
  if (!S_ISREG(facts.st_mode)) throw CommandError(path + ": " + sortOfFile(facts.st_mode));
  if (facts.st_nlink > 1) throw CommandError(path + ": a file that has other names, too");
  while (::flock(_file.get(), LOCK_EX | LOCK_NB) != 0) {
    if (errno == EINTR) continue;
    int reason = errno;
    std::string holder = reason == EWOULDBLOCK ? contentOf(_file.get()) : "";
    if (reason != EWOULDBLOCK) throw CommandError(path + ": " + std::strerror(reason));
    throw CommandError(ExitCode::busy,
                       folder + ": in use by " + (holder.empty() ? "another process" : "process " + holder));
  }
  noteHolder();
}

DeviceLock::~DeviceLock() {
  // The file stays: removing it would let two processes lock two files of one name.
  while (::ftruncate(_file.get(), 0) < 0 && errno == EINTR) {
  }
}

std::optional<DeviceLock::Holder> DeviceLock::holderOf(const std::string& folder) {
  device::FileDescriptor file(
      ::open((folder + "/" + std::string(device::lockName)).c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  if (!file.isOpen()) return std::nullopt;
  // A killed process leaves its note behind; the note of a running process says what the system says of the process.
  std::string note = contentOf(file.get());
  std::size_t space = note.find(" (");
  if (space == std::string::npos) return std::nullopt;
  Holder holder{note.substr(0, space), note.substr(space + 2)};
  if (!holder.command.empty() && holder.command.back() == ')') holder.command.pop_back();
  bool isNumber = holder.process.find_first_not_of("0123456789") == std::string::npos;
  std::string command = isNumber ? printable(commandOf(holder.process)) : "";
  if (command.empty() || command.compare(0, holder.command.size(), holder.command) != 0) return std::nullopt;
  return holder;
}

void DeviceLock::noteHolder() {
  std::string text = std::to_string(::getpid()) + " (" + commandOf("self") + ")\n";
  bool noted = ::ftruncate(_file.get(), 0) == 0 && ::pwrite(_file.get(), text.data(), text.size(), 0) >= 0;
  static_cast<void>(noted);  // the lock holds without its note
}

}  // namespace tsd
