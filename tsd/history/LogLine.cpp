#include "tsd/history/LogLine.h"

#include <algorithm>

#include "tsd/history/LineFile.h"

namespace tsd {

std::string logLine(const device::LogRecord& record) {
  std::string line = currentTimeText();
  line += record.level == platform::LogLevel::error ? " error " : " default ";
  line += record.category;
  line += ' ';
  line += record.message;
  std::replace(line.begin(), line.end(), '\n', ' ');
  std::replace(line.begin(), line.end(), '\r', ' ');
  return line;
}

}  // namespace tsd
