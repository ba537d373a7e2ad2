#include "plist/ListMemory.h"

#include <algorithm>
#include <cstring>
#include <new>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/ValueBuilder.h"
#include "plist/BigEndian.h"
#include "plist/PropertyList.h"
#include "plist/Unicode.h"

namespace plist {

using platform::Array;
using platform::Bytes;
using platform::BytesView;
using platform::Dictionary;
using platform::ErrorRef;
using platform::Value;
using platform::ValueBuilder;

namespace {

constexpr std::size_t smallest = 16 * 1024;
constexpr std::size_t largest = 8 << 20;
constexpr std::size_t mostEdits = 64;     // of one writing
constexpr std::size_t mostNewTexts = 32;  // of a list
constexpr std::size_t longestText = 64;   // of those
constexpr std::size_t trailerSize = 32;

bool isWorthIt(std::size_t size) { return size >= smallest && size <= largest; }

/// A container among the bytes of a list written here.
struct Container {
  std::size_t count;
  std::size_t references;  // where they are
};

Container containerAt(BytesView bytes, std::size_t at) {
  std::size_t count = static_cast<unsigned char>(bytes[at++]) & 15;
  if (count == 15) {
    const unsigned size = 1u << (bytes[at++] & 3);
    count = readBigEndian(bytes.data() + at, size);
    at += size;
  }
  return {count, at};
}

/// Bytes of strings and data, at all their places.
std::size_t textOf(const Value& value) {
  if (auto text = value.string()) return text->size();
  if (auto data = value.data()) return data->size();
  std::size_t size = 0;
  if (value.array()) {
    for (const Value& item : *value.array()) size += textOf(item);
  } else if (value.dictionary()) {
    for (const Dictionary::Entry& entry : *value.dictionary()) size += entry.key.size() + textOf(entry.value);
  }
  return size;
}

/// Another text in an entry of the list.
struct Edit {
  std::size_t entry;
  std::size_t place;
  std::string_view text;
};

/// Adds what differs; false when more does than short texts under the same keys.
bool addEdits(std::size_t number, const Value& before, const Value& now, std::vector<Edit>& edits) {
  const Dictionary *old = before.dictionary(), *changed = now.dictionary();
  if (!old || !changed || old->size() != changed->size()) return false;
  for (std::size_t place = 0; place < old->size(); ++place) {
    const Dictionary::Entry &was = old->begin()[place], &is = changed->begin()[place];
    if (was.key != is.key) return false;
    if (was.value == is.value) continue;
    auto text = is.value.string();
    if (!text || !was.value.string() || text->size() > longestText || !isASCII(*text)) return false;
    edits.push_back({number, place, *text});
  }
  return edits.size() <= mostEdits;
}

void appendText(Bytes& bytes, std::string_view text) {
  if (text.size() < 15) {
    bytes += static_cast<char>(0x50 | text.size());
  } else {
    bytes += {'\x5f', '\x10', static_cast<char>(text.size())};
  }
  bytes += text;
}

/// The values of a list that are lent to whoever reads it.
struct Lent {
  explicit Lent(Value value)
      : decoded(std::make_shared<const Value>(std::move(value))),
        builder(decoded),
        entries(builder.makeArray(decoded->array()->size())),
        text(textOf(*decoded)) {
    ValueBuilder::lend(decoded->array()->begin(), entries.size(), ValueBuilder::places(entries));
  }

  const std::shared_ptr<const Value> decoded;
  ValueBuilder builder;
  Array& entries;  // as they are now: each of `decoded`, or one that was made here since
  std::size_t text;
};

}  // namespace

/// The list that was written last.
class ListMemory::Written {
 public:
  explicit Written(Bytes bytes) : _bytes(std::move(bytes)) { look(); }

  bool is(const Bytes& bytes) const { return bytes == _bytes; }

