#include "tsd/Console.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>

#include "tsd/CommandError.h"

namespace tsd {
namespace {

/// The length of the character at the front, 0 when it is none that may be shown.
std::size_t characterLength(std::string_view text) {
  auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
  unsigned char first = byte(0);
  if (first < 0x20 || first == 0x7f) return 0;
  if (first < 0x80) return 1;
  std::size_t length = first >= 0xf0 ? 4 : first >= 0xe0 ? 3 : 2;
  if (first < 0xc2 || first > 0xf4 || text.size() < length) return 0;
  for (std::size_t i = 1; i < length; ++i) {
    if ((byte(i) & 0xc0) != 0x80) return 0;
  }
  if (first == 0xc2 && byte(1) < 0xa0) return 0;  // a second set of control characters
  // Marks that change the direction of what follows.
  if (first == 0xe2 && byte(1) == 0x80 && (byte(2) == 0x8e || byte(2) == 0x8f || (byte(2) >= 0xa8 && byte(2) <= 0xae)))
    return 0;
  return length;
}

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

std::string printable(std::string_view text) {
  std::string result;
  while (!text.empty()) {
    std::size_t length = characterLength(text);
    if (length == 0) {
      result += '?';
      length = 1;
    } else {
      result += text.substr(0, length);
    }
    text.remove_prefix(length);
  }
  return result;
}

std::size_t columnsOf(std::string_view text) {
  std::size_t columns = 0;
  for (char c : text) columns += (static_cast<unsigned char>(c) & 0xc0) != 0x80;
  return columns;
}

std::string fitted(std::string_view text, std::size_t columns) {
  std::string result = printable(text);
  std::size_t have = columnsOf(result);
  if (have <= columns) return result + std::string(columns - have, ' ');
  std::size_t end = 0;
  for (std::size_t seen = 0; end < result.size(); ++end) {
    if ((static_cast<unsigned char>(result[end]) & 0xc0) != 0x80 && ++seen == columns) break;
  }
  return result.substr(0, end) + "…";
}

void Console::line(std::string_view text) {
  std::lock_guard lock(_mutex);
  writeAll(STDERR_FILENO, eraseRegion() + std::string(text) + "\n" + drawRegion());
}

void Console::message(std::string_view text) { line("tsd: " + printable(text)); }

void Console::setRegion(std::vector<std::string> lines) {
  std::lock_guard lock(_mutex);
  std::string erase = eraseRegion();
  _region = std::move(lines);
  writeAll(STDERR_FILENO, erase + drawRegion());
}

void Console::keepRegion() {
  std::lock_guard lock(_mutex);
  _region.clear();
}

std::string Console::eraseRegion() const {
  if (_region.empty()) return {};
  return "\r\x1b[" + std::to_string(_region.size()) + "A\x1b[J";
}

std::string Console::drawRegion() const {
  std::string text;
  for (const auto& each : _region) text += each + "\n";
  return text;
}

bool Console::isTerminal() {
  if (!isatty(STDERR_FILENO)) return false;
  const char* terminal = std::getenv("TERM");
  return terminal && std::string_view(terminal) != "dumb";
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
