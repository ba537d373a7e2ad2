#include "record/stream/LargeTexts.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include "record/RecordingError.h"
#include "record/stream/Item.h"

namespace record {

namespace {

/// How far behind a place where two lists differ they are looked for to go on alike, and how often.
constexpr std::size_t farthest = 16;
constexpr std::size_t mostEdits = 64;

/// A list's elements by number.
class Elements {
 public:
  Elements(std::string_view text, const std::vector<std::uint32_t>& places) : _text(text), _places(places) {}
  std::size_t count() const { return _places.size() - 1; }
  std::string_view operator[](std::size_t number) const {
    return _text.substr(_places[number], bytes(number, number + 1));
  }
  std::size_t bytes(std::size_t from, std::size_t to) const { return _places[to] - _places[from]; }

 private:
  std::string_view _text;
  const std::vector<std::uint32_t>& _places;
};

/// The parts of two lists that are not the same at their beginning and at their end.
struct Middle {
  std::size_t oldFrom, oldTo, newFrom, newTo;
};

/// After how many old and new elements the lists go on alike; nothing when that is not near.
std::optional<std::pair<std::size_t, std::size_t>> nextAlike(const Elements& before, const Elements& now,
                                                             const Middle& at) {
  for (std::size_t both = 1; both <= farthest; ++both) {
    for (std::size_t dropped = 0; dropped <= both; ++dropped) {
      const std::size_t inserted = both - dropped;
      if (at.oldFrom + dropped >= at.oldTo || at.newFrom + inserted >= at.newTo) continue;
      if (before[at.oldFrom + dropped] == now[at.newFrom + inserted]) return std::pair(dropped, inserted);
    }
  }
  return std::nullopt;
}

LargeTexts::Edit editOf(const Elements& before, const Elements& now, std::size_t keep, const Middle& part) {
  LargeTexts::Edit edit{keep, part.oldTo - part.oldFrom};
  for (std::size_t at = part.newFrom; at < part.newTo; ++at) {
    LargeTexts::NewElement made;
    made.between = now[at];
    if (const std::size_t old = part.oldFrom + (at - part.newFrom); old < part.oldTo) {
      const std::string_view was = before[old];
      made.begin = sameBegin(made.between, was);
      made.end = sameEnd(made.between, was, std::min(made.between.size(), was.size()) - made.begin);
      made.between = made.between.substr(made.begin, made.between.size() - made.begin - made.end);
    }
    edit.insert.push_back(made);
  }
  return edit;
}

std::size_t toldBytes(const LargeTexts::Edit& edit) {
  std::size_t bytes = 0;
  for (const auto& element : edit.insert) bytes += element.between.size() + 4;
  return bytes;
}

/// Nothing when they would take more than so many bytes.
std::optional<std::vector<LargeTexts::Edit>> editsOf(const Elements& before, const Elements& now, Middle left,
                                                     std::size_t kept, std::size_t bytesLeft) {
  std::vector<LargeTexts::Edit> edits;
  while (left.oldFrom < left.oldTo || left.newFrom < left.newTo) {
    if (left.oldFrom < left.oldTo && left.newFrom < left.newTo && before[left.oldFrom] == now[left.newFrom]) {
      ++left.oldFrom, ++left.newFrom, ++kept;
      continue;
    }
    const auto alike = edits.size() + 1 < mostEdits ? nextAlike(before, now, left) : std::nullopt;
    Middle part = left;
    if (alike) {
      part.oldTo = left.oldFrom + alike->first;
      part.newTo = left.newFrom + alike->second;
    } else if (part.newTo - part.newFrom > farthest && now.bytes(part.newFrom, part.newTo) > bytesLeft) {
      return std::nullopt;
    }
    edits.push_back(editOf(before, now, kept, part));
    const std::size_t told = toldBytes(edits.back());
    if (told > bytesLeft) return std::nullopt;
    bytesLeft -= told;
    left.oldFrom = part.oldTo;
    left.newFrom = part.newTo;
    kept = 0;
  }
  return edits;
}

/// Where a list's elements begin; nothing when it is none.
std::optional<std::pair<std::size_t, std::size_t>> headOf(std::string_view list) {
  try {
    ItemReader items(list);
    if (items.peek() != Tag::list) return std::nullopt;
    const std::size_t count = items.list();
    if (count > LargeTexts::mostElements) return std::nullopt;
    return std::pair(list.size() - items.rest().size(), count);
  } catch (const RecordingError&) {
    return std::nullopt;
  }
}

/// Others than this one need not be compared: those that are further back are mostly what it was before.
bool isNearlyAll(std::size_t same, std::size_t size) { return same >= size - size / 64; }

/// The places of a list that is the same as another one but for its middle; empty when it is no list after all.
std::vector<std::uint32_t> placesBeside(const std::vector<std::uint32_t>& old, std::string_view list, std::size_t head,
                                        const Middle& middle) {
  std::vector<std::uint32_t> places;
  places.reserve(middle.newTo + old.size() - middle.oldTo);
  for (std::size_t at = 0; at <= middle.oldFrom; ++at)
    places.push_back(static_cast<std::uint32_t>(old[at] - old.front() + head));
  try {
    ItemReader items(list.substr(places.back()));
    for (std::size_t at = middle.newFrom; at < middle.newTo; ++at) {
      items.skip();
      places.push_back(static_cast<std::uint32_t>(list.size() - items.rest().size()));
    }
  } catch (const RecordingError&) {
    return {};
  }
  const auto placeFromEnd = [&](std::size_t at) {
    return static_cast<std::uint32_t>(list.size() - (old.back() - old[at]));
  };
  if (places.back() != placeFromEnd(middle.oldTo)) return {};
  for (std::size_t at = middle.oldTo + 1; at < old.size(); ++at) places.push_back(placeFromEnd(at));
  return places;
}

}  // namespace

/// In large steps first, which the C library compares fast.
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

std::vector<std::uint32_t> elementPlaces(std::string_view list) {
  const auto head = headOf(list);
  if (!head) return {};
  std::vector<std::uint32_t> places{static_cast<std::uint32_t>(head->first)};
  places.reserve(head->second + 1);
  try {
    ItemReader items(list.substr(head->first));
    for (std::size_t number = 0; number < head->second; ++number) {
      items.skip();
      places.push_back(static_cast<std::uint32_t>(list.size() - items.rest().size()));
    }
    if (!items.atEnd()) return {};
  } catch (const RecordingError&) {
    return {};
  }
  return places;
}

std::optional<LargeTexts::Likeness> LargeTexts::like(std::string_view text) const {
  std::optional<Likeness> best;
  for (std::size_t slot = 0; slot < _slots.size(); ++slot) {
    const std::string& other = _slots[slot].text;
    const std::size_t begin = sameBegin(text, other);
    const std::size_t end = sameEnd(text, other, std::min(text.size(), other.size()) - begin);
    if (begin + end < text.size() / 2) continue;
    if (isNearlyAll(begin + end, text.size())) return Likeness{slot, begin, end};
    if (!best || begin + end > best->begin + best->end) best = Likeness{slot, begin, end};
  }
  return best;
}

std::optional<LargeTexts::ListLikeness> LargeTexts::likeList(std::string_view list) const {
  const auto head = headOf(list);
  if (!head) return std::nullopt;
  const std::string_view body = list.substr(head->first);
  std::vector<Likeness> candidates;
  for (std::size_t slot = 0; slot < _slots.size(); ++slot) {
    const Slot& base = _slots[slot];
    if (base.places.empty()) continue;
    const std::string_view oldBody = std::string_view(base.text).substr(base.places.front());
    const std::size_t begin = sameBegin(body, oldBody);
    candidates.push_back({slot, begin, sameEnd(body, oldBody, std::min(body.size(), oldBody.size()) - begin)});
    if (isNearlyAll(begin + candidates.back().end, body.size())) break;
  }
  // One that is not like it is gone through element by element, to no avail.
  std::stable_sort(candidates.begin(), candidates.end(), [](const Likeness& one, const Likeness& other) {
    return one.begin + one.end > other.begin + other.end;
  });
  for (const auto& candidate : candidates) {
    if (auto likeness = likeList(candidate, list, *head)) return likeness;
  }
  return std::nullopt;
}

std::optional<LargeTexts::ListLikeness> LargeTexts::likeList(const Likeness& candidate, std::string_view list,
                                                             const ListHead& head) const {
  const Slot& base = _slots[candidate.slot];
  const std::string_view was(base.text);
  const std::size_t begin = candidate.begin, end = candidate.end;
  // The old elements that lie wholly in what is the same are elements of the new list, too.
  const auto behind = std::upper_bound(base.places.begin(), base.places.end(), base.places.front() + begin);
  const auto last = std::lower_bound(behind - 1, base.places.end(), was.size() - end);
  Middle middle{};
  middle.oldFrom = middle.newFrom = static_cast<std::size_t>(behind - base.places.begin()) - 1;
  middle.oldTo = static_cast<std::size_t>(last - base.places.begin());
  const std::size_t sameLast = base.places.size() - 1 - middle.oldTo;
  if (middle.newFrom + sameLast > head.second) return std::nullopt;
  middle.newTo = head.second - sameLast;

  ListLikeness likeness;
  likeness.slot = candidate.slot;
  likeness.places = placesBeside(base.places, list, head.first, middle);
  if (likeness.places.empty()) return std::nullopt;
  auto edits =
      editsOf(Elements(was, base.places), Elements(list, likeness.places), middle, middle.oldFrom, list.size() / 2);
  if (!edits) return std::nullopt;
  likeness.edits = std::move(*edits);
  return likeness;
}

void LargeTexts::use(std::size_t slot) {
  std::rotate(_slots.begin(), _slots.begin() + static_cast<std::ptrdiff_t>(slot),
              _slots.begin() + static_cast<std::ptrdiff_t>(slot) + 1);
}

void LargeTexts::keep(std::string_view text, std::vector<std::uint32_t> places) {
  Slot slot;
  if (_slots.size() == slots) {
    slot = std::move(_slots.back());
    _slots.pop_back();
  }
  slot.text.assign(text);
  slot.places = std::move(places);
  _slots.push_front(std::move(slot));
}

}  // namespace record