  /// Absent when there is no memory for it.
  Value lend() {
    if (!_lent) {
      Value decoded = plist::read(_bytes);
      if (!decoded.array()) return {};
      _lent = std::make_shared<Lent>(std::move(decoded));
    }
    ValueBuilder builder(_lent);
    Array& entries = builder.makeArray(_lent->entries.size());
    ValueBuilder::lend(_lent->entries.begin(), entries.size(), ValueBuilder::places(entries));
    return builder.finish(ValueBuilder::contained(entries));
  }

  /// Nothing when the value is not this list with a few other texts.
  std::optional<Bytes> change(const Value& list) {
    std::vector<Edit> edits;
    if (!_lent || !findEdits(*list.array(), edits)) return {};
    const auto newTexts = textsToAdd(edits);
    if (!newTexts) return {};
    Bytes changed = withTexts(*newTexts);
    for (const Edit& edit : edits) {
      writeBigEndian(changed.data() + placeOf(edit), numberOf(edit.text), _referenceSize);
    }
    keepEdits(edits);
    _bytes = changed;
    look();
    return changed;
  }

 private:
  struct Known {
    std::string_view text;
    std::size_t number;
  };

  void look() {
    const char* trailer = _bytes.data() + _bytes.size() - trailerSize;
    _offsetSize = static_cast<unsigned char>(trailer[6]);
    _referenceSize = static_cast<unsigned char>(trailer[7]);
    _objects = readBigEndian(trailer + 8, 8);
    _table = readBigEndian(trailer + 24, 8);
    _top = containerAt(_bytes, offsetOf(readBigEndian(trailer + 16, 8)));
  }

  std::size_t offsetOf(std::size_t object) const {
    return readBigEndian(_bytes.data() + _table + object * _offsetSize, _offsetSize);
  }
  std::size_t reference(std::size_t at) const { return readBigEndian(_bytes.data() + at, _referenceSize); }
  /// Where the reference to the edited text is.
  std::size_t placeOf(const Edit& edit) const {
    const Container entry = containerAt(_bytes, offsetOf(reference(_top.references + edit.entry * _referenceSize)));
    return entry.references + (entry.count + edit.place) * _referenceSize;
  }

  bool findEdits(const Array& now, std::vector<Edit>& edits) const {
    const Array& before = _lent->entries;
    if (now.size() != before.size()) return false;
    for (std::size_t i = 0; i < now.size(); ++i) {
      if (before[i].dictionary() && before[i].dictionary() == now[i].dictionary()) continue;
      if (!addEdits(i, before[i], now[i], edits)) return false;
    }
    return true;
  }

  /// Nothing when the list would be one that its sizes are too small for, or more has piled up in it than it is worth.
  std::optional<std::vector<std::string_view>> textsToAdd(const std::vector<Edit>& edits) {
    std::vector<std::string_view> texts;
    std::size_t size = 0, text = _lent->text;
    for (const Edit& edit : edits) {
      text += edit.text.size();  // what was there before is not taken off: an edit more or less does not matter
      if (numberOf(edit.text) || std::find(texts.begin(), texts.end(), edit.text) != texts.end()) continue;
      texts.push_back(edit.text);
      size += edit.text.size() + 3;
    }
    if (_known.size() + texts.size() > mostNewTexts || _edits + edits.size() > _lent->entries.size() ||
        text > maximumText(_bytes.size()) || bytesFor(_objects + texts.size() - 1) != _referenceSize ||
        bytesFor(_table + size) != _offsetSize)
      return {};
    _lent->text = text;
    _edits += edits.size();
    return texts;
  }

  std::size_t numberOf(std::string_view text) const {
    auto known = std::find_if(_known.begin(), _known.end(), [&](const Known& each) { return each.text == text; });
    return known == _known.end() ? 0 : known->number;
  }

