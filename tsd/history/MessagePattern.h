#pragma once

#include <string_view>
#include <vector>

namespace tsd {

/// Whether the text matches the pattern, in which each "{}" stands for any text, the shortest that fits. `captured`
/// becomes the texts of these gaps, borrowed from the text.
bool matches(std::string_view text, std::string_view pattern, std::vector<std::string_view>& captured);

}  // namespace tsd
