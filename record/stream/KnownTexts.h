#pragma once

#include <cstddef>
#include <deque>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/TextTable.h"

namespace record {

/// Texts and bytes that a recording holds already, so that it names them instead of repeating them. Writer and reader
/// keep the same. Medium ones are kept for good and found by a digest; large ones, of which a sync has many that differ
/// in one place, are compared with the last few.
class KnownTexts {
 public:
  static constexpr std::size_t mediumFrom = 48;
  static constexpr std::size_t largeFrom = 2048;
  static constexpr std::size_t slots = 8;
  static constexpr std::size_t largestKept = std::size_t{16} << 20;
  static constexpr std::size_t mediumRoom = std::size_t{64} << 20;

  static bool isMedium(std::size_t size) { return size >= mediumFrom && size < largeFrom; }
  static bool isKeptLarge(std::size_t size) { return size >= largeFrom && size <= largestKept; }

  // Medium ones. For a writer: the place of the text; a reader has no use for the digests.
  std::optional<std::size_t> find(std::string_view text) const;
  void add(std::string_view text, bool findable);
  std::size_t mediumCount() const { return _medium.size(); }
  const std::string& medium(std::size_t place) const { return _medium[place]; }

  // Large ones. Slot 0 is the one used last.
  struct Likeness {
    std::size_t slot;
    std::size_t begin;  // so many bytes are the same at the beginning
    std::size_t end;    // ... and at the end
  };
  /// The slot that the text is most like; nothing when none has half of it.
  std::optional<Likeness> like(std::string_view text) const;
  std::size_t largeCount() const { return _large.size(); }
  const std::string& large(std::size_t slot) const { return _large[slot]; }
  const std::string& use(std::size_t slot);
  const std::string& keep(std::string text);

 private:
  std::deque<std::string> _medium;
  std::size_t _mediumSize = 0;
  platform::BorrowedTextMap<std::size_t> _places;
  std::deque<std::string> _large;
};

}  // namespace record
