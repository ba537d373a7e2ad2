#include <algorithm>
#include <bit>
#include <cstring>
#include <limits>
#include <stdexcept>

#include "platform/Arena.h"
#include "platform/TextHash.h"
#include "platform/Value.h"

namespace platform {

/// An open-addressed table with linear probing, at most half full.
///
/// A slot holds the place of an entry in the entries' block, counted from 1; 0 is free. Places and not numbers:
/// when entries are removed at the front, the others keep their places. The key of the hash is the table's own, since a
/// dictionary made by one copy of this code is searched by another.
struct DictionaryIndex {
  std::uint32_t mask;
  std::uint32_t front;  // places of the block that lie before the first entry
  TextHashKey hashKey;

  static std::size_t sizeFor(std::size_t slots) { return sizeof(DictionaryIndex) + slots * sizeof(std::uint32_t); }
  std::uint32_t* slots() { return reinterpret_cast<std::uint32_t*>(this + 1); }
  std::size_t slotCount() const { return std::size_t{mask} + 1; }
  std::size_t size() const { return sizeFor(slotCount()); }
  std::uint32_t home(std::string_view key) const { return static_cast<std::uint32_t>(textHash(key, hashKey)) & mask; }
  /// The slot of an entry that is there.
  std::uint32_t& slotOf(std::string_view key, std::uint32_t place) {
    std::uint32_t at = home(key);
    while (slots()[at] != place) at = (at + 1) & mask;
    return slots()[at];
  }
  /// The entries now begin where their block begins.
  void movePlacesToFront() {
    std::for_each(slots(), slots() + slotCount(), [this](std::uint32_t& place) { place -= place ? front : 0; });
    front = 0;
  }
};

namespace {

constexpr std::size_t nowhere = static_cast<std::size_t>(-1);

/// Empties the slot and closes the gap, so that no search stops short.
void freeSlot(DictionaryIndex& index, std::uint32_t at, const Dictionary::Entry* block) {
  std::uint32_t next = at;
  while (true) {
    index.slots()[at] = 0;
    std::uint32_t home;
    do {
      next = (next + 1) & index.mask;
      if (index.slots()[next] == 0) return;
      home = index.home(block[index.slots()[next] - 1].key);
    } while (((next - home) & index.mask) < ((next - at) & index.mask));
    index.slots()[at] = index.slots()[next];
    at = next;
  }
}

}  // namespace

/// The number of the entry, or `nowhere`.
std::size_t Dictionary::find(std::string_view key) const noexcept {
  if (!_index) {
    for (std::size_t number = 0; number < _size; ++number) {
      if (_entries[number].key == key) return number;
    }
    return nowhere;
  }
  const Entry* block = _entries - _index->front;
  for (std::uint32_t at = _index->home(key); _index->slots()[at]; at = (at + 1) & _index->mask) {
    std::uint32_t place = _index->slots()[at] - 1;
    if (block[place].key == key) return place - _index->front;
  }
  return nowhere;
}

const Value& Dictionary::operator[](std::string_view key) const noexcept {
  static constexpr Value absent{};
  std::size_t number = find(key);
  return number == nowhere ? absent : _entries[number].value;
}

bool Dictionary::contains(std::string_view key) const noexcept { return find(key) != nowhere; }

Array* Dictionary::array(std::string_view key) {
  std::size_t number = find(key);
  if (number == nowhere) return nullptr;
  _entries[number].value.ownContainer(*_arena);
  return _entries[number].value.array();
}

Dictionary* Dictionary::dictionary(std::string_view key) {
  std::size_t number = find(key);
  if (number == nowhere) return nullptr;
  _entries[number].value.ownContainer(*_arena);
  return _entries[number].value.dictionary();
}

/// Makes an index for so many entries at least. If a key is there twice, answers the number of the later entry
/// and leaves the dictionary without an index.
std::optional<std::size_t> Dictionary::buildIndex(std::size_t count) {
  std::size_t slots = std::bit_ceil(count * 2);
  auto* index = static_cast<DictionaryIndex*>(_arena->allocate(DictionaryIndex::sizeFor(slots)));
  index->mask = static_cast<std::uint32_t>(slots - 1);
  index->front = _index ? _index->front : 0;
  index->hashKey = _index ? _index->hashKey : TextHashKey::forNewTable();
  std::fill_n(index->slots(), slots, 0);
  if (_index) _arena->recycle(_index, _index->size());
  _index = nullptr;
  for (std::uint32_t number = 0; number < _size; ++number) {
    std::string_view key = _entries[number].key;
    std::uint32_t at = index->home(key);
    for (; index->slots()[at]; at = (at + 1) & index->mask) {
      if (_entries[index->slots()[at] - 1 - index->front].key == key) return number;
    }
    index->slots()[at] = number + 1 + index->front;
  }
  _index = index;
  return {};
}

/// Moves what the index says of the entries [from, to) by one place up or down.
void Dictionary::shiftIndex(std::size_t from, std::size_t to, int by) noexcept {
  std::uint32_t first = static_cast<std::uint32_t>(from) + 1 + _index->front;
  auto count = static_cast<std::uint32_t>(to - from);
  if (count < (_index->mask + 1) / 32) {
    // Down from the lowest or up from the highest: no two entries ever claim one place.
    for (std::uint32_t step = 0; step < count; ++step) {
      std::uint32_t offset = by < 0 ? step : count - 1 - step;
      _index->slotOf(_entries[from + offset].key, first + offset) += static_cast<std::uint32_t>(by);
    }
    return;
  }
  for (std::uint32_t at = 0; at <= _index->mask; ++at) {
    std::uint32_t place = _index->slots()[at];
    _index->slots()[at] = place - first < count ? place + static_cast<std::uint32_t>(by) : place;
  }
}

/// Makes room for one more entry, in the block and in the index.
void Dictionary::makeRoom() {
  if (_size == std::numeric_limits<std::uint32_t>::max() / 4) {
    throw std::length_error("a dictionary of more than 2^30 entries");
  }
  if (_size == _capacity) {
    std::uint32_t front = _index ? _index->front : 0;
    std::size_t places = std::size_t{front} + _capacity;
    Entry* block = _entries ? _entries - front : nullptr;
    // Entries own nothing here, so their bytes are all there is to move.
    if (front > _capacity / 2) {
      std::memmove(static_cast<void*>(block), static_cast<const void*>(_entries), _size * sizeof(Entry));
      _entries = block;
      _capacity += front;
      _index->movePlacesToFront();
    } else {
      std::size_t wanted = std::max<std::size_t>(4, std::size_t{_capacity} + _capacity / 2);
      void* moved = _arena->allocate(wanted * sizeof(Entry));
      if (_size) std::memcpy(moved, static_cast<const void*>(_entries), _size * sizeof(Entry));
      _arena->recycle(block, places * sizeof(Entry));
      _entries = static_cast<Entry*>(moved);
      _capacity = static_cast<std::uint32_t>(wanted);
      if (front) _index->movePlacesToFront();
    }
  }
  if (_index ? (_size + 1) * 2 > _index->mask + 1 : _size == linearLimit) buildIndex((_size + 1) * 2);
}

void Dictionary::set(std::string_view key, const Value& value) {
  if (value.isAbsent()) {
    remove(key);
    return;
  }
  // Key and value may lie in this very dictionary: both are copied before anything moves or goes.
  const Value copy = value.copiedInto(*_arena);
  std::size_t number = find(key);
  if (number != nowhere) {
    _entries[number].value.recycleInto(*_arena);
  } else {
    std::string_view ownKey = _arena->copy(key);
    makeRoom();
    number = _size++;
    ::new (_entries + number) Entry{ownKey, Value()};
    if (_index) {
      std::uint32_t at = _index->home(ownKey);
      while (_index->slots()[at]) at = (at + 1) & _index->mask;
      _index->slots()[at] = static_cast<std::uint32_t>(number) + 1 + _index->front;
    }
  }
  std::memcpy(static_cast<void*>(&_entries[number].value), static_cast<const void*>(&copy), sizeof(Value));
}

bool Dictionary::remove(std::string_view key) {
  std::size_t number = find(key);
  if (number == nowhere) return false;
  if (_index) {
    auto place = static_cast<std::uint32_t>(number) + 1 + _index->front;
    std::uint32_t& slot = _index->slotOf(key, place);
    freeSlot(*_index, static_cast<std::uint32_t>(&slot - _index->slots()), _entries - _index->front);
  }
  _entries[number].value.recycleInto(*_arena);
  _arena->recycle(_entries[number].key.data(), _entries[number].key.size());
  // The shorter side moves; emptying a dictionary from either end costs next to nothing per entry.
  if (_index && number < _size / 2) {
    shiftIndex(0, number, +1);
    std::memmove(static_cast<void*>(_entries + 1), static_cast<const void*>(_entries), number * sizeof(Entry));
    ++_entries;
    --_capacity;
    ++_index->front;
  } else {
    if (_index) shiftIndex(number + 1, _size, -1);
    std::memmove(static_cast<void*>(_entries + number), static_cast<const void*>(_entries + number + 1),
                 (_size - number - 1) * sizeof(Entry));
  }
  --_size;
  return true;
}

/// Gives this dictionary, which nobody will use again, back to the arena.
void Dictionary::recycle() const noexcept {
  for (const Entry& entry : *this) {
    _arena->recycle(entry.key.data(), entry.key.size());
    entry.value.recycleInto(*_arena);
  }
  std::size_t front = _index ? _index->front : 0;
  if (_entries) _arena->recycle(_entries - front, (front + _capacity) * sizeof(Entry));
  if (_index) _arena->recycle(_index, _index->size());
  _arena->recycle(this, sizeof(Dictionary));
}

}  // namespace platform
