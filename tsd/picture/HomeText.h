#pragma once

#include <string>

#include "tsd/picture/HomePages.h"

namespace tsd {

/// A picture of the home screen in characters, at most 80 columns wide: pages with four apps in a row, below each app
/// its state, and a legend.
std::string homeInText(const HomePages& home, const std::string& title);

}  // namespace tsd
