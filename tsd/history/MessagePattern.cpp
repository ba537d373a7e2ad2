#include "tsd/history/MessagePattern.h"

namespace tsd {

bool matches(std::string_view text, std::string_view pattern, std::vector<std::string_view>& captured) {
  constexpr std::string_view gap = "{}";
  captured.clear();
  std::size_t next = pattern.find(gap);
  if (text.substr(0, next) != pattern.substr(0, next)) return false;
  while (next != std::string_view::npos) {
    text.remove_prefix(next);
    pattern.remove_prefix(next + gap.size());
    next = pattern.find(gap);
    std::string_view literal = pattern.substr(0, next);
    // A gap at the pattern's end reaches to the end of the text.
    std::size_t end = next != std::string_view::npos ? text.find(literal)
                      : text.size() < literal.size() ? std::string_view::npos
                                                     : text.size() - literal.size();
    if (end == std::string_view::npos || text.substr(end, literal.size()) != literal) return false;
    captured.push_back(text.substr(0, end));
    text.remove_prefix(end);
  }
  return true;
}

}  // namespace tsd
