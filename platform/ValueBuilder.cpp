#include "platform/ValueBuilder.h"

namespace platform {

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

std::optional<std::size_t> ValueBuilder::seal(Dictionary& dictionary) {
  if (dictionary._size > Dictionary::linearLimit) return dictionary.buildIndex(dictionary._size);
  for (std::size_t number = 1; number < dictionary._size; ++number) {
    for (std::size_t earlier = 0; earlier < number; ++earlier) {
      if (dictionary._entries[earlier].key == dictionary._entries[number].key) return number;
    }
  }
  return {};
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
