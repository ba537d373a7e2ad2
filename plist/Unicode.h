#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <string_view>

namespace plist {

inline bool isASCII(std::string_view text) {
  const char* at = text.data();
  std::size_t left = text.size();
  std::uint64_t bits = 0;
  auto load = [](const char* from) {
    std::uint64_t word;
    std::memcpy(&word, from, 8);
    return word;
  };
  if (left >= 8) {
    bits = load(at + left - 8);
    for (; left >= 8; at += 8, left -= 8) bits |= load(at);
  } else {
    for (; left; ++at, --left) bits |= static_cast<unsigned char>(*at);
  }
  return (bits & 0x8080808080808080) == 0;
}

/// One character of UTF-8 text.
struct Character {
  char32_t code;
  std::size_t size;  // in bytes; 0: what is there is not UTF-8
};
/// The first character of a text that is not empty. Overlong forms and surrogates do not count as characters.
Character firstCharacter(std::string_view text);

/// How many units the UTF-8 text has in UTF-16. Nothing if it is not valid.
std::optional<std::size_t> utf16Units(std::string_view text);
/// Writes valid UTF-8 text as UTF-16, high byte first. Answers the place behind it.
char* writeUTF16(std::string_view text, char* at);

enum class ByteOrder { big, little };
/// How many bytes the UTF-16 text has in UTF-8. Nothing if it is not valid: half a unit, or half a surrogate pair.
std::optional<std::size_t> utf8Size(std::string_view utf16, ByteOrder order);
/// Writes valid UTF-16 text as UTF-8.
void writeUTF8(std::string_view utf16, ByteOrder order, char* at);

}  // namespace plist
