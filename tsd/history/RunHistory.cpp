#include "tsd/history/RunHistory.h"

#include <algorithm>
#include <charconv>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <system_error>

#include "device/boundary/Journal.h"

namespace tsd {

namespace fs = std::filesystem;

namespace {

/// "0017-sync"
std::optional<RunSummary> runOfFolder(const fs::path& folder) {
  std::string name = folder.filename().string();
  RunSummary run;
  auto [end, problem] = std::from_chars(name.data(), name.data() + name.size(), run.number);
  if (problem != std::errc() || end == name.data() + name.size() || *end != '-') return std::nullopt;
  run.folder = folder.string();
  run.command = end + 1;
  return run;
}

void readSummary(RunSummary& run) {
  std::ifstream file(run.folder + "/run.json", std::ios::binary);
  const std::string text{std::istreambuf_iterator<char>(file), {}};
  const platform::Value summary = device::valueOfJson(text);
  const auto* entries = summary.dictionary();
  if (!entries) return;
  if (const auto* arguments = (*entries)["arguments"].array()) {
    for (const auto& argument : *arguments) run.arguments.emplace_back(argument.string().value_or(""));
  }
  run.began = (*entries)["began"].string().value_or("");
  if (auto ended = (*entries)["ended"].string()) run.ended = *ended;
  run.result = (*entries)["result"].string().value_or("");
  run.counts = OutcomeCounts::ofDocument((*entries)["counts"]);
  run.message = (*entries)["message"].string().value_or("");
  if (auto code = (*entries)["exitCode"].integer()) run.exitCode = static_cast<int>(*code);
}

/// Every app of the run's outcomes whose line has the text in it.
template <class Each>
void readOutcomes(const RunSummary& run, const std::string& text, Each&& each) {
  std::ifstream file(run.folder + "/apps.jsonl", std::ios::binary);
  std::string line;
  while (std::getline(file, line)) {
    if (line.find(text) == std::string::npos) continue;
    const platform::Value value = device::valueOfJson(line);
    const auto* fields = value.dictionary();
    auto field = [&](const char* key) { return std::string((*fields)[key].string().value_or("")); };
    auto outcome = fields ? outcomeNamed(field("outcome")) : std::nullopt;
    if (outcome) each(AppOutcome{field("id"), field("name"), field("version"), *outcome, field("reason")});
  }
}

}  // namespace

std::optional<AppOutcome> outcomeIn(const RunSummary& run, const std::string& app) {
  std::optional<AppOutcome> found;
  readOutcomes(run, device::jsonText(platform::Value(app)), [&](AppOutcome outcome) {
    if (outcome.id == app) found = std::move(outcome);
  });
  return found;
}

std::vector<AppOutcome> outcomesIn(const RunSummary& run) {
  std::vector<AppOutcome> apps;
  readOutcomes(run, "", [&](AppOutcome outcome) { apps.push_back(std::move(outcome)); });
  return apps;
}

std::vector<RunSummary> keptRuns(const std::string& runs) {
  std::vector<RunSummary> found;
  std::error_code problem;
  for (fs::directory_iterator entry(runs, problem), end; !problem && entry != end; entry.increment(problem)) {
    auto run = runOfFolder(entry->path());
    if (!run) continue;
    readSummary(*run);
    found.push_back(std::move(*run));
  }
  std::sort(found.begin(), found.end(), [](const auto& one, const auto& other) { return one.number < other.number; });
  return found;
}

void readJournal(const RunSummary& run, const std::vector<std::string>& texts,
                 const std::function<void(const device::CallRecord& record)>& each) {
  std::ifstream file(run.folder + "/calls.jsonl", std::ios::binary);
  std::string line;
  while (std::getline(file, line)) {
    if (!line.empty() && line.front() == '\0') break;  // the run is still going on
    auto isIn = [&line](const std::string& text) { return line.find(text) != std::string::npos; };
    if (std::none_of(texts.begin(), texts.end(), isIn)) continue;
    if (auto record = device::parseJournalLine(line)) each(*record);
  }
}

}  // namespace tsd
