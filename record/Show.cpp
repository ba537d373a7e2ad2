#include "record/Show.h"

#include <set>
#include <unordered_map>

#include "record/replaying/Story.h"
#include "record/stream/CallText.h"
#include "record/stream/EventReader.h"

namespace record {

namespace {

std::string lineOf(const Event& event, const OperationName& name) {
  const auto sign = [&] {
    if (opens(event.kind)) return event.kind == EventKind::call ? "> " : "< ";
    return event.kind == EventKind::answer || event.kind == EventKind::leave ? "= " : "! ";
  };
  return sign() + eventLine(event.kind, name, event.payload);
}

}  // namespace

RecordingFacts show(std::string_view recording, const std::function<void(std::string_view)>& write) {
  RecordingFacts facts;
  EventReader reader(recording);
  Story story(reader);
  std::set<std::string> apps;
  std::unordered_map<std::uint32_t, std::size_t> depths;
  Event event;
  while (reader.next(event)) {
    if (auto app = story.appOf(event); !app.empty()) apps.insert(std::move(app));
    std::size_t& depth = depths[event.thread];
    if (!opens(event.kind) && depth > 0) --depth;
    write(std::to_string(event.number) + " " + reader.threads()[event.thread] + " " + std::string(2 * depth, ' ') +
          lineOf(event, reader.operations()[event.operation]));
    if (opens(event.kind)) ++depth;
    ++facts.events;
  }
  facts.threads = reader.threads().size();
  facts.isWhole = reader.isWhole();
  facts.problem = reader.problem();
  facts.apps.assign(apps.begin(), apps.end());
  return facts;
}

}  // namespace record
