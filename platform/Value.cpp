#include "platform/Value.h"

#include <algorithm>
#include <cstring>
#include <limits>
#include <memory>
#include <stdexcept>

#include "platform/Arena.h"

namespace platform {

Value::Value(bool boolean) noexcept : _kind(Kind::boolean) { _payload.bits = boolean; }

Value::Value(Number number) noexcept
    : _kind(Kind::integer),
      _unsigned(!number.negative && number.bits > std::uint64_t{std::numeric_limits<std::int64_t>::max()}) {
  _payload.bits = number.bits;
}

Value::Value(double number) noexcept : _kind(Kind::real) { _payload.real = number; }
Value::Value(Date date) noexcept : _kind(Kind::date) { _payload.real = date.seconds; }
Value::Value(std::string_view text) : Value(own(Kind::string, text)) {}
Value Value::makeData(BytesView bytes) { return own(Kind::data, bytes); }

Value::Value(Array* array) noexcept : _kind(Kind::array) { _payload.array = array; }
Value::Value(Dictionary* dictionary) noexcept : _kind(Kind::dictionary) { _payload.dictionary = dictionary; }

Value Value::own(Kind kind, std::string_view bytes) {
  if (bytes.size() > std::numeric_limits<std::uint32_t>::max()) throw std::length_error("a value of more than 4 GiB");
  Value value(kind, bytes);
  if (bytes.empty()) return value;
  char* block = new char[bytes.size()];
  std::memcpy(block, bytes.data(), bytes.size());
  value._payload.bytes = block;
  value._owning = true;
  return value;
}

Value Value::makeArray() {
  auto arena = std::make_unique<Arena>();
  Value value(::new (arena->allocate(sizeof(Array))) Array(arena.get()));
  value._owning = true;
  arena.release();
  return value;
}

Value Value::makeDictionary() {
  auto arena = std::make_unique<Arena>();
  Value value(::new (arena->allocate(sizeof(Dictionary))) Dictionary(arena.get()));
  value._owning = true;
  arena.release();
  return value;
}

Value::Value(const Value& other) {
  if (other.holdsBytes()) {
    Value copy = own(other._kind, other.bytes());
    take(copy);
  } else if (other._kind == Kind::array || other._kind == Kind::dictionary) {
    auto arena = std::make_unique<Arena>();
    Value copy = other.copiedInto(*arena);
    take(copy);
    _owning = true;
    arena.release();
  } else {
    _kind = other._kind;
    _unsigned = other._unsigned;
    _payload = other._payload;
  }
}

Value::Value(Value&& other) {
  if (other._owning) {
    take(other);
  } else {
    // What is contained elsewhere must stay there.
    Value copy(static_cast<const Value&>(other));
    take(copy);
  }
}

Value& Value::operator=(const Value& other) {
  // The other may be contained in this one: it is copied before anything of this one goes.
  Value copy(other);
  release();
  take(copy);
  return *this;
}

Value& Value::operator=(Value&& other) {
  Value moved(std::move(other));
  release();
  take(moved);
  return *this;
}

/// Takes over the content, owned or not. What this value held must have been released.
void Value::take(Value& other) noexcept {
  _kind = other._kind;
  _owning = other._owning;
  _unsigned = other._unsigned;
  _length = other._length;
  _payload = other._payload;
  other._kind = Kind::absent;
  other._owning = false;
}

void Value::release() noexcept {
  if (!_owning) return;
  _owning = false;
  if (_kind == Kind::array) {
    delete _payload.array->_arena;
  } else if (_kind == Kind::dictionary) {
    delete _payload.dictionary->_arena;
  } else {
    delete[] _payload.bytes;
  }
}

/// A contained value: everything it points to is new in the arena.
Value Value::copiedInto(Arena& arena) const {
  if (holdsBytes()) return Value(_kind, arena.copy(bytes()));
  if (_kind == Kind::array) {
    auto* copy = ::new (arena.allocate(sizeof(Array))) Array(&arena);
    copy->reserve(_payload.array->size());
    for (const Value& value : *_payload.array) {
      ::new (copy->place()) Value(value.copiedInto(arena));
      ++copy->_size;
    }
    return Value(copy);
  }
  if (_kind == Kind::dictionary) {
    const Dictionary& original = *_payload.dictionary;
    auto* copy = ::new (arena.allocate(sizeof(Dictionary))) Dictionary(&arena);
    if (original.empty()) return Value(copy);
    copy->_entries = static_cast<Dictionary::Entry*>(arena.allocate(original.size() * sizeof(Dictionary::Entry)));
    copy->_capacity = original._size;
    for (const Dictionary::Entry& entry : original) {
      ::new (copy->_entries + copy->_size) Dictionary::Entry{arena.copy(entry.key), entry.value.copiedInto(arena)};
      ++copy->_size;
    }
    if (original._index) copy->buildIndex(original.size());
    return Value(copy);
  }
  return Value(*this);
}

/// A container that was lent to the arena becomes one of its own before it is changed; what it holds stays lent.
void Value::ownContainer(Arena& arena) {
  if (_kind == Kind::array && _payload.array->_arena != &arena) {
    const Array& lent = *_payload.array;
    auto* own = ::new (arena.allocate(sizeof(Array))) Array(&arena);
    own->reserve(lent.size());
    if (!lent.empty()) {
      std::memcpy(static_cast<void*>(own->_values), static_cast<const void*>(lent._values),
                  lent.size() * sizeof(Value));
    }
    own->_size = lent._size;
    _payload.array = own;
  } else if (_kind == Kind::dictionary && _payload.dictionary->_arena != &arena) {
    const Dictionary& lent = *_payload.dictionary;
    auto* own = ::new (arena.allocate(sizeof(Dictionary))) Dictionary(&arena);
    if (!lent.empty()) {
      void* entries = arena.allocate(lent.size() * sizeof(Dictionary::Entry));
      std::memcpy(entries, static_cast<const void*>(lent._entries), lent.size() * sizeof(Dictionary::Entry));
      own->_entries = static_cast<Dictionary::Entry*>(entries);
      own->_size = own->_capacity = lent._size;
      if (lent._index) own->buildIndex(own->_size);
    }
    _payload.dictionary = own;
  }
}

/// Gives back to the arena what a contained value, which nobody will use again, points to.
void Value::recycleInto(Arena& arena) const noexcept {
  if (holdsBytes()) {
    arena.recycle(_payload.bytes, _length);
  } else if (_kind == Kind::array) {
    const Array& array = *_payload.array;
    if (array._arena != &arena) return;
    for (const Value& value : array) value.recycleInto(arena);
    arena.recycle(array._values, array._capacity * sizeof(Value));
    arena.recycle(&array, sizeof(Array));
  } else if (_kind == Kind::dictionary && _payload.dictionary->_arena == &arena) {
    _payload.dictionary->recycle();
  }
}

bool Value::boolValue() const noexcept {
  if (_kind == Kind::boolean || _kind == Kind::integer) return _payload.bits != 0;
  return _kind == Kind::real && _payload.real != 0;
}

bool operator==(const Value& one, const Value& other) noexcept {
  if (one._kind != other._kind) return false;
  switch (one._kind) {
    case Value::Kind::absent:
      return true;
    case Value::Kind::boolean:
      return one._payload.bits == other._payload.bits;
    case Value::Kind::integer:
      return one._payload.bits == other._payload.bits && one._unsigned == other._unsigned;
    case Value::Kind::real:
    case Value::Kind::date:
      // Two NaNs count as the same content.
      return one._payload.real == other._payload.real ||
             (one._payload.real != one._payload.real && other._payload.real != other._payload.real);
    case Value::Kind::string:
    case Value::Kind::data:
      return one.bytes() == other.bytes();
    case Value::Kind::array:
      return std::equal(one._payload.array->begin(), one._payload.array->end(), other._payload.array->begin(),
                        other._payload.array->end());
    case Value::Kind::dictionary: {
      const Dictionary& dictionary = *other._payload.dictionary;
      return one._payload.dictionary->size() == dictionary.size() &&
             std::all_of(one._payload.dictionary->begin(), one._payload.dictionary->end(),
                         [&](const Dictionary::Entry& entry) { return dictionary[entry.key] == entry.value; });
    }
  }
  return false;
}

}  // namespace platform
