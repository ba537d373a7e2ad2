#pragma once

#include <cstdint>
#include <cstring>
#include <string_view>

namespace platform {

/// Differs from process to process, so that nobody can prepare keys that collide.
std::uint64_t textHashSeed() noexcept;

/// A hash of the bytes for tables in memory. Never stored: it differs from process to process.
inline std::uint64_t textHash(std::string_view text, std::uint64_t seed) noexcept {
  constexpr std::uint64_t first = 0xa0761d6478bd642f, second = 0xe7037ed1a0b428db;
  auto mix = [](std::uint64_t one, std::uint64_t other) {
    auto product = static_cast<unsigned __int128>(one) * other;
    return static_cast<std::uint64_t>(product) ^ static_cast<std::uint64_t>(product >> 64);
  };
  auto eight = [](const char* at) {
    std::uint64_t word;
    std::memcpy(&word, at, 8);
    return word;
  };
  auto four = [](const char* at) {
    std::uint32_t word;
    std::memcpy(&word, at, 4);
    return std::uint64_t{word};
  };

  const char* at = text.data();
  std::size_t left = text.size();
  std::uint64_t hash = seed;
  for (; left > 16; at += 16, left -= 16) hash = mix(eight(at) ^ second, eight(at + 8) ^ hash);
  std::uint64_t low = 0, high = 0;
  if (left >= 8) {
    low = eight(at);
    high = eight(at + left - 8);
  } else if (left >= 4) {
    low = four(at);
    high = four(at + left - 4);
  } else if (left > 0) {
    auto byte = [at](std::size_t index) { return std::uint64_t{static_cast<unsigned char>(at[index])}; };
    low = byte(0) << 16 | byte(left / 2) << 8 | byte(left - 1);
  }
  return mix(second ^ text.size(), mix(low ^ first, high ^ hash));
}

}  // namespace platform
