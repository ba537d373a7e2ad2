#include "tsd/terminal/Suggestion.h"

#include <algorithm>
#include <cstddef>
#include <utility>

namespace tsd {

namespace {

// Words longer than any name that people type are not compared: the time is the product of the lengths.
constexpr std::size_t longestWord = 256;

char folded(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }

/// The number of letters inserted, left out, replaced, or swapped with their neighbour.
std::size_t distanceOf(std::string_view one, std::string_view other) {
  std::vector<std::size_t> beforeLast, last(other.size() + 1), row(other.size() + 1);
  for (std::size_t j = 0; j <= other.size(); ++j) last[j] = j;
  for (std::size_t i = 1; i <= one.size(); ++i) {
    row[0] = i;
    for (std::size_t j = 1; j <= other.size(); ++j) {
      bool same = folded(one[i - 1]) == folded(other[j - 1]);
      row[j] = std::min({last[j] + 1, row[j - 1] + 1, last[j - 1] + (same ? 0 : 1)});
      bool swapped =
          i > 1 && j > 1 && folded(one[i - 1]) == folded(other[j - 2]) && folded(one[i - 2]) == folded(other[j - 1]);
      if (swapped) row[j] = std::min(row[j], beforeLast[j - 2] + 1);
    }
    beforeLast = std::exchange(last, row);
  }
  return last[other.size()];
}

}  // namespace

std::string nearestOf(std::string_view word, const std::vector<std::string>& choices) {
  std::string nearest;
  std::size_t least = 0;
  for (const auto& choice : choices) {
    std::size_t limit = std::max<std::size_t>(choice.size() < 3 ? 0 : 1, choice.size() / 5);
    std::size_t longer = std::max(word.size(), choice.size()), shorter = std::min(word.size(), choice.size());
    if (longer > longestWord || longer - shorter > limit) continue;
    std::size_t distance = distanceOf(word, choice);
    if (distance > limit || (!nearest.empty() && distance >= least)) continue;
    nearest = choice;
    least = distance;
  }
  return nearest;
}

std::string didYouMean(std::string_view word, const std::vector<std::string>& choices) {
  std::string nearest = nearestOf(word, choices);
  return nearest.empty() || nearest == word ? "" : "; did you mean '" + nearest + "'?";
}

}  // namespace tsd
