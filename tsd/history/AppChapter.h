#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "tsd/history/AppStory.h"
#include "tsd/history/Outcome.h"
#include "tsd/history/RunHistory.h"

namespace tsd {

/// What one kept run had to do with an app.
struct AppChapter {
  struct Line {
    std::string
        kind;  // of the event; "message" for an error message that is not an event, "person" for what no journal has
    std::string text;
    std::optional<std::chrono::microseconds> time{};  // since the device was opened
  };

  RunSummary run;
  std::optional<AppOutcome> outcome;  // as the run itself reported it
  std::vector<Line> lines;

  bool isEmpty() const { return lines.empty() && !outcome; }
  /// What became of the app, in a few words: the run's own, otherwise the last that is known.
  std::string answer() const;
};

AppChapter chapterOf(const RunSummary& run, const std::string& app);

}  // namespace tsd
