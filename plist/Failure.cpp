#include "plist/Failure.h"

namespace plist {

platform::ErrorRef failure(ErrorCode code, std::string description) {
  return platform::makeError(errorDomain, static_cast<std::int64_t>(code), std::move(description));
}

platform::ErrorRef tooDeep() {
  return failure(ErrorCode::tooDeep, "containers more than " + std::to_string(maximumDepth) + " deep");
}

std::string quoted(std::string_view text) {
  constexpr std::size_t longest = 60;
  bool cut = text.size() > longest;
  if (cut) {
    text = text.substr(0, longest);
    while (!text.empty() && (text.back() & 0xc0) == 0x80) text.remove_suffix(1);
    if (!text.empty() && (text.back() & 0x80)) text.remove_suffix(1);
  }
  std::string result = "\"";
  for (char character : text) result += static_cast<unsigned char>(character) < 0x20 ? '?' : character;
  return result += cut ? "…\"" : "\"";
}

}  // namespace plist
