#include "tsd/TerminalText.h"

#include <algorithm>
#include <iterator>

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
  if (first == 0xe2 && byte(1) == 0x81 && byte(2) >= 0xa6 && byte(2) <= 0xa9) return 0;
  return length;
}

struct Range {
  char32_t first, last;
};
// Scripts and signs that terminals show two columns wide.
constexpr Range wide[] = {{0x1100, 0x115f},   {0x2e80, 0x303e},   {0x3041, 0xa4cf},   {0xac00, 0xd7a3},
                          {0xf900, 0xfaff},   {0xfe30, 0xfe4f},   {0xff00, 0xff60},   {0xffe0, 0xffe6},
                          {0x1f300, 0x1f64f}, {0x1f680, 0x1f6ff}, {0x1f900, 0x1f9ff}, {0x20000, 0x3fffd}};
// Marks that are shown on the character before them.
constexpr Range combining[] = {{0x0300, 0x036f}, {0x0483, 0x0489}, {0x0591, 0x05bd}, {0x0610, 0x061a}, {0x064b, 0x065f},
                               {0x06d6, 0x06dc}, {0x0900, 0x0902}, {0x093c, 0x093c}, {0x0941, 0x0948}, {0x094d, 0x094d},
                               {0x0e31, 0x0e31}, {0x0e34, 0x0e3a}, {0x0e47, 0x0e4e}, {0x200b, 0x200d}, {0x20d0, 0x20f0},
                               {0xfe00, 0xfe0f}, {0xfe20, 0xfe2f}};

template <std::size_t count>
bool isIn(const Range (&ranges)[count], char32_t character) {
  auto after = std::upper_bound(std::begin(ranges), std::end(ranges), character,
                                [](char32_t wanted, const Range& range) { return wanted < range.first; });
  return after != std::begin(ranges) && character <= std::prev(after)->last;
}

/// Takes one character off the front of a printable text.
struct Character {
  std::size_t bytes;
  std::size_t columns;

  explicit Character(std::string_view text) : bytes(std::max<std::size_t>(1, characterLength(text))), columns(1) {
    if (bytes == 1) return;
    char32_t value = static_cast<unsigned char>(text[0]) & (0xff >> (bytes + 1));
    for (std::size_t i = 1; i < bytes; ++i) value = value << 6 | (static_cast<unsigned char>(text[i]) & 0x3f);
    columns = isIn(combining, value) ? 0 : isIn(wide, value) ? 2 : 1;
  }
};

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
  while (!text.empty()) {
    Character next(text);
    columns += next.columns;
    text.remove_prefix(next.bytes);
  }
  return columns;
}

std::string fitted(std::string_view text, std::size_t columns) {
  std::string result = printable(text);
  std::size_t have = columnsOf(result);
  if (have <= columns) return result.append(columns - have, ' ');
  if (columns == 0) return {};
  std::size_t end = 0;
  std::size_t used = 0;
  while (true) {
    Character next(std::string_view(result).substr(end));
    if (used + next.columns > columns - 1) break;
    used += next.columns;
    end += next.bytes;
  }
  result.resize(end);
  result += "…";
  return result.append(columns - 1 - used, ' ');
}

void TerminalLine::add(std::string_view text, Colour colour) {
  static constexpr const char* codes[] = {"", "\x1b[2m", "\x1b[32m", "\x1b[33m", "\x1b[36m"};
  _columns += columnsOf(text);
  bool coloured = _colours && colour != Colour::none && !text.empty();
  if (coloured) _text += codes[static_cast<std::size_t>(colour)];
  _text += text;
  if (coloured) _text += "\x1b[m";
}

}  // namespace tsd
