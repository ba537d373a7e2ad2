#include "record/Show.h"

#include <set>
#include <unordered_map>

#include "record/replaying/Story.h"
#include "record/stream/CallText.h"
#include "record/stream/EventReader.h"

namespace record {

namespace {

std::string lineOf(const Event& event, const OperationName& name) {
  switch (event.kind) {
    case EventKind::call:
      return "> " + callLine(name, event.payload);
    case EventKind::enter:
      return "< " + callLine(name, event.payload);
    case EventKind::answer:
    case EventKind::leave:
      return "= " + resultLine(name, event.payload);
    default:
      return "! " + name.service + "." + name.name + " throws " + itemText(event.payload);
  }
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
    const bool opens = event.kind == EventKind::call || event.kind == EventKind::enter;
    std::size_t& depth = depths[event.thread];
    if (!opens && depth > 0) --depth;
    write(std::to_string(event.number) + " " + reader.threads()[event.thread] + " " + std::string(2 * depth, ' ') +
          lineOf(event, reader.operations()[event.operation]));
    if (opens) ++depth;
    ++facts.events;
  }
  facts.threads = reader.threads().size();
  facts.isWhole = reader.isWhole();
  facts.problem = reader.problem();
  facts.apps.assign(apps.begin(), apps.end());
  return facts;
}

}  // namespace record
