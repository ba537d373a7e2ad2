#include <cstring>
#include <limits>
#include <stdexcept>

#include "platform/Arena.h"
#include "platform/Value.h"

namespace platform {

const Value& Array::operator[](std::size_t index) const noexcept {
  static constexpr Value absent{};
  return index < _size ? _values[index] : absent;
}

Array* Array::array(std::size_t index) {
  if (index >= _size) return nullptr;
  _values[index].ownContainer(*_arena);
  return _values[index].array();
}

Dictionary* Array::dictionary(std::size_t index) {
  if (index >= _size) return nullptr;
  _values[index].ownContainer(*_arena);
  return _values[index].dictionary();
}

void Array::reserve(std::size_t count) {
  if (count <= _capacity) return;
  if (count > std::numeric_limits<std::uint32_t>::max()) throw std::length_error("an array of more than 2^32 values");
  std::size_t size = _capacity * sizeof(Value), newSize = count * sizeof(Value);
  if (!_arena->extend(_values, size, newSize)) {
    // Values in an array own nothing, so their bytes are all there is to move.
    void* values = _arena->allocate(newSize);
    if (_size) std::memcpy(values, static_cast<const void*>(_values), _size * sizeof(Value));
    _arena->recycle(_values, size);
    _values = static_cast<Value*>(values);
  }
  _capacity = static_cast<std::uint32_t>(count);
}

/// Where the next value goes. It counts once _size includes it.
Value* Array::place() {
  if (_size == _capacity) reserve(_capacity < 4 ? 4 : std::size_t{_capacity} * 2);
  return _values + _size;
}

void Array::append(const Value& value) {
  if (value.isAbsent()) return;
  // Copied first: the value may lie in this very array, which moves when it grows.
  const Value copy = value.copiedInto(*_arena);
  std::memcpy(static_cast<void*>(place()), static_cast<const void*>(&copy), sizeof(Value));
  ++_size;
}

Dictionary& Array::appendDictionary() {
  auto* dictionary = ::new (_arena->allocate(sizeof(Dictionary))) Dictionary(_arena);
  ::new (place()) Value(dictionary);
  ++_size;
  return *dictionary;
}

}  // namespace platform
