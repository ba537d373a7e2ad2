#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "tsd/terminal/Console.h"

namespace tsd {

/// How far an app is, as its line shows it.
struct ProgressLine {
  enum class Phase : std::uint8_t { waiting, placeholder, sending, installing, ended };

  std::string id;
  std::string name;
  Phase phase = Phase::waiting;
  int percent = 0;
  bool good = false;        // it has ended, and well
  std::string outcome;      // once it has ended
  std::string reason;       // of the outcome; may be empty
  int shownStep = 0;        // percent of the package, the last that was printed in plain mode
  std::size_t endedAs = 0;  // how many had ended with it; 0: it has not ended
};

/// "3 of 8 ended"
std::string endedOf(const std::vector<ProgressLine>& lines);
/// Percent of all together.
int percentOf(const std::vector<ProgressLine>& lines);

/// The rows for a terminal of this size: the headline, unless empty, and a line for each app. When there are more apps
/// than room, those in motion and the last that ended, a bounded number, and one line for all, with `percent`.
std::vector<TerminalLine> drawProgress(const std::string& headline, const std::vector<ProgressLine>& lines, int percent,
                                       Console::Size size, bool colours);

}  // namespace tsd
