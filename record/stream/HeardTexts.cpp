#include "record/stream/HeardTexts.h"

#include <algorithm>
#include <utility>

#include "record/RecordingError.h"
#include "record/stream/Item.h"

namespace record {

namespace {

/// Of more pieces a text is gathered; a list has one for each element.
constexpr std::size_t mostPieces = 64;
constexpr std::size_t smallStore = std::size_t{64} << 10;

}  // namespace

std::string_view LargeText::Store::add(std::string text) {
  size += text.size() + sizeof(std::string);
  return texts.emplace_back(std::move(text));
}

LargeText::LargeText(std::string text) : _store(std::make_shared<Store>()), _size(text.size()) {
  _pieces.push_back(_store->add(std::move(text)));
}

void LargeText::appendTo(std::string& into) const {
  for (const auto& piece : _pieces) into.append(piece);
}

bool LargeText::operator==(std::string_view text) const {
  if (text.size() != _size) return false;
  return std::all_of(_pieces.begin(), _pieces.end(), [&](std::string_view piece) {
    const bool same = text.starts_with(piece);
    text.remove_prefix(std::min(piece.size(), text.size()));
    return same;
  });
}

std::string_view LargeText::flat() const {
  if (_pieces.size() == 1) return _pieces.front();
  if (_flat.empty()) {
    _flat.reserve(_size);
    appendTo(_flat);
  }
  return _flat;
}

bool LargeText::splitIntoElements() const {
  if (_isList) return true;
  const auto text = flat();
  const auto places = elementPlaces(text);
  if (places.empty()) return false;
  const bool isKept = _pieces.size() == 1;
  _pieces = {text.substr(0, places.front())};
  for (std::size_t at = 0; at + 1 < places.size(); ++at)
    _pieces.push_back(text.substr(places[at], places[at + 1] - places[at]));
  // Others are made of these pieces, and have the store alone.
  if (!isKept) {
    const auto kept = _store->add(std::move(_flat));
    for (auto& piece : _pieces) piece = {kept.data() + (piece.data() - text.data()), piece.size()};
    _flat.clear();
  }
  _isList = true;
  return true;
}

void LargeText::setMade(std::shared_ptr<const Made> made) const {
  _made = std::move(made);
  _before.reset();
  _edits.clear();
}

/// Leaves behind what others had of the store.
void LargeText::gather() {
  const auto store = std::make_shared<Store>();
  std::string text;
  text.reserve(_size);
  appendTo(text);
  const auto kept = store->add(std::move(text));
  std::size_t at = 0;
  for (auto& piece : _pieces) at += (piece = kept.substr(at, piece.size())).size();
  _store = store;
}

ListEditing::ListEditing(LargeTextRef before) : _before(std::move(before)), _made(new LargeText) {
  if (!_before->splitIntoElements()) throw RecordingError("what is edited is no list");
  _made->_store = _before->store();
  _made->_isList = true;
  _made->_pieces.reserve(_before->_pieces.size() + 8);
  _made->_pieces.emplace_back();
}

void ListEditing::add(std::string_view piece) {
  if (_made->elementCount() == LargeTexts::mostElements || piece.size() > LargeTexts::largestKept - _made->_size)
    throw RecordingError("an edited list is too large");
  _made->_pieces.push_back(piece);
  _made->_size += piece.size();
}

void ListEditing::keep(std::size_t count) {
  if (count > _before->elementCount() - _old) throw RecordingError("an edited list is longer than it was");
  for (; count > 0; --count) add(_before->element(_old++));
}

void ListEditing::edit(const LargeText::Edit& edit) {
  _old = _oldEnd;
  keep(edit.keep);
  if (edit.drop > _before->elementCount() - _old) throw RecordingError("an edited list is longer than it was");
  _oldEnd = _old + edit.drop;
  _made->_edits.push_back(edit);
}

void ListEditing::element(std::size_t begin, std::size_t end, std::string_view between) {
  std::string made;
  if (comesForAnother()) {
    const auto old = _before->element(_old++);
    if (begin > old.size() || end > old.size() - begin)
      throw RecordingError("an element is longer than what it is made of");
    made.append(old.substr(0, begin)).append(between).append(old.substr(old.size() - end));
  } else {
    made = between;
  }
  ItemReader whole(made);
  whole.skip();
  if (!whole.atEnd()) throw RecordingError("an element of a list is more than one item");
  add(_made->_store->add(std::move(made)));
}

std::shared_ptr<LargeText> ListEditing::finish() {
  _old = _oldEnd;
  keep(_before->elementCount() - _old);
  std::string head(1, static_cast<char>(Tag::list));
  appendVarint(head, _made->elementCount());
  _made->_size += head.size();
  _made->_pieces.front() = _made->_store->add(std::move(head));
  const std::size_t far = _before->_before ? _before->_farBefore + 1 : 1;
  if (_made->_store->size > 2 * _made->_size + smallStore) {
    _made->gather();
  } else if (far <= LargeText::farthestBefore) {
    _made->_before = _before;
    _made->_farBefore = far;
  }
  if (!_made->_before) _made->_edits.clear();
  return _made;
}

const LargeTextRef& HeardTexts::use(std::size_t slot) {
  std::rotate(_slots.begin(), _slots.begin() + static_cast<std::ptrdiff_t>(slot),
              _slots.begin() + static_cast<std::ptrdiff_t>(slot) + 1);
  return _slots.front();
}

const LargeTextRef& HeardTexts::keep(LargeTextRef text) {
  if (_slots.size() == LargeTexts::slots) _slots.pop_back();
  return _slots.emplace_front(std::move(text));
}

LargeTextRef HeardTexts::changed(std::size_t slot, std::size_t begin, std::size_t end, std::string between) const {
  const LargeText& base = *_slots[slot];
  const std::shared_ptr<LargeText> made(new LargeText);
  made->_store = base._store;
  made->_size = begin + between.size() + end;
  const auto take = [&](std::size_t from, std::size_t to) {
    std::size_t at = 0;
    for (const auto& piece : base._pieces) {
      const std::size_t first = std::clamp(from, at, at + piece.size()), last = std::clamp(to, at, at + piece.size());
      if (first < last) made->_pieces.push_back(piece.substr(first - at, last - first));
      at += piece.size();
    }
  };
  take(0, begin);
  if (!between.empty()) made->_pieces.push_back(made->_store->add(std::move(between)));
  take(base._size - end, base._size);
  if (made->_pieces.empty()) made->_pieces.emplace_back();
  if (made->_pieces.size() > mostPieces || made->_store->size > 2 * made->_size + smallStore) {
    made->gather();
    made->_pieces = {std::string_view(made->_store->texts.front())};
  }
  return made;
}

}  // namespace record
