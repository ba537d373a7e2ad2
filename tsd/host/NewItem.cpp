#include "tsd/host/NewItem.h"

#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <utility>

#include "tsd/CommandError.h"
#include "tsd/conduit/HostFolder.h"

namespace tsd {

namespace {

CommandError systemError(const std::string& path, int number) {
  return CommandError(path + ": " + std::strerror(number));
}

CommandError thereAlready(const std::string& path) { return CommandError(path + ": there is something already"); }

mode_t maskOfProcess() {
  mode_t mask = ::umask(0);
  ::umask(mask);
  return mask;
}

/// 0, or an error number. Where the file system cannot do it in one step, what is there is looked for before.
int renameToNothing(const std::string& from, const std::string& to) {
  if (::renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) return 0;
  if (errno != EINVAL && errno != ENOSYS) return errno;
  struct stat facts {};
  if (::lstat(to.c_str(), &facts) == 0) return EEXIST;
  return std::rename(from.c_str(), to.c_str()) == 0 ? 0 : errno;
}

}  // namespace

NewItem::NewItem(std::string path, Kind kind, bool replaces)
    : _path(std::move(path)), _kind(kind), _replaces(replaces), _temporary(_path + ".XXXXXX") {
  if (!_replaces && isThere(_path)) throw thereAlready(_path);
  if (_kind == Kind::folder) {
    if (!::mkdtemp(_temporary.data())) throw systemError(_path, errno);
    ::chmod(_temporary.c_str(), 0777 & ~maskOfProcess());
    return;
  }
  int descriptor = ::mkostemp(_temporary.data(), O_CLOEXEC);
  if (descriptor < 0) throw systemError(_path, errno);
  ::fchmod(descriptor, 0666 & ~maskOfProcess());
  ::close(descriptor);
}

NewItem::~NewItem() {
  if (_temporary.empty()) return;
  std::error_code ignored;
  std::filesystem::remove_all(_temporary, ignored);
}

void NewItem::putInPlace() {
  if (_kind == Kind::file) {
    int descriptor = ::open(_temporary.c_str(), O_RDONLY | O_CLOEXEC);
    bool flushed = descriptor >= 0 && ::fsync(descriptor) == 0;
    int problem = errno;
    if (descriptor >= 0) ::close(descriptor);
    if (!flushed) throw systemError(_path, problem);
  }
  int problem = renameToNothing(_temporary, _path);
  if (problem == EEXIST && _replaces)
    replaceWhatIsThere();
  else if (problem == EEXIST || problem == ENOTEMPTY)
    throw thereAlready(_path);
  else if (problem != 0)
    throw systemError(_path, problem);
  else
    _temporary.clear();
}

void NewItem::replaceWhatIsThere() {
  if (_kind == Kind::file) {
    if (std::rename(_temporary.c_str(), _path.c_str()) != 0) throw systemError(_path, errno);
    _temporary.clear();
    return;
  }
  // What was there has the temporary name afterwards, and goes with it.
  if (::renameat2(AT_FDCWD, _temporary.c_str(), AT_FDCWD, _path.c_str(), RENAME_EXCHANGE) == 0) return;
  if (errno != EINVAL && errno != ENOSYS) throw systemError(_path, errno);
  std::error_code problem;
  std::filesystem::remove_all(_path, problem);
  if (problem) throw CommandError(_path + ": " + problem.message());
  if (std::rename(_temporary.c_str(), _path.c_str()) != 0) throw systemError(_path, errno);
  _temporary.clear();
}

}  // namespace tsd
