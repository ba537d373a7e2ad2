#include "plist/BinaryWriter.h"

#include <bit>
#include <cstring>
#include <limits>

#include "platform/DateText.h"
#include "plist/BigEndian.h"
#include "plist/Failure.h"
#include "plist/PropertyList.h"
#include "plist/Unicode.h"

namespace plist {
namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;

constexpr std::string_view header = "bplist00";
constexpr std::size_t trailerSize = 32;

std::size_t markerSize(std::uint64_t count) { return count < 15 ? 1 : 2 + bytesFor(count); }

/// Up to 4 bytes are read as unsigned; 8 bytes are signed, so what is above them takes 16.
unsigned integerSize(const Value& value) {
  std::optional<std::int64_t> number = value.integer();
  if (!number) return 16;
  return *number < 0 ? 8 : bytesFor(static_cast<std::uint64_t>(*number));
}

}  // namespace

/// Whether a document of that size may hold so much.
bool BinaryWriter::isReadable(std::size_t size) const {
  return _references <= maximumNodes(size) && _text <= maximumText(size);
}

std::optional<platform::Bytes> BinaryWriter::write(const Value& value, platform::ErrorRef& error) {
  if (!count(value, 0)) {
    error = _error;
    return {};
  }
  _strings->complete();
  _objects += _strings->size();
  if (_objects > std::numeric_limits<std::uint32_t>::max()) {
    error = failure(ErrorCode::tooLarge, "more than 2^32 objects");
    return {};
  }
  _referenceSize = bytesFor(_objects - 1);
  std::size_t stringsEnd = header.size() + _stringsSize;
  std::size_t table = stringsEnd + _size + _references * _referenceSize;
  _offsetSize = bytesFor(table);

  platform::Bytes bytes;
  std::size_t size = table + _objects * _offsetSize + trailerSize;
  if (_shares && !isReadable(size)) {
    _strings.reset();
    return BinaryWriter(false).write(value, error);
  }
  bytes.reserve(size);
  bytes.resize(stringsEnd);
  _begin = _at = bytes.data();
  writeBytes(header);
  writeStrings();
  _strings.reset();
  bytes.resize(size);
  _offsets = _begin + table;
  _nextString = _stringNumbers.cbegin();
  writeStringOffsets();
  std::uint32_t top = writeValue(value);
  writeTrailer(top);
  return bytes;
}

bool BinaryWriter::count(const Value& value, std::size_t depth) {
  switch (value.kind()) {
    case Value::Kind::absent:
      _error = failure(ErrorCode::notRepresentable, "an absent value");
      return false;
    case Value::Kind::boolean:
      countObject(1);
      return true;
    case Value::Kind::integer:
      countObject(1 + integerSize(value));
      return true;
    case Value::Kind::date:
      if (!platform::hasText(*value.date())) {
        _error = failure(ErrorCode::outOfRange, "a date outside the years 1 to 9999");
        return false;
      }
      [[fallthrough]];
    case Value::Kind::real:
      countObject(9);
      return true;
    case Value::Kind::string:
      return countString(*value.string());
    case Value::Kind::data:
      if (addText(StringTable::Kind::data, *value.data()))
        _stringsSize += markerSize(value.data()->size()) + value.data()->size();
      return true;
    case Value::Kind::array:
      return countItems(*value.array(), depth);
    case Value::Kind::dictionary:
      return countEntries(*value.dictionary(), depth);
  }
  return false;
}

bool BinaryWriter::countItems(const platform::Array& items, std::size_t depth) {
  if (!countContainer(items.size(), 1, depth)) return false;
  for (const Value& item : items) {
    if (!count(item, depth + 1)) return false;
  }
  return true;
}

bool BinaryWriter::countEntries(const Dictionary& entries, std::size_t depth) {
  if (!countContainer(entries.size(), 2, depth)) return false;
  for (const Dictionary::Entry& entry : entries) {
    const std::size_t place = (23 * depth + static_cast<std::size_t>(&entry - entries.begin())) % places;
    if (!countAgain(entry.key, _lastKeys[place])) return false;
    const auto text = entry.value.string();
    if (!(text ? countAgain(*text, _lastTexts[place]) : count(entry.value, depth + 1))) return false;
  }
  return true;
}

/// Whether it is a new object.
bool BinaryWriter::addText(StringTable::Kind kind, std::string_view text) {
  StringTable::Number object = _shares ? _strings->number(kind, text) : _strings->add(kind, text);
  _stringNumbers.push_back(object.number);
  _text += text.size();
  return object.isNew;
}

bool BinaryWriter::countString(std::string_view text) {
  if (!addText(StringTable::Kind::string, text)) return true;
  if (isASCII(text)) {
    _stringsSize += markerSize(text.size()) + text.size();
    return true;
  }
  std::optional<std::size_t> units = utf16Units(text);
  if (!units) {
    _error = failure(ErrorCode::notRepresentable, "the string " + quoted(text) + " is not valid UTF-8");
    return false;
  }
  _stringsSize += markerSize(*units) + *units * 2;
  return true;
}

/// A string that may well be the last one.
bool BinaryWriter::countAgain(std::string_view text, Last& last) {
  const bool isSame = last.text.size() == text.size() && (last.text.data() == text.data() || last.text == text);
  if (_shares && last.isKnown && isSame) {
    _stringNumbers.push_back(last.number);
    _text += text.size();
    return true;
  }
  if (!countString(text)) return false;
  last = {text, _stringNumbers.back(), true};
  return true;
}

