#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/Value.h"
#include "record/stream/HeardTexts.h"

namespace record {

/// What an argument or an answer of a call is written as: one item, which says itself what it is, so that a recording
/// is read, shown and redacted without knowing the call. Numbers are in groups of seven bits, the lowest first.
enum class Tag : std::uint8_t {
  absent,
  no,
  yes,
  number,      // from 0 on
  negative,    // -1 - n
  real,        // 8 bytes
  text,        // length, bytes
  data,        // length, bytes
  date,        // 8 bytes, seconds
  list,        // count, items
  dictionary,  // count, then a text and an item each
  error,       // domain, code, description, underlying: four items
  object,      // kind, number, flags; facts follow if the flags say so
  packed,      // length, an item in so many bytes: one that is large
};

/// What an object is. The numbers stand in recordings; new kinds come at the end.
enum class ObjectKind : std::uint8_t {
  client,
  coordinator,
  promise,
  placeholder,
  attributes,
  metadata,
  options,
  observer,
  registration,
  account,
  asset,
  proxy,
  log,
  manager,
  url,
  bundle,
  image,
  destination,
  callback,
  buffer,
};
constexpr std::size_t objectKindCount = 20;
const char* nameOf(ObjectKind kind);

/// An object as an item: the same number for the same object throughout a recording.
struct ObjectMention {
  static constexpr std::uint8_t isNew = 1;     // seen for the first time
  static constexpr std::uint8_t hasFacts = 2;  // what it is made of follows, as one item: of assets, proxies, buffers

  ObjectKind kind;
  std::uint64_t number;
  std::uint8_t flags;
};

/// Items deeper than this are refused; no value of a document is nested so deeply.
constexpr std::size_t deepestItem = 1100;
/// From so many bytes on an item of many parts is packed.
constexpr std::size_t packedFrom = 4096;

/// Bytes that are appended to. A list of thousands of apps is written for each mark in it, text by text: so there is
/// room first, and then what is written into it.
class ItemBuffer {
 public:
  ItemBuffer() = default;
  ItemBuffer(ItemBuffer&& other) noexcept { *this = std::move(other); }
  ItemBuffer& operator=(ItemBuffer&& other) noexcept {
    std::swap(_room, other._room);
    std::swap(_end, other._end);
    std::swap(_limit, other._limit);
    return *this;
  }

  std::string_view bytes() const { return {_room.get(), size()}; }
  std::size_t size() const { return static_cast<std::size_t>(_end - _room.get()); }
  void clear() { _end = _room.get(); }

  void byte(std::uint8_t value) {
    reserve(1);
    *_end++ = static_cast<char>(value);
  }
  void varint(std::uint64_t value) {
    reserve(longestVarint);
    putVarint(value);
  }
  void append(std::string_view bytes) {
    reserve(bytes.size());
    put(bytes);
  }
  /// A tag, a length, and so many bytes.
  void sized(std::uint8_t tag, std::string_view bytes) {
    reserve(1 + longestVarint + bytes.size());
    *_end++ = static_cast<char>(tag);
    putVarint(bytes.size());
    put(bytes);
  }
  /// Bytes in front of those from `begin` on.
  void insert(std::size_t begin, std::string_view bytes);

 private:
  static constexpr std::size_t longestVarint = 10;

  void reserve(std::size_t count) {
    if (static_cast<std::size_t>(_limit - _end) < count) grow(count);
  }
  void grow(std::size_t count);
  void putVarint(std::uint64_t value) {
    for (; value >= 0x80; value >>= 7) *_end++ = static_cast<char>(value | 0x80);
    *_end++ = static_cast<char>(value);
  }
  void put(std::string_view bytes) {
    const std::size_t count = bytes.size();
    // Most are short: two halves that overlap, without a call.
    if (count > 16) {
      std::memcpy(_end, bytes.data(), count);
    } else if (count >= 8) {
      putHalves<8>(bytes.data(), count);
    } else if (count >= 4) {
      putHalves<4>(bytes.data(), count);
    } else {
      for (std::size_t at = 0; at < count; ++at) _end[at] = bytes[at];
    }
    _end += count;
  }
  template <std::size_t half>
  void putHalves(const char* bytes, std::size_t count) {
    std::memcpy(_end, bytes, half);
    std::memcpy(_end + count - half, bytes + count - half, half);
  }

