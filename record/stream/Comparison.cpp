#include "record/stream/Comparison.h"

#include <algorithm>

#include "record/RecordingError.h"
#include "record/stream/SharedValue.h"

namespace record {

namespace {

Tag tagOf(const Event& event, const LargePart& part) {
  return ItemReader(std::string_view(event.payload).substr(part.begin), &event.large).peek();
}

void appendPart(std::string& into, const Event& event, const LargePart& part) {
  if (const Tag tag = tagOf(event, part); tag != Tag::list) {
    into.push_back(static_cast<char>(tag));
    appendVarint(into, part.text->size());
  }
  part.text->appendTo(into);
}

/// Goes through both from the beginning, as long as they are the same.
class Comparison {
 public:
  Comparison(const Event& event, const ItemWriter& came)
      : _event(event),
        _came(came),
        _expectedLeft(event.payload),
        _cameLeft(came.bytes()),
        _part(event.large.begin()),
        _lent(came.lent().begin()) {}

  bool isSame() {
    while (true) {
      const std::size_t untilPart = _part == _event.large.end() ? _expectedLeft.size() : _part->begin - expectedAt();
      const std::size_t untilLent = _lent == _came.lent().end() ? _cameLeft.size() : _lent->place - cameAt();
      const std::size_t count = std::min(untilPart, untilLent);
      if (_expectedLeft.substr(0, count) != _cameLeft.substr(0, count)) return false;
      _expectedLeft.remove_prefix(count);
      _cameLeft.remove_prefix(count);
      const bool atPart = untilPart == count && _part != _event.large.end();
      const bool atLent = untilLent == count && _lent != _came.lent().end();
      if (!atPart && !atLent) return _expectedLeft.empty() && _cameLeft.empty();
      if (!(atPart && atLent ? isSamePart() : atPart ? isPartWritten() : isLentWritten())) return false;
    }
  }

 private:
  std::size_t expectedAt() const { return _event.payload.size() - _expectedLeft.size(); }
  std::size_t cameAt() const { return _came.bytes().size() - _cameLeft.size(); }
  void passPart() {
    _expectedLeft.remove_prefix(_part->end - _part->begin);
    ++_part;
  }

  bool isSamePart() {
    const auto& lent = *_lent++;
    const LargeText& text = *_part->text;
    const Tag tag = tagOf(_event, *_part);
    passPart();
    if (!lent.list) return tag == lent.tag && text == lent.bytes;
    if (tag == Tag::packed && text.splitIntoElements()) return sameItems(sharedValue(text), *lent.list);
    ItemWriter written;
    lent.putInto(written);
    ItemReader item(written.bytes());
    return item.peek() == tag && text == (tag == Tag::packed ? item.packedBytes() : item.rest());
  }

  /// What is large in the recording was written into what came.
  bool isPartWritten() {
    std::string expected;
    appendPart(expected, _event, *_part);
    passPart();
    if (_lent != _came.lent().end() && _lent->place < cameAt() + expected.size()) return false;
    if (!_cameLeft.starts_with(expected)) return false;
    _cameLeft.remove_prefix(expected.size());
    return true;
  }

  /// What was lent is in the recording's items themselves.
  bool isLentWritten() {
    ItemWriter written;
    (_lent++)->putInto(written);
    if (!_expectedLeft.starts_with(written.bytes())) return false;
    _expectedLeft.remove_prefix(written.bytes().size());
    return true;
  }

  const Event& _event;
  const ItemWriter& _came;
  std::string_view _expectedLeft;
  std::string_view _cameLeft;
  std::vector<LargePart>::const_iterator _part;
  std::vector<ItemWriter::Lent>::const_iterator _lent;
};

}  // namespace

bool isSame(const Event& event, const ItemWriter& came) {
  if (event.large.empty() && came.lent().empty()) return event.payload == came.bytes();
  try {
    return Comparison(event, came).isSame();
  } catch (const RecordingError&) {
    // What is no value is not what came.
    return false;
  }
}

std::string wholePayload(const Event& event) {
  std::string whole;
  std::size_t at = 0;
  for (const auto& part : event.large) {
    whole.append(event.payload, at, part.begin - at);
    appendPart(whole, event, part);
    at = part.end;
  }
  return whole.append(event.payload, at);
}

}  // namespace record
