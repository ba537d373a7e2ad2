#include "device/files/DevicePath.h"

#include <cerrno>
#include <system_error>

namespace device {

int splitDevicePath(std::string_view path, std::vector<std::string_view>& names) {
  if (path.empty() || path[0] != '/' || path.find('\0') != path.npos) return EINVAL;
  if (path.size() > longestPath) return ENAMETOOLONG;
  if (path.size() == 1) return 0;
  for (std::size_t at = 1; at <= path.size();) {
    std::size_t end = std::min(path.find('/', at), path.size());
    auto name = path.substr(at, end - at);
    if (name.empty() || name == "." || name == "..") return EINVAL;
    if (name.size() > longestName) return ENAMETOOLONG;
    names.push_back(name);
    at = end + 1;
  }
  return 0;
}

std::string textOfErrorNumber(int errorNumber) { return std::generic_category().message(errorNumber); }

platform::ErrorRef fileError(int errorNumber, std::string_view path) {
  std::string text(path.empty() ? "(no path)" : path);
  for (char& c : text) {
    if (static_cast<unsigned char>(c) < ' ' || c == '\x7f') c = '?';
  }
  return platform::makeError("FileSystem", errorNumber, text + ": " + textOfErrorNumber(errorNumber));
}

bool answerFileOperation(int errorNumber, std::string_view path, platform::ErrorRef* error) {
  platform::setError(error, errorNumber == 0 ? nullptr : fileError(errorNumber, path));
  return errorNumber == 0;
}

}  // namespace device
