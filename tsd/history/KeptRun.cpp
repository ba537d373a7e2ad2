#include "tsd/history/KeptRun.h"

#include <chrono>
#include <csignal>
#include <cstdio>
#include <exception>
#include <utility>

#include "device/boundary/Journal.h"
#include "tsd/CommandError.h"
#include "tsd/StartThread.h"
#include "tsd/history/LineFile.h"
#include "tsd/history/LogLine.h"
#include "tsd/history/RunHistory.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::ErrorRef;
using platform::Value;

/// For whoever looks at a run while it waits.
constexpr auto handOverTime = std::chrono::milliseconds(100);

KeptRun::KeptRun(const std::string& device, const CommonOptions& options, Console& console)
    : _options(options), _console(console), _device(device), _began(currentTimeText()) {
  try {
    makeFolder();
    writeSummary(nullptr);
    _calls.emplace(newFile("/calls.jsonl"), mostBytes, lastLineOfJournal);
    _log.emplace(newFile("/log"), mostBytes, "the log is cut off here because it has become too long");
    _thread = startThread([this] { handOverNowAndThen(); });
  } catch (const std::exception& problem) {
    tell(problem.what());
  }
}

KeptRun::~KeptRun() {
  {
    platform::Mutex::Lock lock(_mutex);
    _over = true;
    _changed.notifyAll();
  }
  if (_thread.joinable()) _thread.join();
}

void KeptRun::handOver() noexcept {
  if (_calls) _calls->handOver();
  if (_log) _log->handOver();
}

void KeptRun::handOverNowAndThen() {
  sigset_t signals;
  ::sigfillset(&signals);
  ::pthread_sigmask(SIG_BLOCK, &signals, nullptr);  // they are for whoever stops the command
  platform::Mutex::Lock lock(_mutex);
  while (!_over) {
    _changed.waitFor(_mutex, handOverTime);
    lock.unlock();
    handOver();
    lock.lock();
  }
}

void KeptRun::require(bool done, const ErrorRef& error) const {
  if (!done) throw CommandError(_device + textOf(error));
}

void KeptRun::makeFolder() {
  ErrorRef error;
  _files = device::openDiskFileTree(_device, &error);
  if (!_files) throw CommandError(textOf(error));
  auto kept = keptRuns(_device, [this](const std::string& problem) { tell(problem); });
  for (std::size_t i = 0; i + most <= kept.size(); ++i) {
    bool removed = _files->removeItem(kept[i].folder, &error);
    require(removed, error);
  }
  char number[24];
  std::snprintf(number, sizeof number, "%04llu", (kept.empty() ? 0ULL : kept.back().number) + 1ULL);
  std::string folder = std::string(runsFolder) + "/" + number + "-" + _options.command;
  bool made =
      _files->createDirectory(runsFolder, true, {}, &error) && _files->createDirectory(folder, false, {}, &error);
  require(made, error);
  _folder = std::move(folder);
}

std::unique_ptr<device::FileWriter> KeptRun::newFile(const char* name) const {
  ErrorRef error;
  auto file = _files->createNew(_folder + name, false, &error);
  require(file != nullptr, error);
  return file;
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
  ErrorRef error;
  bool written = _files->putFile(_folder + "/run.json", device::jsonText(summary) + '\n', {}, &error);
  require(written, error);
}

void KeptRun::conclude(const std::vector<AppOutcome>& apps, const std::string& message) {
  _counts = OutcomeCounts(apps);
  _message = message;
  if (_folder.empty() || apps.empty()) return;
  try {
    std::string lines;
    const Value document = documentOf(apps);
    for (const auto& app : *document.array()) lines += device::jsonText(app) + '\n';
    ErrorRef error;
    bool written = _files->putFile(_folder + "/apps.jsonl", lines, {}, &error);
    require(written, error);
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
  handOver();
  if ((_calls && _calls->failed()) || (_log && _log->failed()))
    tell(_device + _folder + ": not every line could be written");
}

void KeptRun::tell(const std::string& problem) {
  if (!std::exchange(_told, true)) _console.message("not all of this run is kept: " + problem);
}

}  // namespace tsd
