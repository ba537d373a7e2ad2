#include "tsd/terminal/TerminalText.h"

#include <glib.h>

#include <cstddef>
#include <optional>

namespace tsd {
namespace {

/// The character at the front; nothing when it may not be shown: broken text, control characters, and marks that change
/// the direction of what follows.
std::optional<gunichar> shownCharacter(std::string_view text) {
  gunichar character = g_utf8_get_char_validated(text.data(), static_cast<gssize>(text.size()));
  if (character > 0x10ffff || g_unichar_iscntrl(character)) return std::nullopt;
  bool turns = character == 0x200e || character == 0x200f || (character >= 0x2028 && character <= 0x202e) ||
               (character >= 0x2066 && character <= 0x2069);
  return turns ? std::nullopt : std::optional(character);
}

/// The character at the front of a printable text.
struct Character {
  std::size_t bytes = 1;
  std::size_t columns = 1;

  explicit Character(std::string_view text) {
    auto character = shownCharacter(text);
    if (!character) return;
    bytes = static_cast<std::size_t>(g_unichar_to_utf8(*character, nullptr));
    columns = g_unichar_iszerowidth(*character) ? 0 : g_unichar_iswide(*character) ? 2 : 1;
  }
};

}  // namespace

std::string printable(std::string_view text) {
  std::string result;
  while (!text.empty()) {
    std::size_t length = Character(text).bytes;
    result += shownCharacter(text) ? text.substr(0, length) : "?";
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

std::string fittedToEnd(std::string_view text, std::size_t columns) {
  std::string whole = printable(text);
  std::size_t have = columnsOf(whole);
  if (have <= columns || columns == 0) return fitted(whole, columns);
  std::string_view rest = whole;
  while (have > columns - 1) {
    Character first(rest);
    have -= first.columns;
    rest.remove_prefix(first.bytes);
  }
  return fitted("…" + std::string(rest), columns);
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
