#include "tsd/help/HelpText.h"

#include <algorithm>

namespace tsd {

const std::vector<ExitCodeEntry>& exitCodes() {
  static const std::vector<ExitCodeEntry> codes{
      {ExitCode::done, "done"},
      {ExitCode::failed, "failed"},
      {ExitCode::usage, "usage"},
      {ExitCode::someFailed, "some apps are not as the host wants them"},
      {ExitCode::cancelled, "cancelled by a signal"},
      {ExitCode::deadline, "a deadline passed"},
      {ExitCode::busy, "the device is in use"},
  };
  return codes;
}

std::string wrapped(const std::string& text, std::size_t width) {
  std::string result;
  std::size_t lineLength = 0;
  for (std::size_t start = 0; start < text.size();) {
    std::size_t end = std::min(text.find(' ', start), text.size());
    std::size_t word = end - start;
    if (lineLength > 0 && lineLength + 1 + word > width) {
      result += '\n';
      lineLength = 0;
    } else if (lineLength > 0) {
      result += ' ';
      ++lineLength;
    }
    result += text.substr(start, word);
    lineLength += word;
    start = end + 1;
  }
  return result;
}

}  // namespace tsd
