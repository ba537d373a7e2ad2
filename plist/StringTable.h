#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

#include "platform/TextHash.h"

namespace plist {

/// Numbers different strings from 0 on, in the order in which they come. The strings' bytes must stay.
class StringTable {
 public:
  StringTable();

  struct Number {
    std::uint32_t number;
    bool isNew;
  };
  Number number(std::string_view text);
  /// Gives back the memory for finding strings. No string can be numbered after that.
  void complete() { _slots = {}; }

  std::size_t size() const noexcept { return _strings.size(); }
  std::string_view operator[](std::size_t number) const noexcept {
    return {_strings[number].bytes, _strings[number].size};
  }

 private:
  struct String {
    const char* bytes;
    std::uint32_t size;
    std::uint32_t hash;
  };

  void grow();

  platform::TextHashKey _hashKey;
  std::uint32_t _mask;
  std::vector<std::uint32_t> _slots;  // open-addressed, at most half full: number + 1, or 0
  std::vector<String> _strings;
};

}  // namespace plist
