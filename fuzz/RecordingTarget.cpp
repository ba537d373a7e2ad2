// What is compressed in a recording: read in both ways, shown, and told to the plug-in.

#include <cstdint>
#include <string>

#include "fuzz/RecordingStream.h"
#include "fuzz/Require.h"
#include "record/Replay.h"
#include "record/Show.h"
#include "record/stream/Comparison.h"
#include "record/stream/EventReader.h"
#include "tsd/daemon/PluginLoader.h"

namespace {

using fuzz::require;
using record::Event;
using record::EventReader;

/// Both readings are the same; answers how many events there are.
std::size_t requireOneMeaning(const std::string& recording) {
  EventReader within(recording), apart(recording, EventReader::Large::apart);
  Event event, beside;
  std::size_t events = 0;
  while (within.next(event)) {
    require(apart.next(beside), "as many events");
    require(event.kind == beside.kind && event.thread == beside.thread && event.operation == beside.operation,
            "the same event");
    require(event.payload == record::wholePayload(beside), "the same items");
    ++events;
  }
  require(!apart.next(beside), "as many events");
  require(within.problem() == apart.problem() && within.isWhole() == apart.isWhole(), "the same end");
  require(within.problem().empty() || !within.isWhole(), "whole or wrong");
  return events;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const tsd::PluginLoader plugin{SHIPPED_PLUGIN};
  const std::string recording = fuzz::recordingOf({reinterpret_cast<const char*>(data), size});
  const std::size_t events = requireOneMeaning(recording);
  const auto facts =
      record::show(recording, [](std::string_view line) { require(line.size() < 4096, "a short line"); });
  require(facts.events == events, "every event is shown");

  const auto make = [](const platform::Platform& platform) { return plugin.create(platform); };
  for (bool goOn : {false, true}) {
    const auto result = record::replay(recording, make, {.goOn = goOn});
    require(!result.isStuck, "a replay that ends");
    require(result.events <= events, "no more than there is");
    require(!result.isWhole || (result.problem.empty() && facts.isWhole), "whole or wrong");
  }
  return 0;
}
