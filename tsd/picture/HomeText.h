#pragma once

#include <string>

#include "tsd/picture/HomePages.h"

namespace tsd {

/// A picture of the home screen in characters, as wide as a line of the terminal: pages with four apps in a row, or
/// with as many as a narrow line takes, below each app its state, and a legend.
std::string homeInText(const HomePages& home, const std::string& title);

}  // namespace tsd
