#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

#include "platform/TextHash.h"

namespace plist {

/// Numbers different strings and data from 0 on, in the order in which they come. Their bytes must stay.
class StringTable {
 public:
  StringTable();

  enum class Kind : std::uint8_t { string, data };
  struct Number {
    std::uint32_t number;
    bool isNew;
  };
  Number number(Kind kind, std::string_view text);
  /// One that is taken for different from all others. No string is looked for after that.
  Number add(Kind kind, std::string_view text);
  /// Gives back the memory for finding strings. No string can be numbered after that.
  void complete() { _slots = {}; }

  std::size_t size() const noexcept { return _strings.size(); }
  Kind kindOf(std::size_t number) const noexcept { return static_cast<Kind>(_strings[number].hash & 1); }
  std::string_view operator[](std::size_t number) const noexcept {
    return {_strings[number].bytes, _strings[number].size};
  }

 private:
  struct String {
    const char* bytes;
    std::uint32_t size;
    std::uint32_t hash;  // with the kind for its last bit
  };

  void grow();

  platform::TextHashKey _hashKey;
  std::uint32_t _mask;
  std::vector<std::uint32_t> _slots;  // open-addressed, at most half full: number + 1, or 0
  std::vector<String> _strings;
};

}  // namespace plist
