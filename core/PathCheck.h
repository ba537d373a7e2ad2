#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/Value.h"

namespace appsync {

/// Whether a name from outside may become part of a path: true for a string without "/..".
inline bool isSafePathComponent(std::optional<std::string_view> text) {
  return text && text->find("/..") == std::string_view::npos;
}
inline bool isSafePathComponent(const std::optional<std::string>& text) {
  return text && isSafePathComponent(std::string_view(*text));
}
inline bool isSafePathComponent(const platform::Value& value) { return isSafePathComponent(value.string()); }

/// The parts joined by a slash.
inline std::string joinedPath(std::string_view directory, std::string_view name) {
  return std::string(directory).append("/").append(name);
}

}  // namespace appsync
