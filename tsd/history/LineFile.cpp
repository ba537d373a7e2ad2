#include "tsd/history/LineFile.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <ctime>

#include "tsd/CommandError.h"

namespace tsd {

LineFile::LineFile(const std::string& path) : _file(std::fopen(path.c_str(), "we")) {
  if (!_file) throw CommandError(path + ": " + std::strerror(errno));
}

void LineFile::write(std::string line) {
  std::replace(line.begin(), line.end(), '\n', ' ');
  std::replace(line.begin(), line.end(), '\r', ' ');
  line += '\n';
  bool written = std::fwrite(line.data(), 1, line.size(), _file.get()) == line.size();
  _failed |= std::fflush(_file.get()) != 0 || !written;
}

std::string currentTimeText() {
  // Rounded down also before 1970, where a clock that was never set may stand.
  auto now = std::chrono::floor<std::chrono::milliseconds>(std::chrono::system_clock::now());
  auto whole = std::chrono::floor<std::chrono::seconds>(now);
  std::time_t seconds = std::chrono::system_clock::to_time_t(whole);
  auto milliseconds = (now - whole).count();
  std::tm parts{};
  gmtime_r(&seconds, &parts);
  char text[48];
  std::size_t length = std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%S", &parts);
  std::snprintf(text + length, sizeof text - length, ".%03dZ", static_cast<int>(milliseconds));
  return text;
}

}  // namespace tsd
