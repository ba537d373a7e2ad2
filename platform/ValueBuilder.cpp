#include "platform/ValueBuilder.h"

#include <array>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace platform {
namespace {

/// A byte that mostly differs for texts that differ. Nobody needs a secret for as few as one dictionary has without an
/// index: if all of them collide, that is no more than comparing each with each.
std::uint8_t fingerprint(std::string_view text) {
  constexpr std::uint64_t factor = 0x9e3779b97f4a7c15;
  auto load = [](const char* at, auto number) {
    std::memcpy(&number, at, sizeof(number));
    return std::uint64_t{number};
  };
  const char *at = text.data(), *end = at + text.size();
  std::uint64_t bits = text.size();
  auto absorb = [&bits](std::uint64_t word) {
    bits = (bits ^ word) * factor;
    bits ^= bits >> 32;
  };
  if (text.size() >= 8) {
    for (; end - at > 8; at += 8) absorb(load(at, std::uint64_t{}));
    absorb(load(end - 8, std::uint64_t{}));
  } else if (text.size() >= 4) {
    absorb(load(at, std::uint32_t{}) << 32 | load(end - 4, std::uint32_t{}));
  } else if (!text.empty()) {
    absorb(load(at, std::uint8_t{}) << 16 | load(at + text.size() / 2, std::uint8_t{}) << 8 |
           load(end - 1, std::uint8_t{}));
  }
  return static_cast<std::uint8_t>(bits * factor >> 56);
}

/// The number of the first entry whose key an earlier one has, in a table on the stack.
std::optional<std::size_t> firstTwice(const Dictionary& dictionary) {
  std::array<std::uint8_t, 256> numbers{};  // from 1; 0 is free
  const Dictionary::Entry* entries = dictionary.begin();
  for (std::size_t number = 0; number < dictionary.size(); ++number) {
    std::string_view key = entries[number].key;
    std::uint8_t at = fingerprint(key);
    for (; numbers[at]; ++at) {
      if (entries[numbers[at] - 1].key == key) return number;
    }
    numbers[at] = static_cast<std::uint8_t>(number + 1);
  }
  return {};
}

}  // namespace

Array& ValueBuilder::makeArray(std::size_t count) {
  auto* array = ::new (_arena->allocate(sizeof(Array))) Array(_arena.get());
  if (count) array->_values = static_cast<Value*>(_arena->allocate(count * sizeof(Value)));
  array->_size = array->_capacity = static_cast<std::uint32_t>(count);
  return *array;
}

Dictionary& ValueBuilder::makeDictionary(std::size_t count) {
  auto* dictionary = ::new (_arena->allocate(sizeof(Dictionary))) Dictionary(_arena.get());
  if (count) {
    dictionary->_entries = static_cast<Dictionary::Entry*>(_arena->allocate(count * sizeof(Dictionary::Entry)));
  }
  dictionary->_size = dictionary->_capacity = static_cast<std::uint32_t>(count);
  return *dictionary;
}

void ValueBuilder::lend(const Value* from, std::size_t count, Value* places) noexcept {
  if (count) std::memcpy(static_cast<void*>(places), static_cast<const void*>(from), count * sizeof(Value));
}

void ValueBuilder::sealUnlike(Dictionary& dictionary) {
  if (dictionary._size > Dictionary::linearLimit) dictionary.buildIndex(dictionary._size);
}

std::optional<std::size_t> ValueBuilder::seal(Dictionary& dictionary) {
  if (dictionary._size > Dictionary::linearLimit) return dictionary.buildIndex(dictionary._size);
  static_assert(Dictionary::linearLimit <= 64);
  return firstTwice(dictionary);
}

Value ValueBuilder::finish(const Value& root) {
  if (!root.array() && !root.dictionary()) return Value(root);
  Value outermost;
  outermost._kind = root._kind;
  outermost._payload = root._payload;
  outermost._owning = true;
  _arena.release();
  return outermost;
}

}  // namespace platform
