#pragma once

#include <array>
#include <cstdint>
#include <deque>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/Error.h"
#include "platform/Value.h"
#include "plist/StringTable.h"

namespace plist {

/// Writes one binary document.
///
/// A first pass counts: it numbers the strings and data, finds the sizes of everything, and whatever cannot be written.
/// The second one writes into a block of the right size, first the strings and data, then the other objects, each
/// container after what it holds. So the outermost value is the last object. Lists may be long, so each table goes as
/// soon as nothing needs it, and before the output it would lie beside.
class BinaryWriter {
 public:
  /// Whether equal strings and equal data are one object.
  explicit BinaryWriter(bool shares) : _shares(shares) {}

  /// Nothing, with the error set, when the value has no binary form.
  std::optional<platform::Bytes> write(const platform::Value& value, platform::ErrorRef& error);

 private:
  /// What a dictionary had at some place. The entries of a list mostly have the same keys in the same order, and often
  /// the same texts under them.
  struct Last {
    std::string_view text;
    std::uint32_t number = 0;
    bool isKnown = false;
  };

  bool isReadable(std::size_t size) const;
  bool count(const platform::Value& value, std::size_t depth);
  bool countItems(const platform::Array& items, std::size_t depth);
  bool countEntries(const platform::Dictionary& entries, std::size_t depth);
  bool addText(StringTable::Kind kind, std::string_view text);
  bool countString(std::string_view text);
  bool countAgain(std::string_view text, Last& last);
  bool countContainer(std::size_t items, std::size_t references, std::size_t depth);
  void countObject(std::size_t size);

  void writeStrings();
  void writeStringOffsets();
  std::uint32_t writeValue(const platform::Value& value);
  std::uint32_t writeArray(const platform::Array& array);
  std::uint32_t writeDictionary(const platform::Dictionary& dictionary);
  void writeInteger(const platform::Value& value);
  void writeMarker(unsigned kind, std::uint64_t count);
  void writeBytes(std::string_view bytes);
  void writeTrailer(std::uint32_t top);
  std::uint32_t beginObject();

  const bool _shares;
  std::optional<StringTable> _strings{std::in_place};
  // Of every key, string and data, in the order of both passes. In pieces: there are too many of them to be moved
  // about.
  std::deque<std::uint32_t> _stringNumbers;
  static constexpr std::size_t places = 64;  // by depth and place
  std::array<Last, places> _lastKeys, _lastTexts;
  std::size_t _objects = 0;
  std::size_t _references = 0;
  std::size_t _text = 0;  // bytes of strings and data, at all their places
  std::size_t _stringsSize = 0;
  std::size_t _size = 0;  // of the other objects, without references

  std::deque<std::uint32_t>::const_iterator _nextString;
  std::uint32_t _nextObject = 0;
  std::vector<std::uint32_t> _pending;  // the numbers that containers being written will refer to
  unsigned _referenceSize = 0;
  unsigned _offsetSize = 0;
  char* _begin = nullptr;
  char* _at = nullptr;
  char* _offsets = nullptr;
  platform::ErrorRef _error;
};

}  // namespace plist
