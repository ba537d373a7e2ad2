#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace platform {

/// The secret of one table. It lies in the table: whoever holds the table can search it, whichever copy of this code
/// they were linked with.
struct TextHashKey {
  std::uint64_t low = 0;
  std::uint64_t high = 0;

  /// The key for a table that is made now: drawn once in a process (and once more by each further copy of this code
  /// in it), so that nobody can prepare texts that collide.
  static TextHashKey forNewTable() noexcept;
};

/// SipHash-1-3 of the bytes, for tables in memory. Never stored.
inline std::uint64_t textHash(std::string_view text, const TextHashKey& key) noexcept {
  std::uint64_t a = key.low ^ 0x736f6d6570736575, b = key.high ^ 0x646f72616e646f6d;
  std::uint64_t c = key.low ^ 0x6c7967656e657261, d = key.high ^ 0x7465646279746573;
  auto rotated = [](std::uint64_t word, int by) { return word << by | word >> (64 - by); };
  auto round = [&] {
    a += b, c += d;
    b = rotated(b, 13) ^ a, d = rotated(d, 16) ^ c;
    a = rotated(a, 32);
    c += b, a += d;
    b = rotated(b, 17) ^ c, d = rotated(d, 21) ^ a;
    c = rotated(c, 32);
  };
  auto absorb = [&](std::uint64_t word) {
    d ^= word;
    round();
    a ^= word;
  };

  const char* at = text.data();
  std::size_t left = text.size();
  for (; left >= 8; at += 8, left -= 8) {
    std::uint64_t word;
    std::memcpy(&word, at, 8);
    absorb(word);
  }
  std::uint64_t last = std::uint64_t{text.size()} << 56;
  for (std::size_t index = 0; index < left; ++index) {
    last |= std::uint64_t{static_cast<unsigned char>(at[index])} << (8 * index);
  }
  absorb(last);
  c ^= 0xff;
  round();
  round();
  round();
  return a ^ b ^ c ^ d;
}

/// The hash of a standard container whose keys are texts from outside. Containers that are swapped or moved take theirs
/// along.
class TextHasher {
 public:
  using is_transparent = void;
  std::size_t operator()(std::string_view text) const noexcept {
    return static_cast<std::size_t>(textHash(text, _key));
  }

 private:
  TextHashKey _key = TextHashKey::forNewTable();
};

}  // namespace platform
