#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>

namespace platform {

/// Raw bytes of any content. Not text unless an operation says so.
using Bytes = std::string;
using BytesView = std::string_view;

/// A moment, in seconds since 2001-01-01T00:00:00Z. May be fractional and negative.
struct Date {
  double seconds = 0;
  friend bool operator==(const Date&, const Date&) = default;
};

class Arena;
class Array;
class Dictionary;
struct DictionaryIndex;
class ValueBuilder;

/// One property-list value, or none ("absent").
///
/// A Value owns what it holds. Strings, data and containers of one document lie in one arena that the
/// outermost Value owns; the values inside a container are seen as `const Value&` and stay valid until
/// that container is changed or its outermost Value goes. Copying a Value, putting one into a container
/// and copying one out copy deeply, so nothing a caller keeps can dangle; moving an outermost Value is cheap.
///
/// Typed reading never throws and never converts: it answers nothing when the value is of another kind.
/// A string or data of 4 GiB or more throws std::length_error, as a lack of memory throws std::bad_alloc.
/// Not synchronised: one thread at a time may touch a Value that anybody changes.
class Value {
 public:
  enum class Kind : std::uint8_t { absent, boolean, integer, real, string, data, date, array, dictionary };

  constexpr Value() noexcept = default;
  Value(bool boolean) noexcept;
  template <class Integer>
  requires(std::is_integral_v<Integer> && !std::is_same_v<Integer, bool> && !std::is_same_v<Integer, char>)
      Value(Integer number)
  noexcept : Value(Number{static_cast<std::uint64_t>(number), number < Integer{}}) {}
  Value(double number) noexcept;
  Value(Date date) noexcept;
  Value(std::string_view text);
  Value(const std::string& text) : Value(std::string_view(text)) {}
  Value(const char* text) : Value(std::string_view(text)) {}

  static Value makeData(BytesView bytes);
  static Value makeArray();
  static Value makeDictionary();

  Value(const Value& other);
  Value(Value&& other);
  Value& operator=(const Value& other);
  Value& operator=(Value&& other);
  constexpr ~Value() {
    if (_owning) release();
  }

  Kind kind() const noexcept { return _kind; }
  bool isAbsent() const noexcept { return _kind == Kind::absent; }

  std::optional<bool> boolean() const noexcept {
    return _kind == Kind::boolean ? std::optional(_payload.bits != 0) : std::nullopt;
  }
  /// Integers only; nothing for those above the signed 64-bit range.
  std::optional<std::int64_t> integer() const noexcept {
    return isInteger() && !_unsigned ? std::optional(static_cast<std::int64_t>(_payload.bits)) : std::nullopt;
  }
  /// Integers only; nothing for negative ones.
  std::optional<std::uint64_t> unsignedInteger() const noexcept {
    bool negative = !_unsigned && static_cast<std::int64_t>(_payload.bits) < 0;
    return isInteger() && !negative ? std::optional(_payload.bits) : std::nullopt;
  }
  std::optional<double> real() const noexcept {
    return _kind == Kind::real ? std::optional(_payload.real) : std::nullopt;
  }
  std::optional<Date> date() const noexcept {
    return _kind == Kind::date ? std::optional(Date{_payload.real}) : std::nullopt;
  }
  /// UTF-8. Borrowed: valid as long as this Value is neither changed nor gone.
  std::optional<std::string_view> string() const noexcept {
    return _kind == Kind::string ? std::optional(bytes()) : std::nullopt;
  }
  /// Borrowed like string().
  std::optional<BytesView> data() const noexcept { return _kind == Kind::data ? std::optional(bytes()) : std::nullopt; }
  /// Null when the value is of another kind. Borrowed from this Value.
  const Array* array() const noexcept { return _kind == Kind::array ? _payload.array : nullptr; }
  Array* array() noexcept { return _kind == Kind::array ? _payload.array : nullptr; }
  const Dictionary* dictionary() const noexcept { return _kind == Kind::dictionary ? _payload.dictionary : nullptr; }
  Dictionary* dictionary() noexcept { return _kind == Kind::dictionary ? _payload.dictionary : nullptr; }

  /// How a flag of a property-list entry reads: a boolean says it itself, a number is true unless it is 0,
  /// everything else (text included) is false.
  bool boolValue() const noexcept;

  /// Same kind and same content; the order of a dictionary's entries does not matter.
  friend bool operator==(const Value& one, const Value& other) noexcept;

