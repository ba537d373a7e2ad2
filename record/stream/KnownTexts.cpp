#include "record/stream/KnownTexts.h"

#include <algorithm>
#include <cstring>

namespace record {

namespace {

/// How many bytes are the same from the beginning: in large steps first, which the C library compares fast.
std::size_t sameBegin(std::string_view one, std::string_view other) {
  const std::size_t most = std::min(one.size(), other.size());
  constexpr std::size_t step = 4096;
  std::size_t at = 0;
  while (at + step <= most && std::memcmp(one.data() + at, other.data() + at, step) == 0) at += step;
  while (at < most && one[at] == other[at]) ++at;
  return at;
}

std::size_t sameEnd(std::string_view one, std::string_view other, std::size_t most) {
  constexpr std::size_t step = 4096;
  const char* oneEnd = one.data() + one.size();
  const char* otherEnd = other.data() + other.size();
  std::size_t at = 0;
  while (at + step <= most && std::memcmp(oneEnd - at - step, otherEnd - at - step, step) == 0) at += step;
  while (at < most && *(oneEnd - at - 1) == *(otherEnd - at - 1)) ++at;
  return at;
}

}  // namespace

std::optional<std::size_t> KnownTexts::find(std::string_view text) const {
  auto found = _places.find(text);
  return found == _places.end() ? std::nullopt : std::optional(found->second);
}

void KnownTexts::add(std::string_view text, bool findable) {
  if (_mediumSize + text.size() > mediumRoom) return;
  _mediumSize += text.size();
  const std::string& kept = _medium.emplace_back(text);
  if (findable) _places.emplace(kept, _medium.size() - 1);
}

std::optional<KnownTexts::Likeness> KnownTexts::like(std::string_view text) const {
  std::optional<Likeness> best;
  for (std::size_t slot = 0; slot < _large.size(); ++slot) {
    const std::string& other = _large[slot];
    const std::size_t begin = sameBegin(text, other);
    const std::size_t end = sameEnd(text, other, std::min(text.size(), other.size()) - begin);
    if (begin + end < text.size() / 2) continue;
    if (begin + end == text.size() && text.size() == other.size()) return Likeness{slot, begin, end};
    if (!best || begin + end > best->begin + best->end) best = Likeness{slot, begin, end};
  }
  return best;
}

const std::string& KnownTexts::use(std::size_t slot) {
  std::rotate(_large.begin(), _large.begin() + static_cast<std::ptrdiff_t>(slot),
              _large.begin() + static_cast<std::ptrdiff_t>(slot) + 1);
  return _large.front();
}

const std::string& KnownTexts::keep(std::string text) {
  if (_large.size() == slots) _large.pop_back();
  return _large.emplace_front(std::move(text));
}

}  // namespace record
