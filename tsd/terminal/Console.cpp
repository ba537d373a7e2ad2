#include "tsd/terminal/Console.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>

#include "tsd/CommandError.h"

namespace tsd {
namespace {

bool writeAll(int descriptor, std::string_view text) {
  while (!text.empty()) {
    ssize_t count = ::write(descriptor, text.data(), text.size());
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return false;
    text.remove_prefix(static_cast<std::size_t>(count));
  }
  return true;
}

}  // namespace

void Console::line(std::string_view text) {
  platform::Mutex::Lock lock(_mutex);
  std::string begin = toRegionsBegin();
  if (!begin.empty()) begin += "\x1b[J";
  writeAll(STDERR_FILENO, begin + std::string(text) + "\n" + drawRegion());
}

void Console::message(std::string_view text) { line("tsd: " + printable(text)); }

void Console::setRegion(std::vector<TerminalLine> lines) {
  platform::Mutex::Lock lock(_mutex);
  if (_region.empty() && lines.empty()) return;
  std::string begin = toRegionsBegin();
  _region = std::move(lines);
  writeAll(STDERR_FILENO, begin + drawRegion() + "\x1b[J");
}

std::string Console::toRegionsBegin() const {
  if (_region.empty()) return {};
  // A terminal that has become narrower shows a wider line on several rows.
  std::size_t columns = size().columns;
  std::size_t rows = 0;
  for (const auto& each : _region) rows += std::max<std::size_t>(1, (each.columns() + columns - 1) / columns);
  return "\r\x1b[" + std::to_string(rows) + "A";
}

std::string Console::drawRegion() const {
  if (_region.empty()) return {};
  // Nothing wraps, whatever becomes of the terminal's size in the meantime.
  std::string text = "\x1b[?7l";
  for (const auto& each : _region) text += each.text() + "\x1b[K\n";
  return text + "\x1b[?7h";
}

bool Console::isTerminal() {
  if (!isatty(STDERR_FILENO)) return false;
  const char* terminal = std::getenv("TERM");
  return terminal && std::string_view(terminal) != "dumb";
}

bool Console::wantsColours() {
  const char* refused = std::getenv("NO_COLOR");
  const char* terminal = std::getenv("TERM");
  return (!refused || !*refused) && terminal && std::string_view(terminal) != "dumb";
}

Console::Size Console::size() {
  winsize window{};
  if (ioctl(STDERR_FILENO, TIOCGWINSZ, &window) != 0 || window.ws_row == 0 || window.ws_col == 0) return {24, 80};
  return {window.ws_row, window.ws_col};
}

void writeOutput(std::string_view text) {
  if (!writeAll(STDOUT_FILENO, text)) {
    throw CommandError(std::string("standard output: ") + std::strerror(errno));
  }
}

}  // namespace tsd
