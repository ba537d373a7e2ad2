#pragma once

#include <cstddef>
#include <optional>
#include <string_view>

namespace plist {

constexpr std::size_t base64Size(std::size_t bytes) { return (bytes + 2) / 3 * 4; }
/// Writes base64Size(bytes.size()) characters.
void writeBase64(std::string_view bytes, char* at);

/// How many bytes the text stands for; white space does not count. Nothing if it is not base64 with its padding.
std::optional<std::size_t> base64Bytes(std::string_view text);
/// Writes the bytes of valid text.
void readBase64(std::string_view text, char* at);

}  // namespace plist
