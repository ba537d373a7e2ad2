#pragma once

#include <cstddef>
#include <optional>
#include <string_view>

namespace plist {

constexpr std::size_t base64Size(std::size_t bytes) { return (bytes + 2) / 3 * 4; }
/// Writes base64Size(bytes.size()) characters.
void writeBase64(std::string_view bytes, char* at);

/// What readBase64() has to have room for.
constexpr std::size_t base64Room(std::string_view text) { return text.size() / 4 * 3 + text.size() % 4; }
/// Writes the bytes that the text stands for and answers how many there are; white space does not count. Nothing if it
/// is not base64 with its padding.
std::optional<std::size_t> readBase64(std::string_view text, char* to);

}  // namespace plist
