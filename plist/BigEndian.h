#pragma once

#include <cstdint>
#include <cstring>

namespace plist {

/// The unsigned number in `size` bytes (1 to 8), highest byte first.
inline std::uint64_t readBigEndian(const char* at, unsigned size) {
  auto load = [at]<class Number>(Number number) {
    std::memcpy(&number, at, sizeof(Number));
    return number;
  };
  switch (size) {
    case 1:
      return load(std::uint8_t{});
    case 2:
      return __builtin_bswap16(load(std::uint16_t{}));
    case 4:
      return __builtin_bswap32(load(std::uint32_t{}));
    case 8:
      return __builtin_bswap64(load(std::uint64_t{}));
  }
  std::uint64_t number = 0;
  for (unsigned index = 0; index < size; ++index) number = number << 8 | static_cast<unsigned char>(at[index]);
  return number;
}

/// Writes the number in 1, 2, 4 or 8 bytes and answers the place behind it.
inline char* writeBigEndian(char* at, std::uint64_t number, unsigned size) {
  auto store = [at](auto swapped) {
    std::memcpy(at, &swapped, sizeof(swapped));
    return at + sizeof(swapped);
  };
  switch (size) {
    case 1:
      return store(static_cast<std::uint8_t>(number));
    case 2:
      return store(__builtin_bswap16(static_cast<std::uint16_t>(number)));
    case 4:
      return store(__builtin_bswap32(static_cast<std::uint32_t>(number)));
    default:
      return store(__builtin_bswap64(number));
  }
}

/// How many bytes, of 1, 2, 4 and 8, the number needs.
inline unsigned bytesFor(std::uint64_t number) {
  return number < 1u << 8 ? 1 : number < 1u << 16 ? 2 : number < std::uint64_t{1} << 32 ? 4 : 8;
}

}  // namespace plist
