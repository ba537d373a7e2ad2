#include "plist/BinaryReader.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstring>
#include <limits>
#include <new>
#include <string>
#include <unordered_map>

#include "platform/DateText.h"
#include "platform/ValueBuilder.h"
#include "plist/BigEndian.h"
#include "plist/Failure.h"
#include "plist/Unicode.h"

namespace plist {
namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;
using platform::ValueBuilder;

constexpr std::size_t headerSize = 8;
constexpr std::size_t trailerSize = 32;

/// Reads one document, from its trailer down the references to its objects.
///
/// Objects are read again at each place that refers to them, so that every place gets a value of its own; the
/// limits on nodes and text keep that in bounds. A failed operation answers an absent value and leaves _error.
class BinaryReader {
 public:
  explicit BinaryReader(platform::Bytes input)
      : _builder(std::move(input)),
        _bytes(_builder.input()),
        _nodesLeft(maximumNodes(_bytes.size())),
        _textLeft(maximumText(_bytes.size())) {}

  Value read(platform::ErrorRef& error);

 private:
  /// The contents of an object: `count` items from the byte `at` on.
  struct Extent {
    std::size_t at = 0;
    std::size_t count = 0;
  };
  /// The last dictionary at some depth. The entries of a list mostly have the same keys.
  struct Keys {
    const char* references = nullptr;
    const Dictionary* dictionary = nullptr;
    std::size_t text = 0;
  };

  bool readTrailer();
  Value object(std::uint64_t number, std::size_t from);
  Value objectAt(std::size_t at, std::uint64_t number);
  Value simple(std::size_t at, unsigned low);
  Value integer(std::size_t at, unsigned low);
  Value real(std::size_t at, unsigned low);
  Value date(std::size_t at, unsigned low);
  Value data(std::size_t at, unsigned low);
  [[gnu::noinline]] Value array(std::size_t at, unsigned low, std::uint64_t number);
  [[gnu::noinline]] Value dictionary(std::size_t at, unsigned low, std::uint64_t number);
  bool readKeys(Dictionary& dictionary, std::size_t at, std::size_t from);
  Value text(std::size_t at);
  bool key(std::size_t from, std::string_view& text);
  bool otherKey(std::size_t at, std::string_view& text);
  bool shortASCII(std::size_t at, unsigned marker);
  bool ascii(std::size_t at, unsigned low, std::string_view& text);
  bool utf16(std::size_t at, unsigned low, std::string_view& text);

  bool find(std::uint64_t number, std::size_t from, std::size_t& at);
  bool extent(std::size_t at, unsigned low, std::size_t itemSize, const char* what, Extent& extent);
  bool fits(std::size_t at, std::size_t size, const char* what);
  bool enter(std::size_t at, std::uint64_t number, std::size_t nodes);
  bool spendText(std::size_t at, std::size_t size);
  /// The number that begins at the byte, of a size that goes with the shift: behind everything that is read there is
  /// the trailer, so eight bytes can be had anywhere.
  std::uint64_t number(std::size_t from, unsigned shift) const {
    return readBigEndian(_bytes.data() + from, 8) >> shift;
  }
  std::uint64_t number(std::size_t from) const { return number(from, _referenceShift); }
  Value reference(std::size_t from) { return object(number(from), from); }
  unsigned byte(std::size_t at) const { return static_cast<unsigned char>(_bytes.data()[at]); }
  bool fail(ErrorCode code, std::size_t at, std::string_view description);
  bool fail(std::size_t at, const char* what, const char* problem);
  bool failReference(std::uint64_t number, std::size_t from);
  bool failOffset(std::uint64_t number);

