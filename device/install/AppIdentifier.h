#pragma once

#include <algorithm>
#include <string_view>

namespace device {

/// Whether the text can be an app's identifier: not empty, no longer than a file name may be, without "/" and control
/// characters.
inline bool isAppIdentifier(std::string_view text) {
  // With ".app" appended it is the name of a placeholder's bundle.
  if (text.empty() || text == "." || text == ".." || text.size() > 251) return false;
  return std::none_of(text.begin(), text.end(), [](char c) {
    return c == '/' || c == '\\' || static_cast<unsigned char>(c) < 0x20 || c == 0x7f;
  });
}

}  // namespace device
