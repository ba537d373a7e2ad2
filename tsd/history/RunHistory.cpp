#include "tsd/history/RunHistory.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <string_view>
#include <system_error>
#include <utility>

#include "device/boundary/Journal.h"
#include "tsd/CommandError.h"
#include "tsd/history/KeptRun.h"
#include "tsd/terminal/Output.h"

namespace tsd {

namespace {

/// A summary holds the command's arguments and one message, a line of the journal brief values.
constexpr std::size_t longestSummary = std::size_t{4} << 20;
constexpr std::size_t longestLine = std::size_t{1} << 20;
constexpr std::size_t blockSize = std::size_t{64} << 10;

/// "0017-sync"
std::optional<RunSummary> runOfFolder(const std::string& name) {
  RunSummary run;
  auto [end, problem] = std::from_chars(name.data(), name.data() + name.size(), run.number);
  if (problem != std::errc() || end == name.data() + name.size() || *end != '-') return std::nullopt;
  run.folder = std::string(runsFolder) + '/' + name;
  run.command = end + 1;
  return run;
}

bool isMissing(const platform::ErrorRef& error) { return error && error->code() == ENOENT; }

/// Why the summary cannot be read; empty when it can, or there is none.
std::string readSummary(RunSummary& run) {
  platform::ErrorRef error;
  const std::string path = run.folder + "/run.json";
  auto file = run.files->openForReading(path, &error);
  auto text = file ? file->read(longestSummary + 1, &error) : std::nullopt;
  if (!text) return isMissing(error) ? "" : textOf(error);
  if (text->size() > longestSummary) return path + ": too long for the summary of a run";
  const platform::Value summary = device::valueOfJson(*text);
  const auto* entries = summary.dictionary();
  if (!entries) return path + ": not the summary of a run";
  if (const auto* arguments = (*entries)["arguments"].array()) {
    for (const auto& argument : *arguments) run.arguments.emplace_back(argument.string().value_or(""));
  }
  run.began = (*entries)["began"].string().value_or("");
  if (auto ended = (*entries)["ended"].string()) run.ended = *ended;
  run.result = (*entries)["result"].string().value_or("");
  run.counts = OutcomeCounts::ofDocument((*entries)["counts"]);
  run.message = (*entries)["message"].string().value_or("");
  if (auto code = (*entries)["exitCode"].integer()) run.exitCode = static_cast<int>(*code);
  return {};
}

/// In time that does not grow with how often the text's first character occurs, as it does in a search of the standard
/// library: a journal is many megabytes of quotation marks.
bool contains(std::string_view line, std::string_view text) {
  return ::memmem(line.data(), line.size(), text.data(), text.size()) != nullptr;
}

/// Calls `each` with every line of one of the run's files; none when it is not there.
template <class Each>
void readLines(const RunSummary& run, const char* name, Each&& each) {
  platform::ErrorRef error;
  auto file = run.files->openForReading(run.folder + name, &error);
  if (!file && isMissing(error)) return;
  std::string text;
  bool passesOver = false;  // the rest of a line that is too long
  while (file) {
    auto block = file->read(blockSize, &error);
    if (!block) break;
    if (block->empty()) return;
    text += *block;
    std::size_t begin = 0;
    for (std::size_t end; (end = text.find('\n', begin)) != std::string::npos; begin = end + 1) {
      if (!std::exchange(passesOver, false)) each(std::string_view(text).substr(begin, end - begin));
    }
    text.erase(0, begin);
    if (text.size() > longestLine) {
      passesOver = true;
      text.clear();
    }
  }
  throw CommandError(run.device + textOf(error));
}

/// Every app of the run's outcomes whose line has the text in it.
template <class Each>
void readOutcomes(const RunSummary& run, const std::string& text, Each&& each) {
  readLines(run, "/apps.jsonl", [&](std::string_view line) {
    if (!contains(line, text)) return;
    const platform::Value value = device::valueOfJson(line);
    const auto* fields = value.dictionary();
    auto field = [&](const char* key) { return std::string((*fields)[key].string().value_or("")); };
    auto outcome = fields ? outcomeNamed(field("outcome")) : std::nullopt;
    if (outcome) each(AppOutcome{field("id"), field("name"), field("version"), *outcome, field("reason")});
  });
}

}  // namespace

const char* wordsOfNoEnd(const RunSummary& run) { return run.isRunning ? "still running" : "killed"; }

std::string endOf(const RunSummary& run) {
  if (!run.ended) return wordsOfNoEnd(run);
  return run.exitCode ? wordsOfEnd(static_cast<ExitCode>(*run.exitCode)) : run.result;
}

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

std::vector<RunSummary> keptRuns(const std::string& device, const TellProblem& tell) {
  std::vector<RunSummary> found;
  auto say = [&](const std::string& problem) {
    if (tell) tell(device + problem);
  };
  platform::ErrorRef error;
  std::shared_ptr<device::FileTree> files = device::openDiskFileTree(device, &error);
  auto entries = files ? files->list(runsFolder, &error) : std::nullopt;
  if (!entries && files && !isMissing(error)) say(textOf(error));
  if (!entries) return found;
  for (const auto& entry : *entries) {
    auto run = entry.isDirectory ? runOfFolder(entry.name) : std::nullopt;
    if (!run) continue;
    run->files = files;
    run->device = device;
    if (std::string problem = readSummary(*run); !problem.empty()) say(problem);
    found.push_back(std::move(*run));
  }
  std::sort(found.begin(), found.end(), [](const auto& one, const auto& other) { return one.number < other.number; });
  return found;
}

bool readJournal(const RunSummary& run, const std::vector<std::string>& texts,
                 const std::function<void(const device::CallRecord& record)>& each) {
  bool isCut = false;
  readLines(run, "/calls.jsonl", [&](std::string_view line) {
    auto isIn = [&line](const std::string& text) { return contains(line, text); };
    if (line == KeptRun::lastLineOfJournal) isCut = true;
    if (std::none_of(texts.begin(), texts.end(), isIn)) return;
    if (auto record = device::parseJournalLine(line)) each(*record);
  });
  return isCut;
}

}  // namespace tsd
