#pragma once

#include <string_view>

namespace tsd {

/// The files of `tsd/report/page/`, which the build embeds in the program.
extern const std::string_view reportMarkup;
extern const std::string_view reportStyle;
extern const std::string_view reportScript;

}  // namespace tsd