  std::unique_ptr<char[]> _room;
  char* _end = nullptr;
  char* _limit = nullptr;
};

/// Appends items to a buffer.
class ItemWriter {
 public:
  std::string_view bytes() const { return _buffer.bytes(); }
  std::string take() const { return std::string(bytes()); }
  void clear() { _buffer.clear(); }

  /// One item that is only looked at, to be compared with another one: it is not in `bytes`, which have `place` where
  /// it should be, and has to outlive this.
  struct Lent {
    std::size_t place;
    Tag tag;
    std::string_view bytes{};
    const platform::Value* list = nullptr;  // what it is, if it is no text and no bytes
    void putInto(ItemWriter& items) const;
  };
  /// Lends texts and bytes that are large, and lists; writes others.
  void lendText(Tag tag, std::string_view bytes);
  void lendValue(const platform::Value& value);
  const std::vector<Lent>& lent() const { return _lent; }
  /// All items, those that were lent too.
  std::string whole() const;

  void absent() { tag(Tag::absent); }
  void boolean(bool value) { tag(value ? Tag::yes : Tag::no); }
  void number(std::uint64_t value) {
    tag(Tag::number);
    varint(value);
  }
  void signedNumber(std::int64_t value) {
    if (value >= 0) return number(static_cast<std::uint64_t>(value));
    tag(Tag::negative);
    varint(static_cast<std::uint64_t>(-1 - value));
  }
  void real(double value);
  void text(std::string_view text) { sized(Tag::text, text); }
  void data(platform::BytesView bytes) { sized(Tag::data, bytes); }
  void date(double seconds);
  void list(std::size_t count) {
    tag(Tag::list);
    varint(count);
  }
  void dictionary(std::size_t count) {
    tag(Tag::dictionary);
    varint(count);
  }
  void error() { tag(Tag::error); }
  void object(const ObjectMention& mention);
  void packed(std::string_view item) { sized(Tag::packed, item); }
  void value(const platform::Value& value);

  /// Packs what was written from `begin` on, one item, if it has become large.
  void packFrom(std::size_t begin);
  /// Bytes that are items already.
  void items(std::string_view bytes) { _buffer.append(bytes); }

 private:
  void tag(Tag tag) { _buffer.byte(static_cast<std::uint8_t>(tag)); }
  void varint(std::uint64_t value) { _buffer.varint(value); }
  void sized(Tag as, std::string_view bytes) { _buffer.sized(static_cast<std::uint8_t>(as), bytes); }
  void fixed(double value);
  void bareValue(const platform::Value& value);

  ItemBuffer _buffer;
  std::vector<Lent> _lent;
};

void appendVarint(std::string& bytes, std::uint64_t value);

/// Reads items from bytes that outlive it. Whatever the bytes are, it reads nothing outside them and throws a
/// `RecordingError` at what no item can be.
class ItemReader {
 public:
  /// `large`: what is beside the items, if something is.
  explicit ItemReader(std::string_view bytes, const std::vector<LargePart>* large = nullptr)
      : _rest(bytes), _large(large) {}

  bool atEnd() const { return _rest.empty(); }
  std::string_view rest() const { return _rest; }
  /// The text that is beside the items and comes next; null when what comes is here.
  const LargeText* nextLarge() const;
  Tag peek() const;

  /// True, and past it, when an absent item comes.
  bool takeAbsent();
  bool boolean();
  std::uint64_t number();
  std::int64_t signedNumber();
  double real();
  std::string_view text();
  std::string ownText();
  platform::BytesView data();
  double date();
  std::size_t list();
  std::size_t dictionary();
  void error();
  ObjectMention object();
  platform::Value value();

  /// Steps into a packed item, if one comes: `inside` then reads it and this goes on behind it. Otherwise this itself.
  ItemReader& unpacked(ItemReader& inside);
  std::string_view packedBytes();
  /// Past one item; answers its bytes.
  std::string_view skip(std::size_t depth = 0);
  std::uint64_t varint();
  std::string_view bytes(std::uint64_t count);
  Tag tag();

 private:
  void expect(Tag wanted, const char* what);
  std::string_view sized();
  double fixed();

  std::string_view _rest;
  const std::vector<LargePart>* _large;
};

}  // namespace record
