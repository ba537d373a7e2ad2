#pragma once

#include <string>

#include "tsd/picture/HomePages.h"

namespace tsd {

/// A picture of the home screen in signs, 80 columns wide at most: pages with four apps in a row, below each what it
/// is, and what the signs mean.
std::string homeInText(const HomePages& home, const std::string& title);

}  // namespace tsd