  /// The list with these texts as further objects, which nothing refers to yet.
  Bytes withTexts(const std::vector<std::string_view>& texts) {
    Bytes list;
    list.reserve(_bytes.size() + texts.size() * (longestText + 3 + _offsetSize));
    list.append(_bytes, 0, _table);
    Bytes offsets;
    std::size_t objects = _objects;
    for (std::string_view text : texts) {
      offsets.resize(offsets.size() + _offsetSize);
      writeBigEndian(offsets.data() + offsets.size() - _offsetSize, list.size(), _offsetSize);
      appendText(list, text);
      char* kept = _lent->builder.allocateText(text.size());
      text.copy(kept, text.size());
      _known.push_back({{kept, text.size()}, objects++});
    }
    const std::size_t table = list.size();
    list.append(_bytes, _table, _objects * _offsetSize).append(offsets);
    list.append(_bytes, _bytes.size() - trailerSize, trailerSize);
    char* trailer = list.data() + list.size() - trailerSize;
    writeBigEndian(trailer + 8, objects, 8);
    writeBigEndian(trailer + 24, table, 8);
    return list;
  }

  /// Makes the edited entries anew, as the ones before may still be read.
  void keepEdits(const std::vector<Edit>& edits) {
    Dictionary* entry = nullptr;
    for (std::size_t i = 0; i < edits.size(); ++i) {
      Value& place = ValueBuilder::places(_lent->entries)[edits[i].entry];
      if (i == 0 || edits[i].entry != edits[i - 1].entry) {
        const Dictionary& before = *std::as_const(place).dictionary();
        entry = &_lent->builder.makeDictionary(before.size());
        std::memcpy(static_cast<void*>(ValueBuilder::places(*entry)), static_cast<const void*>(before.begin()),
                    before.size() * sizeof(Dictionary::Entry));
        ValueBuilder::sealUnlike(*entry);
        ::new (&place) Value(ValueBuilder::contained(*entry));
      }
      const auto known =
          std::find_if(_known.begin(), _known.end(), [&](const Known& each) { return each.text == edits[i].text; });
      ::new (&ValueBuilder::places(*entry)[edits[i].place].value) Value(ValueBuilder::string(known->text));
    }
  }

  Bytes _bytes;
  unsigned _offsetSize = 0;
  unsigned _referenceSize = 0;
  std::size_t _objects = 0;
  std::size_t _table = 0;
  Container _top{};
  std::shared_ptr<Lent> _lent;  // once it has been read
  std::vector<Known> _known;    // the texts that were added; they lie in what is lent
  std::size_t _edits = 0;
};

ListMemory::ListMemory() = default;
ListMemory::~ListMemory() = default;

Value ListMemory::read(Bytes input, ErrorRef* error) {
  if (isWorthIt(input.size())) {
    if (Value again = readAgain(input); !again.isAbsent()) {
      platform::setError(error, nullptr);
      return again;
    }
  }
  return plist::read(std::move(input), error);
}

std::optional<Bytes> ListMemory::writeBinary(const Value& value, ErrorRef* error) {
  if (auto changed = writeChanges(value)) {
    platform::setError(error, nullptr);
    return changed;
  }
  auto bytes = plist::writeBinary(value, error);
  if (bytes) remember(value, *bytes);
  return bytes;
}

Value ListMemory::readAgain(const Bytes& input) {
  platform::Mutex::Lock lock(_mutex);
  if (!_last || !_last->is(input)) return {};
  try {
    return _last->lend();
  } catch (const std::bad_alloc&) {
    _last = nullptr;
    return {};
  }
}

std::optional<Bytes> ListMemory::writeChanges(const Value& value) {
  platform::Mutex::Lock lock(_mutex);
  if (!_last || !value.array()) return {};
  try {
    return _last->change(value);
  } catch (const std::bad_alloc&) {
    _last = nullptr;
    return {};
  }
}

void ListMemory::remember(const Value& value, const Bytes& bytes) {
  if (!isWorthIt(bytes.size()) || !value.array() || !(*value.array())[0].dictionary()) return;
  platform::Mutex::Lock lock(_mutex);
  try {
    _last = std::make_unique<Written>(bytes);
  } catch (const std::bad_alloc&) {
    _last = nullptr;
  }
}

}  // namespace plist