  ValueBuilder _builder;
  std::string_view _bytes;
  std::size_t _objectsEnd = 0;  // where the offset table begins
  std::uint64_t _objectCount = 0;
  unsigned _offsetSize = 0;
  unsigned _referenceSize = 0;
  unsigned _offsetShift = 0, _referenceShift = 0;
  std::size_t _nodesLeft;
  std::size_t _textLeft;
  std::array<std::uint64_t, maximumDepth> _path;                 // the containers around the present object
  std::size_t _depth = 0;                                        // how many
  std::array<Keys, 4> _lastKeys;                                 // by depth
  std::unordered_map<std::size_t, std::string_view> _converted;  // UTF-16 strings by the byte they are at
  platform::ErrorRef _error;
};

Value BinaryReader::read(platform::ErrorRef& error) {
  Value result;
  if (readTrailer()) {
    std::size_t from = _bytes.size() - 16;
    // Initialised and not assigned: a contained value would be copied deeply.
    const Value root = object(readBigEndian(_bytes.data() + from, 8), from);
    if (!_error) result = _builder.finish(root);
  }
  error = _error;
  return result;
}

bool BinaryReader::readTrailer() {
  if (_bytes.size() < headerSize + trailerSize) {
    return fail(ErrorCode::malformed, _bytes.size(), "the document ends before its trailer");
  }
  std::size_t at = _bytes.size() - trailerSize;
  const char* trailer = _bytes.data() + at;
  _offsetSize = byte(at + 6);
  _referenceSize = byte(at + 7);
  _objectCount = readBigEndian(trailer + 8, 8);
  std::uint64_t table = readBigEndian(trailer + 24, 8);
  if (_offsetSize < 1 || _offsetSize > 8) return fail(ErrorCode::malformed, at + 6, "offsets cannot have this size");
  if (_referenceSize < 1 || _referenceSize > 8)
    return fail(ErrorCode::malformed, at + 7, "references cannot have this size");
  if (table < headerSize || table > at) return fail(ErrorCode::malformed, at + 24, "the offset table lies outside");
  if (_objectCount > (at - table) / _offsetSize) {
    return fail(ErrorCode::malformed, at + 8, "more objects than the offset table has room for");
  }
  _objectsEnd = table;
  _offsetShift = 64 - 8 * _offsetSize;
  _referenceShift = 64 - 8 * _referenceSize;
  return true;
}

// Where something fails nothing is put together, so that the functions that go through every object stay small.
bool BinaryReader::fail(ErrorCode code, std::size_t at, std::string_view description) {
  if (!_error) _error = failure(code, "byte " + std::to_string(at) + ": " + std::string(description));
  return false;
}

bool BinaryReader::fail(std::size_t at, const char* what, const char* problem) {
  return fail(ErrorCode::malformed, at, std::string(what) + problem);
}

bool BinaryReader::failReference(std::uint64_t number, std::size_t from) {
  return fail(ErrorCode::malformed, from,
              "a reference to object " + std::to_string(number) + " of " + std::to_string(_objectCount));
}

bool BinaryReader::failOffset(std::uint64_t number) {
  return fail(ErrorCode::malformed, _objectsEnd + number * _offsetSize,
              "object " + std::to_string(number) + " lies outside the objects");
}

/// Where the object begins to which the byte `from` refers.
inline bool BinaryReader::find(std::uint64_t number, std::size_t from, std::size_t& at) {
  if (number >= _objectCount) return failReference(number, from);
  at = this->number(_objectsEnd + number * _offsetSize, _offsetShift);
  return (at >= headerSize && at < _objectsEnd) || failOffset(number);
}

inline bool BinaryReader::fits(std::size_t at, std::size_t size, const char* what) {
  return size <= _objectsEnd - at || fail(at, what, " runs past the objects");
}

/// Where the items of an object are whose marker, with `low` as its low half, is at the byte `at`.
inline bool BinaryReader::extent(std::size_t at, unsigned low, std::size_t itemSize, const char* what, Extent& extent) {
  std::uint64_t count = low;
  std::size_t from = at + 1;
  if (low == 15) {
    unsigned marker = from < _objectsEnd ? byte(from) : 0;
    if (marker < 0x10 || marker > 0x13) return fail(from, what, " without a count");
    unsigned size = 1u << (marker & 3);
    if (!fits(++from, size, what)) return false;
    count = readBigEndian(_bytes.data() + from, size);
    from += size;
  }
  // Not more than there are bytes, so it can be multiplied.
  if (count > _objectsEnd - from || count * itemSize > _objectsEnd - from) {
    return fail(at, what, " runs past the objects");
  }
  extent = {from, count};
  return true;
}

inline bool BinaryReader::spendText(std::size_t at, std::size_t size) {
  if (size > _textLeft) return fail(ErrorCode::tooLarge, at, "shared strings and data make the document too large");
  _textLeft -= size;
  return true;
}

/// Enters a container, which adds so many nodes.
bool BinaryReader::enter(std::size_t at, std::uint64_t number, std::size_t nodes) {
  if (std::find(_path.begin(), _path.begin() + _depth, number) != _path.begin() + _depth) {
    return fail(ErrorCode::malformed, at, "a container that contains itself");
  }
  if (_depth == maximumDepth) {
    return fail(ErrorCode::tooDeep, at, "containers more than " + std::to_string(maximumDepth) + " deep");
  }
  if (nodes > _nodesLeft) return fail(ErrorCode::tooLarge, at, "shared containers make the document too large");
  _nodesLeft -= nodes;
  _path[_depth++] = number;
  return true;
}

inline Value BinaryReader::object(std::uint64_t number, std::size_t from) {
  std::size_t at = 0;
  if (!find(number, from, at)) return {};
  unsigned marker = byte(at);
  if (shortASCII(at, marker)) return ValueBuilder::string({_bytes.data() + at + 1, marker & 15});
  return objectAt(at, number);
}

Value BinaryReader::objectAt(std::size_t at, std::uint64_t number) {
  unsigned marker = byte(at), low = marker & 15;
  switch (marker >> 4) {
    case 0x0:
      return simple(at, low);
    case 0x1:
      return integer(at, low);
    case 0x2:
      return real(at, low);
    case 0x3:
      return date(at, low);
    case 0x4:
      return data(at, low);
    case 0x5:
    case 0x6:
      return text(at);
    case 0x8:
      fail(ErrorCode::unsupported, at, "a UID, which a property list cannot hold");
      return {};
    case 0xa:
      return array(at, low, number);
    case 0xb:
    case 0xc:
      fail(ErrorCode::unsupported, at, "a set, which a property list cannot hold");
      return {};
    case 0xd:
      return dictionary(at, low, number);
  }
  fail(ErrorCode::malformed, at, "no object has the marker " + std::to_string(marker));
  return {};
}

Value BinaryReader::simple(std::size_t at, unsigned low) {
  if (low == 8) return Value(false);
  if (low == 9) return Value(true);
  if (low == 0) {
    fail(ErrorCode::unsupported, at, "null, which a property list cannot hold");
  } else {
    fail(ErrorCode::malformed, at, "no object has the marker " + std::to_string(low));
  }
  return {};
}

/// Up to 4 bytes hold an unsigned number, 8 and 16 bytes a signed one.
Value BinaryReader::integer(std::size_t at, unsigned low) {
  if (low > 4) {
    fail(ErrorCode::malformed, at, "an integer cannot have this size");
    return {};
  }
  unsigned size = 1u << low;
  if (!fits(at + 1, size, "an integer")) return {};
  const char* number = _bytes.data() + at + 1;
  if (size < 8) return Value(readBigEndian(number, size));
  if (size == 8) return Value(static_cast<std::int64_t>(readBigEndian(number, 8)));
  std::uint64_t high = readBigEndian(number, 8), rest = readBigEndian(number + 8, 8);
  if (high == 0) return Value(rest);
  if (high == std::numeric_limits<std::uint64_t>::max() && rest >> 63) return Value(static_cast<std::int64_t>(rest));
  fail(ErrorCode::outOfRange, at, "an integer beyond 64 bits");
  return {};
}

Value BinaryReader::real(std::size_t at, unsigned low) {
  if (low != 2 && low != 3) {
    fail(ErrorCode::malformed, at, "a real cannot have this size");
    return {};
  }
  unsigned size = 1u << low;
  if (!fits(at + 1, size, "a real")) return {};
  std::uint64_t bits = readBigEndian(_bytes.data() + at + 1, size);
  if (size == 8) return Value(std::bit_cast<double>(bits));
  return Value(static_cast<double>(std::bit_cast<float>(static_cast<std::uint32_t>(bits))));
}

Value BinaryReader::date(std::size_t at, unsigned low) {
  if (low != 3) {
    fail(ErrorCode::malformed, at, "a date cannot have this size");
    return {};
  }
  if (!fits(at + 1, 8, "a date")) return {};
  platform::Date date{std::bit_cast<double>(readBigEndian(_bytes.data() + at + 1, 8))};
  if (platform::hasText(date)) return Value(date);
  fail(ErrorCode::outOfRange, at, "a date outside the years 1 to 9999");
  return {};
}

Value BinaryReader::data(std::size_t at, unsigned low) {
  Extent bytes;
  if (!extent(at, low, 1, "data", bytes) || !spendText(at, bytes.count)) return {};
  return ValueBuilder::data(_bytes.substr(bytes.at, bytes.count));
}

Value BinaryReader::text(std::size_t at) {
  std::string_view text;
  unsigned marker = byte(at);
  if (marker >> 4 == 5 ? ascii(at, marker & 15, text) : utf16(at, marker & 15, text)) return ValueBuilder::string(text);
  return {};
}

/// Whether there is what most objects are: an ASCII string of less than 15 characters, behind its marker. Anything
/// else, what is wrong with it included, is left to the functions for all strings.
inline bool BinaryReader::shortASCII(std::size_t at, unsigned marker) {
  const std::size_t from = at + 1, size = marker & 15;
  if (marker >> 4 != 5 || size == 15 || size > _objectsEnd - from || size > _textLeft) return false;
  // All bytes of the text and no others: the first eight and the last, or as many as there are.
  const char* text = _bytes.data() + from;
  std::uint64_t bits = readBigEndian(text, 8);
  bits = size >= 8 ? bits | readBigEndian(text + size - 8, 8) : bits & ~(~std::uint64_t{0} >> (8 * size));
  if (bits & 0x8080808080808080) return false;
  _textLeft -= size;
  return true;
}

bool BinaryReader::ascii(std::size_t at, unsigned low, std::string_view& text) {
  Extent bytes;
  if (!extent(at, low, 1, "a string", bytes) || !spendText(at, bytes.count)) return false;
  text = _bytes.substr(bytes.at, bytes.count);
  return isASCII(text) || fail(ErrorCode::malformed, at, "an ASCII string with other characters");
}

bool BinaryReader::utf16(std::size_t at, unsigned low, std::string_view& text) {
  if (auto known = _converted.find(at); known != _converted.end()) {
    text = known->second;
    return spendText(at, text.size());
  }
  Extent units;
  if (!extent(at, low, 2, "a string", units)) return false;
  std::string_view written = _bytes.substr(units.at, units.count * 2);
  std::optional<std::size_t> size = utf8Size(written, ByteOrder::big);
  if (!size) return fail(ErrorCode::malformed, at, "a UTF-16 string with half a surrogate pair");
  if (!spendText(at, *size)) return false;
  char* converted = _builder.allocateText(*size);
  writeUTF8(written, ByteOrder::big, converted);
  text = _converted[at] = {converted, *size};
  return true;
}

Value BinaryReader::array(std::size_t at, unsigned low, std::uint64_t number) {
  Extent items;
  if (!extent(at, low, _referenceSize, "an array", items) || !enter(at, number, items.count)) return {};
  Array& array = _builder.makeArray(items.count);
  Value* places = ValueBuilder::places(array);
  for (std::size_t index = 0; index < items.count; ++index) {
    ::new (places + index) Value(reference(items.at + index * _referenceSize));
    if (_error) return {};
  }
  --_depth;
  return ValueBuilder::contained(array);
}

Value BinaryReader::dictionary(std::size_t at, unsigned low, std::uint64_t number) {
  Extent items;
  if (!extent(at, low, 2 * _referenceSize, "a dictionary", items) || !enter(at, number, 2 * items.count)) return {};
  Dictionary& dictionary = _builder.makeDictionary(items.count);
  if (!readKeys(dictionary, at, items.at)) return {};
  std::size_t from = items.at + items.count * _referenceSize;
  Dictionary::Entry* places = ValueBuilder::places(dictionary);
  for (std::size_t index = 0; index < items.count; ++index) {
    ::new (&places[index].value) Value(reference(from + index * _referenceSize));
    if (_error) return {};
  }
  --_depth;
  return ValueBuilder::contained(dictionary);
}

/// Puts the keys into their places; the values are not there yet.
bool BinaryReader::readKeys(Dictionary& dictionary, std::size_t at, std::size_t from) {
  std::size_t count = dictionary.size();
  const char* references = _bytes.data() + from;
  Dictionary::Entry* places = ValueBuilder::places(dictionary);
  Keys& last = _lastKeys[_depth % _lastKeys.size()];
  bool same = last.dictionary && last.dictionary->size() == count &&
              std::memcmp(last.references, references, count * _referenceSize) == 0;
  if (same) {
    if (!spendText(at, last.text)) return false;
    const Dictionary::Entry* known = last.dictionary->begin();
    for (std::size_t index = 0; index < count; ++index) ::new (&places[index].key) std::string_view(known[index].key);
    ValueBuilder::sealUnlike(dictionary);
    return true;
  }
  std::size_t before = _textLeft;
  for (std::size_t index = 0; index < count; ++index, from += _referenceSize) {
    if (!key(from, *::new (&places[index].key) std::string_view)) return false;
  }
  if (auto twice = _builder.seal(dictionary)) {
    return fail(ErrorCode::duplicateKey, at, "the key " + quoted(places[*twice].key) + " appears twice");
  }
  last = {references, &dictionary, before - _textLeft};
  return true;
}

inline bool BinaryReader::key(std::size_t from, std::string_view& text) {
  std::size_t at = 0;
  if (!find(number(from), from, at)) return false;
  unsigned marker = byte(at);
  if (!shortASCII(at, marker)) return otherKey(at, text);
  text = {_bytes.data() + at + 1, marker & 15};
  return true;
}

bool BinaryReader::otherKey(std::size_t at, std::string_view& text) {
  unsigned marker = byte(at);
  if (marker >> 4 == 5) return ascii(at, marker & 15, text);
  if (marker >> 4 == 6) return utf16(at, marker & 15, text);
  return fail(ErrorCode::malformed, at, "a dictionary key that is not a string");
}

}  // namespace

Value readBinary(platform::Bytes input, platform::ErrorRef& error) {
  return BinaryReader(std::move(input)).read(error);
}

}  // namespace plist
