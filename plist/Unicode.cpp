#include "plist/Unicode.h"

namespace plist {
namespace {

/// One character of UTF-16 text at the byte `at`; size 0 if there is half a surrogate pair.
Character utf16Character(std::string_view text, std::size_t at, ByteOrder order) {
  auto unit = [&](std::size_t index) {
    auto first = static_cast<unsigned char>(text[index]), second = static_cast<unsigned char>(text[index + 1]);
    return static_cast<char32_t>(order == ByteOrder::big ? first << 8 | second : second << 8 | first);
  };
  char32_t code = unit(at);
  if (code < 0xd800 || code > 0xdfff) return {code, 2};
  if (code > 0xdbff || at + 4 > text.size()) return {0, 0};
  char32_t low = unit(at + 2);
  if (low < 0xdc00 || low > 0xdfff) return {0, 0};
  return {0x10000 + ((code - 0xd800) << 10) + (low - 0xdc00), 4};
}

std::size_t utf8SizeOf(char32_t code) { return code < 0x80 ? 1 : code < 0x800 ? 2 : code < 0x10000 ? 3 : 4; }

}  // namespace

Character firstCharacter(std::string_view text) {
  auto lead = static_cast<unsigned char>(text[0]);
  if (lead < 0x80) return {lead, 1};
  std::size_t size = lead >= 0xf0 ? 4 : lead >= 0xe0 ? 3 : 2;
  if (lead < 0xc2 || lead > 0xf4 || size > text.size()) return {0, 0};
  char32_t code = lead & (0x7fu >> size);
  for (std::size_t index = 1; index < size; ++index) {
    auto byte = static_cast<unsigned char>(text[index]);
    if ((byte & 0xc0) != 0x80) return {0, 0};
    code = code << 6 | (byte & 0x3f);
  }
  bool surrogate = code >= 0xd800 && code <= 0xdfff;
  if (utf8SizeOf(code) != size || surrogate || code > 0x10ffff) return {0, 0};
  return {code, size};
}

std::optional<std::size_t> utf16Units(std::string_view text) {
  std::size_t units = 0;
  while (!text.empty()) {
    Character character = firstCharacter(text);
    if (character.size == 0) return {};
    units += character.code < 0x10000 ? 1 : 2;
    text.remove_prefix(character.size);
  }
  return units;
}

char* writeUTF16(std::string_view text, char* at) {
  auto put = [&at](char32_t unit) {
    *at++ = static_cast<char>(unit >> 8);
    *at++ = static_cast<char>(unit & 0xff);
  };
  while (!text.empty()) {
    Character character = firstCharacter(text);
    if (character.code < 0x10000) {
      put(character.code);
    } else {
      put(0xd800 + ((character.code - 0x10000) >> 10));
      put(0xdc00 + ((character.code - 0x10000) & 0x3ff));
    }
    text.remove_prefix(character.size);
  }
  return at;
}

std::optional<std::size_t> utf8Size(std::string_view utf16, ByteOrder order) {
  if (utf16.size() % 2) return {};
  std::size_t size = 0;
  for (std::size_t at = 0; at < utf16.size();) {
    Character character = utf16Character(utf16, at, order);
    if (character.size == 0) return {};
    size += utf8SizeOf(character.code);
    at += character.size;
  }
  return size;
}

void writeUTF8(std::string_view utf16, ByteOrder order, char* at) {
  for (std::size_t from = 0; from < utf16.size();) {
    auto [code, read] = utf16Character(utf16, from, order);
    from += read;
    std::size_t size = utf8SizeOf(code);
    constexpr unsigned char leads[] = {0, 0, 0xc0, 0xe0, 0xf0};
    for (std::size_t index = size - 1; index > 0; --index, code >>= 6)
      at[index] = static_cast<char>(0x80 | (code & 0x3f));
    at[0] = static_cast<char>(leads[size] | code);
    at += size;
  }
}

}  // namespace plist
