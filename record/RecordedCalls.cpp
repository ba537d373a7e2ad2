#include "record/RecordedCalls.h"

#include <set>
#include <unordered_map>
#include <utility>
#include <vector>

#include "record/RecordingError.h"
#include "record/replaying/Story.h"
#include "record/stream/CallText.h"
#include "record/stream/EventReader.h"
#include "record/stream/Item.h"

namespace record {

using platform::ErrorRef;
using platform::Value;

namespace {

ErrorRef errorIn(ItemReader& items) {
  items.error();
  std::string domain(items.text());
  const auto code = items.signedNumber();
  std::string description(items.text());
  return platform::makeError(std::move(domain), code, std::move(description),
                             items.takeAbsent() ? nullptr : errorIn(items));
}

Value valueOf(const platform::Error& error) {
  auto value = Value::makeDictionary();
  value.dictionary()->set("domain", error.domain());
  value.dictionary()->set("code", error.code());
  if (!error.description().empty()) value.dictionary()->set("description", error.description());
  if (error.underlying()) value.dictionary()->set("underlying", valueOf(*error.underlying()));
  return value;
}

Value valueOf(std::string_view item) {
  ItemReader items(item);
  switch (items.peek()) {
    case Tag::absent:
      return {};
    case Tag::no:
    case Tag::yes:
      return items.boolean();
    case Tag::number:
      return items.number();
    case Tag::negative:
      return items.signedNumber();
    case Tag::real:
      return items.real();
    case Tag::text:
      return std::string(items.text());
    case Tag::data:
      return items.data().size();
    case Tag::error:
      return valueOf(*errorIn(items));
    default:
      return itemText(item);
  }
}

Value argumentsOf(const OperationName& operation, std::string_view payload) {
  auto arguments = Value::makeDictionary();
  std::string_view names(operation.parameters);
  names = names.substr(0, names.find("->"));
  for (ItemReader items(payload); !items.atEnd();) {
    const auto name = nextName(names);
    // Behind the named ones stands whether an error is asked for.
    if (name.empty()) break;
    if (auto value = valueOf(items.skip()); !value.isAbsent()) arguments.dictionary()->set(name, value);
  }
  return arguments;
}

void setAnswer(RecordedCall& call, std::string_view payload, bool threw) {
  ItemReader items(payload);
  const auto first = items.atEnd() ? std::string_view() : items.skip();
  if (threw) {
    call.error = platform::makeError("exception", 0, first.empty() ? "" : itemText(first));
    return;
  }
  if (first.empty()) return;
  call.result = valueOf(first);
  while (!items.atEnd()) {
    if (items.peek() == Tag::error)
      call.error = errorIn(items);
    else
      items.skip();
  }
}

class Reading {
 public:
  explicit Reading(const std::function<void(const RecordedCall&)>& hear) : _hear(hear) {}

  void take(const Event& event, const OperationName& operation, const std::string& thread, const std::string& app) {
    auto& open = _open[event.thread];
    if (event.kind == EventKind::enter) _time = event.time;
    if (opens(event.kind)) {
      RecordedCall call{.thread = thread, .service = operation.service, .operation = operation.name, .app = app};
      call.of = classOf(operation);
      call.intoPlugin = event.kind == EventKind::enter;
      call.arguments = argumentsOf(operation, event.payload);
      if (call.intoPlugin) tell(call, event);
      open.push_back(std::move(call));
    } else if (!open.empty()) {
      RecordedCall call = std::move(open.back());
      open.pop_back();
      call.end = call.intoPlugin;
      if (call.end) call.arguments = Value::makeDictionary();
      setAnswer(call, event.payload, event.kind == EventKind::threw || event.kind == EventKind::thrown);
      tell(call, event);
    }
  }

 private:
  void tell(RecordedCall& call, const Event& event) {
    call.number = event.number;
    call.time = _time;
    _hear(call);
  }

  const std::function<void(const RecordedCall&)>& _hear;
  std::uint64_t _time = 0;
  std::unordered_map<std::uint32_t, std::vector<RecordedCall>> _open;  // by thread
};

}  // namespace

RecordingFacts readCalls(std::string_view recording, const std::function<void(const RecordedCall&)>& hear) {
  RecordingFacts facts;
  EventReader reader(recording);
  Story story(reader);
  Reading reading(hear);
  std::set<std::string> apps;
  Event event;
  while (reader.next(event)) {
    ++facts.events;
    if (event.kind == EventKind::end) continue;
    const auto app = story.appOf(event);
    if (!app.empty()) apps.insert(app);
    try {
      reading.take(event, reader.operations()[event.operation], reader.threads()[event.thread], app);
    } catch (const RecordingError& error) {
      facts.problem = "event " + std::to_string(event.number) + ": " + error.what();
      break;
    }
  }
  facts.threads = reader.threads().size();
  facts.isWhole = reader.isWhole();
  if (facts.problem.empty()) facts.problem = reader.problem();
  facts.apps.assign(apps.begin(), apps.end());
  return facts;
}

}  // namespace record
