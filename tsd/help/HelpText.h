#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "tsd/OptionTable.h"

namespace tsd {

/// How the program ends, and what each code means.
const std::vector<ExitCodeEntry>& exitCodes();

/// The points of injection rules, sorted, with what each stands for; a name that several classes share is there by
/// itself, for all of them, and with each class.
std::vector<PointEntry> pointEntries();

/// Broken into lines for the right column of a help text on a terminal of 80 columns, or of another width.
std::string wrapped(const std::string& text, std::size_t width = 50);

/// The wrapped text on one line again.
std::string unwrapped(std::string text);

}  // namespace tsd
