#pragma once

#include <functional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <unordered_set>

#include "platform/TextHash.h"

namespace platform {

/// Tables of texts from outside. The standard library's own hash has no secret, so that texts could be made for it that
/// all collide. Found by a string_view without a copy.
template <class Content>
using TextMap = std::unordered_map<std::string, Content, TextHasher, std::equal_to<>>;
using TextSet = std::unordered_set<std::string, TextHasher, std::equal_to<>>;

/// The same of texts that lie elsewhere and outlive the table.
template <class Content>
using BorrowedTextMap = std::unordered_map<std::string_view, Content, TextHasher, std::equal_to<>>;
using BorrowedTextSet = std::unordered_set<std::string_view, TextHasher, std::equal_to<>>;

}  // namespace platform
