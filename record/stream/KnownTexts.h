#pragma once

#include <cstddef>
#include <deque>
#include <optional>
#include <string>
#include <string_view>

#include "platform/TextTable.h"

namespace record {

/// Texts and bytes of a middling size that a recording holds already, so that it names them instead of repeating them.
/// Writer and reader keep the same: all of them, for good.
class KnownTexts {
 public:
  static constexpr std::size_t from = 48;
  static constexpr std::size_t end = 2048;
  static constexpr std::size_t room = std::size_t{64} << 20;

  static bool isKept(std::size_t size) { return size >= from && size < end; }

  /// For a writer: the place of the text. A reader has no use for the digests.
  std::optional<std::size_t> find(std::string_view text) const;
  void add(std::string_view text, bool findable);
  std::size_t count() const { return _texts.size(); }
  const std::string& operator[](std::size_t place) const { return _texts[place]; }

 private:
  std::deque<std::string> _texts;
  std::size_t _size = 0;
  platform::BorrowedTextMap<std::size_t> _places;
};

}  // namespace record
