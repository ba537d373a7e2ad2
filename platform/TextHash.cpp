#include "platform/TextHash.h"

#include <chrono>
#include <random>

namespace platform {

std::uint64_t textHashSeed() noexcept {
  static const std::uint64_t seed = [] {
    auto ticks = static_cast<std::uint64_t>(std::chrono::high_resolution_clock::now().time_since_epoch().count());
    try {
      std::random_device random;
      return (std::uint64_t{random()} << 32 | random()) ^ ticks;
    } catch (...) {
      return ticks * 0x9e3779b97f4a7c15;  // no source of randomness here: better a guessable seed than none
    }
  }();
  return seed;
}

}  // namespace platform
