#include "plist/StringTable.h"

namespace plist {

StringTable::StringTable() : _hashKey(platform::TextHashKey::forNewTable()), _mask(255), _slots(_mask + 1) {}

StringTable::Number StringTable::add(Kind kind, std::string_view text) {
  _strings.push_back({text.data(), static_cast<std::uint32_t>(text.size()), static_cast<std::uint32_t>(kind)});
  return {static_cast<std::uint32_t>(_strings.size() - 1), true};
}

StringTable::Number StringTable::number(Kind kind, std::string_view text) {
  auto hash = static_cast<std::uint32_t>(platform::textHash(text, _hashKey)) << 1;
  hash |= static_cast<std::uint32_t>(kind);
  std::uint32_t at = (hash >> 1) & _mask;
  for (; _slots[at]; at = (at + 1) & _mask) {
    const String& known = _strings[_slots[at] - 1];
    if (known.hash == hash && std::string_view(known.bytes, known.size) == text) {
      return {_slots[at] - 1, false};
    }
  }
  auto number = static_cast<std::uint32_t>(_strings.size());
  _strings.push_back({text.data(), static_cast<std::uint32_t>(text.size()), hash});
  _slots[at] = number + 1;
  if (_strings.size() * 2 > _slots.size()) grow();
  return {number, true};
}

void StringTable::grow() {
  std::vector<std::uint32_t> slots(_slots.size() * 2);
  _mask = static_cast<std::uint32_t>(slots.size() - 1);
  for (std::uint32_t number = 0; number < _strings.size(); ++number) {
    std::uint32_t at = (_strings[number].hash >> 1) & _mask;
    while (slots[at]) at = (at + 1) & _mask;
    slots[at] = number + 1;
  }
  _slots = std::move(slots);
}

}  // namespace plist
