#include "platform/StringSet.h"

#include <utility>

namespace platform {

bool StringSet::insert(std::string_view member) {
  auto [place, added] = _places.try_emplace(std::string(member), _slots.size());
  if (added) _slots.push_back({place->first, true});
  return added;
}

bool StringSet::erase(std::string_view member) {
  auto place = _places.find(std::string(member));
  if (place == _places.end()) return false;
  _slots[place->second] = {{}, false};
  _places.erase(place);
  if (_slots.size() > 16 && _slots.size() > 2 * _places.size()) compact();
  return true;
}

void StringSet::clear() {
  _slots.clear();
  _places.clear();
}

std::vector<std::string> StringSet::members() const {
  std::vector<std::string> all;
  all.reserve(_places.size());
  for (const auto& slot : _slots) {
    if (slot.present) all.push_back(slot.member);
  }
  return all;
}

void StringSet::compact() {
  std::deque<Slot> kept;
  for (auto& slot : _slots) {
    if (!slot.present) continue;
    _places[slot.member] = kept.size();
    kept.push_back(std::move(slot));
  }
  _slots = std::move(kept);
}

}  // namespace platform
