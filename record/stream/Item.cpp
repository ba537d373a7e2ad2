#include "record/stream/Item.h"

#include <algorithm>
#include <bit>
#include <cstring>
#include <new>

#include "platform/ValueBuilder.h"
#include "record/RecordingError.h"
#include "record/stream/SharedValue.h"
#include "record/stream/StreamFormat.h"

namespace record {

using platform::Value;
using platform::ValueBuilder;

namespace {

constexpr const char* kindNames[] = {"client",   "coordinator", "promise",     "placeholder",  "attributes",
                                     "metadata", "options",     "observer",    "registration", "account",
                                     "asset",    "proxy",       "log",         "manager",      "url",
                                     "bundle",   "image",       "destination", "callback",     "buffer"};
static_assert(std::size(kindNames) == objectKindCount);

[[noreturn]] void refuse(const std::string& what) { throw RecordingError(what); }

/// Reads one value; the bytes are those that the builder keeps.
class ValueReading {
 public:
  ValueReading(ValueBuilder& builder, ItemReader& reader) : _builder(builder), _reader(reader) {}

  Value read(std::size_t depth = 0) {
    if (depth > deepestItem) refuse("a value is nested too deeply");
    switch (_reader.peek()) {
      case Tag::absent:
        _reader.takeAbsent();
        return {};
      case Tag::no:
      case Tag::yes:
        return _reader.boolean();
      case Tag::number:
        return _reader.number();
      case Tag::negative:
        return _reader.signedNumber();
      case Tag::real:
        return _reader.real();
      case Tag::text:
        return ValueBuilder::string(_reader.text());
      case Tag::data:
        return ValueBuilder::data(_reader.data());
      case Tag::date:
        return platform::Date{_reader.date()};
      case Tag::list:
        return array(depth);
      case Tag::dictionary:
        return dictionary(depth);
      default:
        refuse("what should be a value is none");
    }
  }

 private:
  Value array(std::size_t depth) {
    const std::size_t count = _reader.list();
    auto& array = _builder.makeArray(count);
    auto* places = ValueBuilder::places(array);
    // An assignment would copy deeply.
    for (std::size_t i = 0; i < count; ++i) ::new (static_cast<void*>(places + i)) Value(read(depth + 1));
    return ValueBuilder::contained(array);
  }

  Value dictionary(std::size_t depth) {
    const std::size_t count = _reader.dictionary();
    auto& dictionary = _builder.makeDictionary(count);
    auto* places = ValueBuilder::places(dictionary);
    for (std::size_t i = 0; i < count; ++i) {
      ::new (static_cast<void*>(&places[i].key)) std::string_view(_reader.text());
      ::new (static_cast<void*>(&places[i].value)) Value(read(depth + 1));
    }
    if (_builder.seal(dictionary)) refuse("a dictionary has a key twice");
    return ValueBuilder::contained(dictionary);
  }

