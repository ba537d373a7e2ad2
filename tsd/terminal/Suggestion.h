#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace tsd {

/// The choice that a word was most likely meant to be, whatever its case; empty when none is near.
std::string nearestOf(std::string_view word, const std::vector<std::string>& choices);

/// "; did you mean 'status'?", or nothing when no choice is near, or the word is one of them.
std::string didYouMean(std::string_view word, const std::vector<std::string>& choices);

}  // namespace tsd
