#include "platform/StringSet.h"

#include <utility>

namespace platform {

bool StringSet::insert(std::string_view member) {
  auto [place, added] = _places.try_emplace(std::string(member), _slots.size());
  if (!added) return false;
  try {
    _slots.push_back({place->first, true});
  } catch (...) {
    _places.erase(place);
    throw;
  }
  return true;
}

bool StringSet::erase(std::string_view member) noexcept {
  auto place = _places.find(member);
  if (place == _places.end()) return false;
  _slots[place->second] = {{}, false};
  _places.erase(place);
  if (_slots.size() > 16 && _slots.size() > 2 * _places.size()) compact();
  return true;
}

void StringSet::clear() noexcept {
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

void StringSet::compact() noexcept {
  std::size_t kept = 0;
  for (auto& slot : _slots) {
    if (!slot.present) continue;
    _places.find(slot.member)->second = kept;
    if (&slot != &_slots[kept]) _slots[kept] = std::move(slot);
    ++kept;
  }
  _slots.erase(_slots.begin() + static_cast<std::ptrdiff_t>(kept), _slots.end());
}

}  // namespace platform