  ValueBuilder& _builder;
  ItemReader& _reader;
};

}  // namespace

Value containedValue(ValueBuilder& builder, ItemReader& items) { return ValueReading(builder, items).read(); }

const char* nameOf(ObjectKind kind) { return kindNames[static_cast<std::size_t>(kind)]; }

void appendVarint(std::string& bytes, std::uint64_t value) {
  while (value >= 0x80) {
    bytes.push_back(static_cast<char>(value | 0x80));
    value >>= 7;
  }
  bytes.push_back(static_cast<char>(value));
}

void ItemBuffer::grow(std::size_t count) {
  const std::size_t used = size();
  const std::size_t wanted = std::max<std::size_t>(used + count, 2 * static_cast<std::size_t>(_limit - _room.get()));
  const std::size_t capacity = std::max<std::size_t>(wanted, 256);
  std::unique_ptr<char[]> room(new char[capacity]);
  if (used > 0) std::memcpy(room.get(), _room.get(), used);
  _room = std::move(room);
  _end = _room.get() + used;
  _limit = _room.get() + capacity;
}

void ItemBuffer::insert(std::size_t begin, std::string_view bytes) {
  reserve(bytes.size());
  char* at = _room.get() + begin;
  std::memmove(at + bytes.size(), at, size() - begin);
  std::memcpy(at, bytes.data(), bytes.size());
  _end += bytes.size();
}

void ItemWriter::fixed(double value) {
  const auto bits = std::bit_cast<std::uint64_t>(value);
  char bytes[8];
  for (std::size_t at = 0; at < 8; ++at) bytes[at] = static_cast<char>(bits >> (8 * at));
  _buffer.append({bytes, sizeof bytes});
}

void ItemWriter::real(double value) {
  tag(Tag::real);
  fixed(value);
}

void ItemWriter::date(double seconds) {
  tag(Tag::date);
  fixed(seconds);
}

void ItemWriter::object(const ObjectMention& mention) {
  tag(Tag::object);
  _buffer.byte(static_cast<std::uint8_t>(mention.kind));
  varint(mention.number);
  _buffer.byte(mention.flags);
}

void ItemWriter::packFrom(std::size_t begin) {
  const std::size_t size = _buffer.size() - begin;
  if (size < packedFrom || static_cast<Tag>(bytes()[begin]) == Tag::packed) return;
  std::string head(1, static_cast<char>(Tag::packed));
  appendVarint(head, size);
  _buffer.insert(begin, head);
}

void ItemWriter::Lent::putInto(ItemWriter& items) const { list ? items.value(*list) : items.sized(tag, bytes); }

void ItemWriter::lendText(Tag tag, std::string_view bytes) {
  if (bytes.size() < LargeTexts::from) return sized(tag, bytes);
  _lent.push_back({_buffer.size(), tag, bytes});
}

void ItemWriter::lendValue(const Value& value) {
  if (!value.array() || value.array()->empty()) return this->value(value);
  _lent.push_back({_buffer.size(), Tag::list, {}, &value});
}

std::string ItemWriter::whole() const {
  ItemWriter items;
  std::size_t at = 0;
  for (const auto& lent : _lent) {
    items.items(bytes().substr(at, lent.place - at));
    lent.putInto(items);
    at = lent.place;
  }
  items.items(bytes().substr(at));
  return items.take();
}

void ItemWriter::value(const Value& value) {
  const std::size_t begin = _buffer.size();
  bareValue(value);
  if (value.array() || value.dictionary()) packFrom(begin);
}

void ItemWriter::bareValue(const Value& value) {
  switch (value.kind()) {
    case Value::Kind::absent:
      return absent();
    case Value::Kind::boolean:
      return boolean(*value.boolean());
    case Value::Kind::integer:
      return value.integer() ? signedNumber(*value.integer()) : number(*value.unsignedInteger());
    case Value::Kind::real:
      return real(*value.real());
    case Value::Kind::string:
      return text(*value.string());
    case Value::Kind::data:
      return data(*value.data());
    case Value::Kind::date:
      return date(value.date()->seconds);
    case Value::Kind::array:
      list(value.array()->size());
      for (const auto& element : *value.array()) bareValue(element);
      return;
    case Value::Kind::dictionary:
      dictionary(value.dictionary()->size());
      for (const auto& [key, entry] : *value.dictionary()) {
        text(key);
        bareValue(entry);
      }
      return;
  }
}

Tag ItemReader::peek() const {
  if (_rest.empty()) refuse("it ends where an item should be");
  auto tag = static_cast<std::uint8_t>(_rest.front());
  if (_large) tag &= static_cast<std::uint8_t>(~stream::knownBit);
  if (tag > static_cast<std::uint8_t>(Tag::packed)) refuse("an item has an unknown tag");
  return static_cast<Tag>(tag);
}

const LargeText* ItemReader::nextLarge() const {
  if (!_large || _rest.empty() || !(static_cast<std::uint8_t>(_rest.front()) & stream::knownBit)) return nullptr;
  ItemReader number(_rest.substr(1));
  return (*_large)[number.varint()].text.get();
}

Tag ItemReader::tag() {
  const Tag tag = peek();
  _rest.remove_prefix(1);
  return tag;
}

void ItemReader::expect(Tag wanted, const char* what) {
  if (tag() != wanted) refuse(std::string("an item should be ") + what);
}

std::uint64_t ItemReader::varint() {
  std::uint64_t value = 0;
  for (int shift = 0; shift < 64; shift += 7) {
    if (_rest.empty()) refuse("it ends in a number");
    const auto byte = static_cast<unsigned char>(_rest.front());
    _rest.remove_prefix(1);
    value |= std::uint64_t{byte & 0x7fu} << shift;
    if (byte < 0x80) return value;
  }
  refuse("a number is too large");
}

std::string_view ItemReader::bytes(std::uint64_t count) {
  if (count > _rest.size()) refuse("a length goes beyond the end");
  auto bytes = _rest.substr(0, count);
  _rest.remove_prefix(count);
  return bytes;
}

double ItemReader::fixed() {
  auto eight = bytes(8);
  std::uint64_t bits = 0;
  for (int i = 7; i >= 0; --i) bits = bits << 8 | static_cast<unsigned char>(eight[static_cast<std::size_t>(i)]);
  return std::bit_cast<double>(bits);
}

bool ItemReader::takeAbsent() {
  if (peek() != Tag::absent) return false;
  tag();
  return true;
}

bool ItemReader::boolean() {
  const Tag got = tag();
  if (got != Tag::no && got != Tag::yes) refuse("an item should be a boolean");
  return got == Tag::yes;
}

std::uint64_t ItemReader::number() {
  expect(Tag::number, "a number");
  return varint();
}

std::int64_t ItemReader::signedNumber() {
  const Tag got = tag();
  if (got != Tag::number && got != Tag::negative) refuse("an item should be a number");
  const std::uint64_t value = varint();
  if (value > static_cast<std::uint64_t>(INT64_MAX)) refuse("a number is too large");
  return got == Tag::number ? static_cast<std::int64_t>(value) : -1 - static_cast<std::int64_t>(value);
}

double ItemReader::real() {
  expect(Tag::real, "a real number");
  return fixed();
}

/// The bytes behind a tag, wherever they are.
std::string_view ItemReader::sized() {
  const auto* large = nextLarge();
  _rest.remove_prefix(1);
  const std::uint64_t number = varint();
  return large ? large->flat() : bytes(number);
}

std::string_view ItemReader::text() {
  if (peek() != Tag::text) refuse("an item should be a text");
  return sized();
}

/// One that is told in pieces is put together where it goes.
std::string ItemReader::ownText() {
  const auto* large = nextLarge();
  if (!large || peek() != Tag::text) return std::string(text());
  std::string own;
  own.reserve(large->size());
  large->appendTo(own);
  skip();
  return own;
}

platform::BytesView ItemReader::data() {
  if (peek() != Tag::data) refuse("an item should be bytes");
  return sized();
}

double ItemReader::date() {
  expect(Tag::date, "a date");
  return fixed();
}

/// A count of items, each of which takes a byte at least.
std::size_t ItemReader::list() {
  expect(Tag::list, "a list");
  const std::uint64_t count = varint();
  if (count > _rest.size()) refuse("a list is longer than what is left");
  return count;
}

std::size_t ItemReader::dictionary() {
  expect(Tag::dictionary, "a dictionary");
  const std::uint64_t count = varint();
  if (count > _rest.size() / 2) refuse("a dictionary is longer than what is left");
  return count;
}

void ItemReader::error() { expect(Tag::error, "an error"); }

ObjectMention ItemReader::object() {
  expect(Tag::object, "an object");
  const auto kind = static_cast<unsigned char>(bytes(1).front());
  if (kind >= objectKindCount) refuse("an object is of an unknown kind");
  const std::uint64_t number = varint();
  return {static_cast<ObjectKind>(kind), number, static_cast<std::uint8_t>(bytes(1).front())};
}

std::string_view ItemReader::packedBytes() {
  if (peek() != Tag::packed) refuse("an item should be a packed item");
  return sized();
}

ItemReader& ItemReader::unpacked(ItemReader& inside) {
  if (peek() == Tag::packed) {
    inside = ItemReader(packedBytes());
  } else if (nextLarge()) {
    inside = ItemReader(sized());
  } else {
    return *this;
  }
  return inside;
}

Value ItemReader::value() {
  if (const auto* large = nextLarge(); large && large->splitIntoElements()) {
    skip();
    return sharedValue(*large);
  }
  ItemReader inside{{}};
  // The values keep a copy of their own bytes, in which they find their texts.
  std::string_view item;
  ItemReader& reader = unpacked(inside);
  if (&reader == this) {
    const Tag next = peek();
    if (next == Tag::absent) return tag(), Value();
    item = skip();
  } else {
    item = inside.rest();
  }
  ValueBuilder builder{platform::Bytes(item)};
  ItemReader kept(builder.input());
  Value root = ValueReading(builder, kept).read();
  if (!kept.atEnd()) refuse("something follows a value");
  return builder.finish(root);
}

std::string_view ItemReader::skip(std::size_t depth) {
  if (depth > deepestItem) refuse("an item is nested too deeply");
  const std::string_view begin = _rest;
  const bool isLarge = nextLarge();
  const Tag next = tag();
  switch (isLarge ? Tag::number : next) {
    case Tag::absent:
    case Tag::no:
    case Tag::yes:
      break;
    case Tag::number:
    case Tag::negative:
      varint();
      break;
    case Tag::real:
    case Tag::date:
      bytes(8);
      break;
    case Tag::text:
    case Tag::data:
    case Tag::packed:
      bytes(varint());
      break;
    case Tag::list:
    case Tag::error:
    case Tag::dictionary: {
      std::uint64_t count = next == Tag::error ? 4 : varint();
      if (next == Tag::dictionary) count = count > _rest.size() ? _rest.size() + 1 : 2 * count;
      for (std::uint64_t i = 0; i < count; ++i) skip(depth + 1);
      break;
    }
    case Tag::object:
      bytes(1);
      varint();
      if (static_cast<unsigned char>(bytes(1).front()) & ObjectMention::hasFacts) skip(depth + 1);
      break;
  }
  return begin.substr(0, begin.size() - _rest.size());
}

}  // namespace record
