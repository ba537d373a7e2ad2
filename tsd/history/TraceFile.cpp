#include "tsd/history/TraceFile.h"

#include <algorithm>

#include "device/boundary/JournalValue.h"
#include "device/boundary/JsonText.h"

namespace tsd {

using std::chrono::microseconds;
using Kind = AppEvent::Kind;

namespace {

// What an app goes through, in this order; a later stage ends those before it.
constexpr int stagePrepare = 1;
constexpr int stagePlaceholder = 2;
constexpr int stageReady = 3;
constexpr int stageTransfer = 4;
constexpr int stageInstall = 5;

/// The name of a stage that lasts; nothing for one that is only the end of the stage before.
const char* nameOfStage(int stage) {
  switch (stage) {
    case stagePrepare:
      return "prepare";
    case stagePlaceholder:
      return "placeholder";
    case stageTransfer:
      return "transfer";
    case stageInstall:
      return "install";
    default:
      return nullptr;
  }
}

/// The stage that an event begins; 0: none.
int stageOf(Kind kind) {
  switch (kind) {
    case Kind::preparing:
    case Kind::restoring:
      return stagePrepare;
    case Kind::shown:
      return stageReady;
    case Kind::transferring:
      return stageTransfer;
    case Kind::arrived:
      return stageInstall;
    default:
      return 0;
  }
}

bool endsApp(Kind kind) {
  switch (kind) {
    case Kind::installed:
    case Kind::failed:
    case Kind::cancelled:
    case Kind::preparationFailed:
    case Kind::restoreFailed:
    case Kind::transferFailed:
      return true;
    default:
      return false;
  }
}

void addFact(std::string& facts, const char* name, const platform::Value& value) {
  if (value.isAbsent()) return;
  facts += facts.empty() ? "\"" : ",\"";
  facts += name;
  facts += "\":";
  device::appendJson(facts, value);
}

std::string factsOf(const device::CallRecord& record) {
  std::string facts;
  addFact(facts, "n", platform::Value(record.number));
  if (!record.app.empty()) addFact(facts, "app", platform::Value(record.app));
  if (!record.end && !record.argumentNames.empty()) addFact(facts, "arguments", record.arguments);
  addFact(facts, "result", record.result);
  addFact(facts, "error", device::journalValueOfError(record.error));
  return facts;
}

std::string factsOf(const AppEvent& event) {
  std::string facts;
  addFact(facts, "what", platform::Value(event.line()));
  return facts;
}

}  // namespace

TraceFile::TraceFile(const std::string& path)
    : _file(path), _story([this](const AppEvent& event) { hearEvent(event); }) {
  nameTrack(Group::apps, 0, "process_name", "apps");
  nameTrack(Group::threads, 0, "process_name", "threads");
}

TraceFile::~TraceFile() {
  for (auto* tracks : {&_apps, &_threads}) {
    for (auto& [name, track] : *tracks) {
      while (track.open) end(track, _now, "");
    }
  }
  _file.write("]");
}

void TraceFile::hear(const device::CallRecord& record) {
  _now = std::max(_now, record.time);
  _story.hear(record);
  if (!record.app.empty()) hearStep(record);
  Track& track = trackOf(_threads, Group::threads, record.thread);
  if (record.service == "log") {
    const auto* arguments = record.arguments.dictionary();
    auto text = arguments ? (*arguments)["text"].string() : std::nullopt;
    if (text) instant(track, record.time, *text, factsOf(record));
  } else if (record.service != "AppsClient") {
    whole(track, record, factsOf(record));
  } else if (record.end) {
    if (track.open) end(track, record.time, factsOf(record));
  } else {
    begin(track, record.time, record.operation, factsOf(record));
  }
}

TraceFile::Track& TraceFile::trackOf(Tracks& tracks, Group group, const std::string& name) {
  auto [place, isNew] = tracks.try_emplace(name, Track{group, tracks.size() + 1});
  if (isNew) nameTrack(group, place->second.number, "thread_name", name);
  return place->second;
}

void TraceFile::hearEvent(const AppEvent& event) {
  if (event.app.empty()) return;
  Track& track = trackOf(_apps, Group::apps, event.app);
  int stage = stageOf(event.kind);
  if (stage > track.stage)
    enterStage(track, stage, event.app, event.time, factsOf(event));
  else if (endsApp(event.kind))
    endApp(track, event);
  else
    instant(track, event.time, event.text, factsOf(event));
}

/// The calls that say more about an app than the story does.
void TraceFile::hearStep(const device::CallRecord& record) {
  bool isPlaceholder = record.operation == "makeAppPlaceholder";
  if (!isPlaceholder && record.service != "InstallTransactionLog") return;
  Track& track = trackOf(_apps, Group::apps, record.app);
  if (isPlaceholder) {
    if (track.stage == stagePrepare) enterStage(track, stagePlaceholder, record.app, record.time, factsOf(record));
    return;
  }
  const auto* arguments = record.arguments.dictionary();
  auto description = arguments ? (*arguments)["description"].string() : std::nullopt;
  instant(track, record.time, description.value_or("step"), factsOf(record));
}

void TraceFile::enterStage(Track& track, int stage, std::string_view app, microseconds time, const std::string& facts) {
  // The outermost slice covers the app's whole way.
  if (track.open == 0) begin(track, time, app, "");
  while (track.open > 1) end(track, time, "");
  track.stage = stage;
  if (const char* name = nameOfStage(stage)) begin(track, time, name, facts);
}

void TraceFile::endApp(Track& track, const AppEvent& event) {
  instant(track, event.time, event.text, factsOf(event));
  while (track.open) end(track, event.time, factsOf(event));
  track.stage = 0;
}

void TraceFile::begin(Track& track, microseconds time, std::string_view name, const std::string& facts) {
  track.last = std::max(track.last, time);
  ++track.open;
  write(track, "B", track.last, name, facts.empty() ? "" : ",\"args\":{" + facts + "}");
}

void TraceFile::end(Track& track, microseconds time, const std::string& facts) {
  track.last = std::max(track.last, time);
  --track.open;
  write(track, "E", track.last, "", facts.empty() ? "" : ",\"args\":{" + facts + "}");
}

void TraceFile::instant(Track& track, microseconds time, std::string_view name, const std::string& facts) {
  write(track, "i", std::max(track.last, time), name, ",\"s\":\"t\",\"args\":{" + facts + "}");
}

/// The record of a call to a service comes when the call has returned.
void TraceFile::whole(Track& track, const device::CallRecord& record, const std::string& facts) {
  auto began = std::max(track.last, record.began);
  auto took = std::max(microseconds(0), record.time - began);
  write(track, "X", began, record.operation,
        ",\"dur\":" + std::to_string(took.count()) + ",\"cat\":\"" + record.service + "\",\"args\":{" + facts + "}");
}

void TraceFile::write(const Track& track, const char* phase, microseconds time, std::string_view name,
                      const std::string& rest) {
  std::string line = _isFirst ? "[" : ",";
  _isFirst = false;
  line += std::string("{\"ph\":\"") + phase + "\",\"pid\":" + std::to_string(static_cast<int>(track.group)) +
          ",\"tid\":" + std::to_string(track.number) + ",\"ts\":" + std::to_string(time.count());
  if (!name.empty()) {
    line += ",\"name\":";
    device::appendJsonString(line, name);
  }
  _file.write(line + rest + "}");
}

void TraceFile::nameTrack(Group group, std::size_t track, const char* what, std::string_view name) {
  std::string facts;
  addFact(facts, "name", platform::Value(name));
  write({group, track}, "M", microseconds(0), what, ",\"args\":{" + facts + "}");
}

}  // namespace tsd
