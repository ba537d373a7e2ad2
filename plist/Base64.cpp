#include "plist/Base64.h"

#include <array>
#include <cstdint>

namespace plist {
namespace {

constexpr std::string_view alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
constexpr std::uint8_t space = 64, padding = 65, invalid = 66;

constexpr std::array<std::uint8_t, 256> meanings = [] {
  std::array<std::uint8_t, 256> table{};
  table.fill(invalid);
  for (std::size_t bits = 0; bits < alphabet.size(); ++bits)
    table[static_cast<unsigned char>(alphabet[bits])] = static_cast<std::uint8_t>(bits);
  for (unsigned char blank : {' ', '\t', '\r', '\n'}) table[blank] = space;
  table['='] = padding;
  return table;
}();

std::uint8_t meaning(char character) { return meanings[static_cast<unsigned char>(character)]; }

}  // namespace

void writeBase64(std::string_view bytes, char* at) {
  auto byte = [&](std::size_t index) { return index < bytes.size() ? static_cast<unsigned char>(bytes[index]) : 0u; };
  for (std::size_t from = 0; from < bytes.size(); from += 3, at += 4) {
    std::uint32_t bits = byte(from) << 16 | byte(from + 1) << 8 | byte(from + 2);
    for (int digit = 0; digit < 4; ++digit) at[digit] = alphabet[bits >> (18 - 6 * digit) & 63];
    if (from + 2 >= bytes.size()) at[3] = '=';
    if (from + 1 >= bytes.size()) at[2] = '=';
  }
}

std::optional<std::size_t> base64Bytes(std::string_view text) {
  std::size_t digits = 0, pads = 0;
  for (char character : text) {
    std::uint8_t bits = meaning(character);
    if (bits == space) continue;
    if (bits == invalid || (pads && bits != padding)) return {};
    ++(bits == padding ? pads : digits);
  }
  if (pads > 2 || (digits + pads) % 4) return {};
  return digits * 3 / 4;
}

void readBase64(std::string_view text, char* at) {
  std::uint32_t bits = 0;
  int count = 0;
  for (char character : text) {
    std::uint8_t digit = meaning(character);
    if (digit > 63) continue;
    bits = bits << 6 | digit;
    if ((count += 6) < 8) continue;
    count -= 8;
    *at++ = static_cast<char>(bits >> count & 0xff);
  }
}

}  // namespace plist
