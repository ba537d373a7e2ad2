#include "tsd/history/KeptRun.h"

#include <cstdio>
#include <exception>
#include <filesystem>
#include <utility>

#include "device/boundary/Journal.h"
#include "tsd/history/LineFile.h"
#include "tsd/history/LogLine.h"
#include "tsd/history/RunHistory.h"
#include "tsd/terminal/Output.h"

namespace tsd {

namespace fs = std::filesystem;
using platform::Value;

KeptRun::KeptRun(const std::string& device, const CommonOptions& options, Console& console)
    : _options(options), _console(console), _began(currentTimeText()) {
  try {
    makeFolder(device + "/runs");
    writeSummary(nullptr);
    _calls.emplace(_folder + "/calls.jsonl", mostBytes,
                   R"({"note":"the journal is cut off here, as it has become too long"})");
    _log.emplace(_folder + "/log", mostBytes, "the log is cut off here because it has become too long");
  } catch (const std::exception& problem) {
    tell(problem.what());
  }
}

void KeptRun::makeFolder(const std::string& runs) {
  auto kept = keptRuns(runs);
  for (std::size_t i = 0; i + most <= kept.size(); ++i) fs::remove_all(kept[i].folder);
  for (const auto& run : kept) {
    if (run.ended) continue;
    MappedLines::trim(run.folder + "/calls.jsonl");
    MappedLines::trim(run.folder + "/log");
  }
  fs::create_directories(runs);
  char number[24];
  std::snprintf(number, sizeof number, "%04llu", (kept.empty() ? 0ULL : kept.back().number) + 1ULL);
  std::string folder = runs + "/" + number + "-" + _options.command;
  fs::create_directory(folder);
  _folder = std::move(folder);
}

void KeptRun::hear(const device::CallRecord& record) {
  if (!_calls) return;
  _line.clear();
  device::appendJournalLine(_line, record);
  _calls->write(_line);
}

void KeptRun::hear(const device::LogRecord& record) {
  if (_log) _log->write(logLine(record));
}

void KeptRun::writeSummary(const ExitCode* code) const {
  Value summary = startDocument(_options.command);
  auto& entries = *summary.dictionary();
  entries.set("arguments", arrayOf(_options.arguments));
  entries.set("began", _began);
  if (code) {
    entries.set("ended", currentTimeText());
    entries.set("result", nameOfResult(*code));
    entries.set("exitCode", static_cast<int>(*code));
    if (_counts.total() != 0) entries.set("counts", _counts.document());
    if (!_message.empty()) entries.set("message", _message);
  }
  std::string path = _folder + "/run.json";
  std::string unfinished = path + ".new";
  LineFile file(unfinished);
  file.write(device::jsonText(summary));
  if (file.failed()) throw fs::filesystem_error("not every line could be written", unfinished, std::error_code());
  fs::rename(unfinished, path);
}

void KeptRun::conclude(const std::vector<AppOutcome>& apps, const std::string& message) {
  _counts = OutcomeCounts(apps);
  _message = message;
  if (_folder.empty() || apps.empty()) return;
  try {
    LineFile file(_folder + "/apps.jsonl");
    const Value document = documentOf(apps);
    for (const auto& app : *document.array()) file.write(device::jsonText(app));
    if (file.failed()) tell(_folder + "/apps.jsonl: not every line could be written");
  } catch (const std::exception& problem) {
    tell(problem.what());
  }
}

void KeptRun::end(ExitCode code, const std::string& message) {
  if (_folder.empty()) return;
  if (!message.empty()) _message = message;
  try {
    writeSummary(&code);
  } catch (const std::exception& problem) {
    tell(problem.what());
  }
  if ((_calls && _calls->failed()) || (_log && _log->failed())) tell(_folder + ": not every line could be written");
}

void KeptRun::tell(const std::string& problem) {
  if (!std::exchange(_told, true)) _console.message("not all of this run is kept: " + problem);
}

}  // namespace tsd