bool BinaryWriter::countContainer(std::size_t items, std::size_t references, std::size_t depth) {
  if (depth == maximumDepth) {
    _error = tooDeep();
    return false;
  }
  _references += items * references;
  countObject(markerSize(items));
  return true;
}

void BinaryWriter::countObject(std::size_t size) {
  ++_objects;
  _size += size;
}

void BinaryWriter::writeStrings() {
  for (std::size_t number = 0; number < _strings->size(); ++number) {
    std::string_view text = (*_strings)[number];
    if (_strings->kindOf(number) == StringTable::Kind::data) {
      writeMarker(0x40, text.size());
      writeBytes(text);
    } else if (isASCII(text)) {
      writeMarker(0x50, text.size());
      writeBytes(text);
    } else {
      writeMarker(0x60, *utf16Units(text));
      _at = writeUTF16(text, _at);
    }
  }
}

/// The strings and data have been written; their sizes stand with them.
void BinaryWriter::writeStringOffsets() {
  char* end = _at;
  for (_at = _begin + header.size(); _at != end;) {
    beginObject();
    unsigned marker = static_cast<unsigned char>(*_at++);
    std::uint64_t count = marker & 15;
    if (count == 15) {
      unsigned size = 1u << (*_at++ & 3);
      count = readBigEndian(_at, size);
      _at += size;
    }
    _at += count * (marker >> 4 == 6 ? 2 : 1);
  }
}

/// Answers the object's number.
std::uint32_t BinaryWriter::writeValue(const Value& value) {
  if (value.kind() == Value::Kind::string || value.kind() == Value::Kind::data) return *_nextString++;
  if (value.kind() == Value::Kind::array) return writeArray(*value.array());
  if (value.kind() == Value::Kind::dictionary) return writeDictionary(*value.dictionary());
  std::uint32_t number = beginObject();
  if (auto boolean = value.boolean()) {
    *_at++ = *boolean ? 0x09 : 0x08;
  } else if (value.kind() == Value::Kind::integer) {
    writeInteger(value);
  } else {
    *_at++ = value.real() ? 0x23 : 0x33;
    _at = writeBigEndian(_at, std::bit_cast<std::uint64_t>(value.real() ? *value.real() : value.date()->seconds), 8);
  }
  return number;
}

std::uint32_t BinaryWriter::writeArray(const Array& array) {
  std::size_t first = _pending.size();
  for (const Value& item : array) _pending.push_back(writeValue(item));
  std::uint32_t number = beginObject();
  writeMarker(0xa0, array.size());
  for (std::size_t at = first; at < _pending.size(); ++at) _at = writeBigEndian(_at, _pending[at], _referenceSize);
  _pending.resize(first);
  return number;
}

std::uint32_t BinaryWriter::writeDictionary(const Dictionary& dictionary) {
  std::size_t first = _pending.size(), count = dictionary.size();
  _pending.resize(first + 2 * count);
  std::size_t place = first;
  for (const Dictionary::Entry& entry : dictionary) {
    _pending[place] = *_nextString++;
    std::uint32_t value = writeValue(entry.value);
    _pending[count + place++] = value;
  }
  std::uint32_t number = beginObject();
  writeMarker(0xd0, count);
  for (std::size_t at = first; at < _pending.size(); ++at) _at = writeBigEndian(_at, _pending[at], _referenceSize);
  _pending.resize(first);
  return number;
}

void BinaryWriter::writeInteger(const Value& value) {
  unsigned size = integerSize(value);
  *_at++ = static_cast<char>(0x10 | std::countr_zero(size));
  if (size == 16) {
    _at = writeBigEndian(_at, 0, 8);
    _at = writeBigEndian(_at, *value.unsignedInteger(), 8);
  } else {
    _at = writeBigEndian(_at, static_cast<std::uint64_t>(*value.integer()), size);
  }
}

void BinaryWriter::writeMarker(unsigned kind, std::uint64_t count) {
  if (count < 15) {
    *_at++ = static_cast<char>(kind | count);
    return;
  }
  unsigned size = bytesFor(count);
  *_at++ = static_cast<char>(kind | 15);
  *_at++ = static_cast<char>(0x10 | std::countr_zero(size));
  _at = writeBigEndian(_at, count, size);
}

void BinaryWriter::writeBytes(std::string_view bytes) {
  std::memcpy(_at, bytes.data(), bytes.size());
  _at += bytes.size();
}

/// Answers the number of the object that is written next.
std::uint32_t BinaryWriter::beginObject() {
  _offsets = writeBigEndian(_offsets, static_cast<std::uint64_t>(_at - _begin), _offsetSize);
  return _nextObject++;
}

void BinaryWriter::writeTrailer(std::uint32_t top) {
  auto table = static_cast<std::uint64_t>(_at - _begin);
  char* trailer = _offsets;
  trailer[6] = static_cast<char>(_offsetSize);
  trailer[7] = static_cast<char>(_referenceSize);
  writeBigEndian(trailer + 8, _objects, 8);
  writeBigEndian(trailer + 16, top, 8);
  writeBigEndian(trailer + 24, table, 8);
}

}  // namespace plist
