#include "platform/TextHash.h"

#include <chrono>
#include <random>

namespace platform {

TextHashKey TextHashKey::forNewTable() noexcept {
  // Two copies of this code draw two keys; neither ever searches by anything but the key that a table carries.
  static const TextHashKey key = []() -> TextHashKey {
    try {
      std::random_device source;
      auto word = [&source] { return std::uint64_t{source()} << 32 | source(); };
      return {word(), word()};
    } catch (...) {
      // Better a key that can be guessed than none.
      auto ticks = static_cast<std::uint64_t>(std::chrono::high_resolution_clock::now().time_since_epoch().count());
      return {ticks, ticks * 0x9e3779b97f4a7c15};
    }
  }();
  return key;
}

}  // namespace platform
