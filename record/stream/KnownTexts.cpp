#include "record/stream/KnownTexts.h"

namespace record {

std::optional<std::size_t> KnownTexts::find(std::string_view text) const {
  auto found = _places.find(text);
  return found == _places.end() ? std::nullopt : std::optional(found->second);
}

void KnownTexts::add(std::string_view text, bool findable) {
  if (_size + text.size() > room) return;
  _size += text.size();
  const std::string& kept = _texts.emplace_back(text);
  if (findable) _places.emplace(kept, _texts.size() - 1);
}

}  // namespace record
