#pragma once

#include <functional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <unordered_set>

#include "platform/TextHash.h"

namespace platform {

/// Tables whose keys are texts from outside. The standard library's own hash has no secret, so somebody could make keys
/// that all collide in it. A string_view finds an entry without being copied.
template <class Content>
using TextMap = std::unordered_map<std::string, Content, TextHasher, std::equal_to<>>;
using TextSet = std::unordered_set<std::string, TextHasher, std::equal_to<>>;

/// The same for keys that lie elsewhere and outlive the table.
template <class Content>
using BorrowedTextMap = std::unordered_map<std::string_view, Content, TextHasher, std::equal_to<>>;
using BorrowedTextSet = std::unordered_set<std::string_view, TextHasher, std::equal_to<>>;

}  // namespace platform
