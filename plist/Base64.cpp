#include "plist/Base64.h"

#include <array>
#include <cstdint>

#include "plist/BigEndian.h"

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

/// What a character means at each place of a group of four, already shifted there, or `noDigit`.
constexpr std::uint32_t noDigit = 0x80000000;
using Digits = std::array<std::uint32_t, 256>;
constexpr std::array<Digits, 4> digits = [] {
  std::array<Digits, 4> tables{};
  for (std::size_t place = 0; place < 4; ++place) {
    for (std::size_t character = 0; character < 256; ++character) {
      std::uint32_t bits = meanings[character];
      tables[place][character] = bits < 64 ? bits << (18 - 6 * place) : noDigit;
    }
  }
  return tables;
}();

/// The 24 bits of four characters.
inline std::uint32_t group(const char* at) {
  auto digit = [at](std::size_t place) { return digits[place][static_cast<unsigned char>(at[place])]; };
  return digit(0) | digit(1) | digit(2) | digit(3);
}

/// Reads whole groups as long as there is nothing else, and moves both places behind them. Writes up to two bytes more
/// than it says, which the characters that it leaves over have room for.
void readGroups(const char*& from, const char* end, char*& to) {
  for (; end - from >= 12; from += 8, to += 6) {
    std::uint64_t first = group(from), second = group(from + 4);
    if ((first | second) & noDigit) return;
    writeBigEndian(to, first << 40 | second << 16, 8);
  }
}

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

std::optional<std::size_t> readBase64(std::string_view text, char* to) {
  const char *from = text.data(), *const end = from + text.size();
  char* const start = to;
  std::uint32_t bits = 0;
  std::size_t count = 0, pads = 0;  // of the present group
  while (from != end) {
    if (count + pads == 0) {
      readGroups(from, end, to);
      if (from == end) break;
    }
    std::uint8_t digit = meaning(*from++);
    if (digit == space) continue;
    if (digit == invalid || (pads && digit != padding)) return {};
    if (digit == padding) {
      ++pads;
      continue;
    }
    bits = bits << 6 | digit;
    if (++count < 4) continue;
    for (int shift : {16, 8, 0}) *to++ = static_cast<char>(bits >> shift & 0xff);
    count = 0;
  }
  if (pads > 2 || (count + pads) % 4) return {};
  if (count > 1) *to++ = static_cast<char>(bits >> (6 * count - 8) & 0xff);
  if (count > 2) *to++ = static_cast<char>(bits >> 2 & 0xff);
  return static_cast<std::size_t>(to - start);
}

}  // namespace plist
