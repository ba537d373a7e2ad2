#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace record {

/// What a recording is about.
struct RecordingFacts {
  std::uint64_t events = 0;
  std::uint64_t threads = 0;
  bool isWhole = false;           // it was ended in order; otherwise it was cut
  std::vector<std::string> apps;  // that are named in it, sorted
  std::string problem;            // why it cannot be read on; empty: it can
};

/// A recording as lines for people, one for each call, its answer and its return: the event's number, the thread, which
/// way it goes, and what goes over. What the plug-in calls while it is called stands behind more spaces.
RecordingFacts show(std::string_view recording, const std::function<void(std::string_view line)>& write);

}  // namespace record