 private:
  friend class Array;
  friend class Dictionary;
  friend class ValueBuilder;

  struct Number {
    std::uint64_t bits;
    bool negative;
  };
  explicit Value(Number number) noexcept;
  /// What a container holds: bytes and containers lie in the container's arena, so there is nothing to free.
  Value(Kind kind, std::string_view bytes) noexcept : _kind(kind), _length(static_cast<std::uint32_t>(bytes.size())) {
    _payload.bytes = bytes.empty() ? "" : bytes.data();
  }
  explicit Value(Array* array) noexcept;
  explicit Value(Dictionary* dictionary) noexcept;

  static Value own(Kind kind, std::string_view bytes);
  std::string_view bytes() const noexcept { return {_payload.bytes, _length}; }
  bool isInteger() const noexcept { return _kind == Kind::integer; }
  bool holdsBytes() const noexcept { return _kind == Kind::string || _kind == Kind::data; }
  void take(Value& other) noexcept;
  void release() noexcept;
  Value copiedInto(Arena& arena) const;
  void recycleInto(Arena& arena) const noexcept;
  void ownContainer(Arena& arena);

  Kind _kind = Kind::absent;
  bool _owning = false;    // this Value frees what _payload points to
  bool _unsigned = false;  // an integer above the signed range
  std::uint32_t _length = 0;
  union Payload {
    std::uint64_t bits = 0;
    double real;
    const char* bytes;
    Array* array;
    Dictionary* dictionary;
  } _payload;
};
static_assert(sizeof(Value) == 16);

/// The elements of an array value, in order. Reached through a Value only.
class Array {
 public:
  std::size_t size() const noexcept { return _size; }
  bool empty() const noexcept { return _size == 0; }
  /// Absent beyond the end.
  const Value& operator[](std::size_t index) const noexcept;
  const Value* begin() const noexcept { return _values; }
  const Value* end() const noexcept { return _values + _size; }

  /// The container at the place, to be changed in place; null when there is none of that kind. Throws std::bad_alloc.
  Array* array(std::size_t index);
  Dictionary* dictionary(std::size_t index);

  void reserve(std::size_t count);
  /// Copies deeply. An absent value is not appended.
  void append(const Value& value);
  /// Appends an empty container and answers it.
  Dictionary& appendDictionary();

 private:
  friend class Value;
  friend class Dictionary;
  friend class ValueBuilder;

  explicit Array(Arena* arena) noexcept : _arena(arena) {}
  Value* place();

  Arena* _arena;
  Value* _values = nullptr;
  std::uint32_t _size = 0;
  std::uint32_t _capacity = 0;
};

/// The entries of a dictionary value, in the order in which their keys were first set.
/// Finding a key takes expected constant time at any size. Reached through a Value only.
class Dictionary {
 public:
  struct Entry {
    std::string_view key;
    Value value;
  };

  std::size_t size() const noexcept { return _size; }
  bool empty() const noexcept { return _size == 0; }
  const Entry* begin() const noexcept { return _entries; }
  const Entry* end() const noexcept { return _entries + _size; }

  /// Absent when there is no such key.
  const Value& operator[](std::string_view key) const noexcept;
  bool contains(std::string_view key) const noexcept;

  /// The container under the key, to be changed in place; null when there is none of that kind. Throws std::bad_alloc.
  Array* array(std::string_view key);
  Dictionary* dictionary(std::string_view key);

  /// Copies deeply. Replaces an older value in its place; an absent value removes the entry.
  void set(std::string_view key, const Value& value);
  /// Keeps the order of the other entries. True when there was such a key.
  bool remove(std::string_view key);

 private:
  friend class Value;
  friend class Array;
  friend class ValueBuilder;

  static constexpr std::size_t linearLimit = 64;

  explicit Dictionary(Arena* arena) noexcept : _arena(arena) {}
  std::size_t find(std::string_view key) const noexcept;
  void makeRoom();
  void recycle() const noexcept;
  std::optional<std::size_t> buildIndex(std::size_t count);
  void shiftIndex(std::size_t from, std::size_t to, int by) noexcept;

  Arena* _arena;
  Entry* _entries = nullptr;
  std::uint32_t _size = 0;
  std::uint32_t _capacity = 0;        // places from _entries on
  DictionaryIndex* _index = nullptr;  // null as long as the entries are few
};

}  // namespace platform
