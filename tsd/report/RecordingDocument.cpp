#include "tsd/report/RecordingDocument.h"

#include <array>

#include "platform/Plugin.h"
#include "tsd/CommandError.h"
#include "tsd/history/LineFile.h"
#include "tsd/report/ReportApps.h"
#include "tsd/report/ReportJournal.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;
using record::OperationClass;
using record::RecordedCall;

device::CallRecord journalRecordOf(const RecordedCall& call) {
  device::CallRecord record;
  record.number = call.number;
  record.time = std::chrono::microseconds(call.time);
  record.thread = call.thread;
  record.service = call.intoPlugin ? "AppsClient" : call.service;
  record.operation = call.operation;
  record.app = call.app;
  record.arguments = call.arguments;
  record.result = call.result;
  record.error = call.error;
  record.end = call.end;
  if (call.of != OperationClass::message) return record;
  const auto& arguments = *call.arguments.dictionary();
  record.service = "log";
  record.operation = arguments["level"].integer().value_or(0) == 0 ? "default" : "error";
  record.arguments = Value::makeDictionary();
  record.arguments.dictionary()->set("text", arguments["message"]);
  return record;
}

bool isPreparation(const RecordedCall& call) { return call.of == OperationClass::message && call.operation != "write"; }

namespace {

struct Reading {
  void hear(const RecordedCall& call) {
    if (isPreparation(call)) return;
    if (call.intoPlugin)
      operations += call.end ? 0 : 1;
    else
      ++calls[static_cast<std::size_t>(call.of)];
    const auto record = journalRecordOf(call);
    apps.hear(record);
    journal.hear(record);
  }
  std::string count(OperationClass of) const { return std::to_string(calls[static_cast<std::size_t>(of)]); }

  ReportApps apps;
  ReportJournal journal;
  std::size_t operations = 0;
  std::array<std::size_t, 4> calls{};  // by class
};

Value valueOfFacts(const Reading& reading, const record::RecordingFacts& facts) {
  Value list = Value::makeArray();
  auto add = [&](const char* name, const std::string& value) { list.array()->append(pairOf(name, value)); };
  add("Recorded", facts.isWhole ? "to the end" : "up to where it is cut");
  add("Events", std::to_string(facts.events));
  add("Threads", std::to_string(facts.threads));
  add("Calls into the plug-in", std::to_string(reading.operations));
  add("Calls to services", reading.count(OperationClass::service));
  add("Messages", reading.count(OperationClass::message));
  add("Transaction records", reading.count(OperationClass::step));
  return list;
}

}  // namespace

Value recordingDocument(const std::string& name, std::string_view recording, const std::string& version) {
  Reading reading;
  const auto facts = record::readCalls(recording, [&](const RecordedCall& call) { reading.hear(call); });
  if (!facts.problem.empty()) throw CommandError(name + ": " + facts.problem);
  Value document = Value::makeDictionary();
  auto& entries = *document.dictionary();
  entries.set("device", name);
  entries.set("title", "recording");
  entries.set("made", dayAndTime(currentTimeText()) + " UTC");
  entries.set("maker", "tsd " + version);
  Value run = Value::makeDictionary();
  run.dictionary()->set("result", facts.isWhole ? "recorded to the end" : "cut");
  run.dictionary()->set("micros", reading.journal.end().count());
  entries.set("run", run);
  entries.set("outcomes", toneOfOutcomes());
  const auto counts = reading.apps.counts().text();
  entries.set("sentence", counts.empty() ? "The recording tells of no app." : "What was recorded: " + counts + ".");
  entries.set("facts", valueOfFacts(reading, facts));
  entries.set("apps", reading.apps.document([](const std::string&) { return std::string(); }));
  entries.set("journal", reading.journal.document());
  entries.set("journalIsCut", false);
  Value versions = Value::makeArray();
  versions.array()->append(pairOf("Program", Value("tsd " + version)));
  versions.array()->append(pairOf("Plug-in interface", Value(std::to_string(platform::pluginInterfaceVersion))));
  entries.set("versions", versions);
  entries.set("settings", Value::makeArray());
  return document;
}

}  // namespace tsd
