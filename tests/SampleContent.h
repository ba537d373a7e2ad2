#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <random>
#include <string>
#include <string_view>
#include <utility>

#include "platform/Value.h"

namespace tests {

/// Numbers from a seed, the same on every machine.
class Dice {
 public:
  explicit Dice(std::uint64_t seed) : _numbers(seed) {}

  std::size_t below(std::size_t count) { return static_cast<std::size_t>(_numbers() % count); }
  bool oneIn(std::size_t count) { return below(count) == 0; }
  template <class T, std::size_t N>
  T of(const T (&choices)[N]) {
    return choices[below(N)];
  }
  /// Mostly the first.
  template <class T, std::size_t N>
  T mostly(const T (&choices)[N]) {
    return oneIn(3) ? of(choices) : choices[0];
  }
  /// Keys of a dictionary, on both sides of whatever changes with their number: an index from the ninth on, a longer
  /// count in the binary form from the fifteenth, wider references from the 256th. Rarely many.
  std::size_t width();
  /// Bytes, on both sides of what is read, written, copied and shown in one piece. Rarely many.
  std::size_t size();

 private:
  std::mt19937_64 _numbers;
};

/// How much a host sends of one app. What is not said is as with ordinary apps.
struct ContentShape {
  std::uint64_t seed = 1;         // of all that nobody reads
  std::size_t entryKeys = 14;     // its entry in a list
  std::size_t manifestKeys = 40;  // "Info.plist"
  std::size_t metadataKeys = 25;  // "HarluneMetadata.plist"
  std::size_t files = 5;          // of its package, besides the manifest
  std::size_t fileSize = 300;     // bytes of the largest of them

  static ContentShape drawn(Dice& dice);
  /// Nothing that nobody reads.
  static ContentShape bare() { return {1, 0, 0, 0, 1, 10}; }
};

platform::Value dictionaryOf(std::initializer_list<std::pair<std::string_view, platform::Value>> entries);
/// The dictionary, and around its entries what nobody reads, up to so many keys in all: texts in several scripts, every
/// sort of number, dates, data, and containers of all of these. Not changed when it has as many.
platform::Value filledOut(const platform::Value& dictionary, std::size_t keys, std::uint64_t seed);
/// What people would call it, in a script that depends on the identifier.
std::string nameOf(std::string_view identifier);

/// An archive of "Maps.app" with a manifest of that identifier and version, and files in folders.
platform::Bytes packageOf(const std::string& identifier, const std::string& version, const ContentShape& shape = {});
/// A PNG of one colour.
platform::Bytes pngOf(int width, int height);

}  // namespace tests
