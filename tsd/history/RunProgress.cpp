#include "tsd/history/RunProgress.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <utility>

#include "device/boundary/Journal.h"
#include "tsd/history/KeptRun.h"
#include "tsd/history/RunHistory.h"

namespace tsd {
namespace {

constexpr std::size_t blockSize = std::size_t{1} << 20;
constexpr std::string_view progressCall = R"("op":"assetTransferUpdatedProgress","app":)";

/// The last sync, when that has not come to its end.
std::optional<RunSummary> openRunOf(const std::string& device) {
  auto all = keptRuns(device, nullptr);
  auto last = std::find_if(all.rbegin(), all.rend(), [](const auto& run) { return run.command == "sync"; });
  if (last == all.rend() || last->ended) return std::nullopt;
  return *last;
}

}  // namespace

bool RunProgress::refresh() {
  auto run = openRunOf(_device);
  std::string journal = run ? run->folder + "/calls.jsonl" : "";
  bool changed = journal != _journal;
  if (changed) {
    _journal = std::move(journal);
    _read = 0;
    _isCut = false;
    _fractions.clear();
  }
  auto file = run ? run->files->openForReading(_journal) : nullptr;
  if (!file || !file->seek(_read)) return changed;
  std::string text;
  while (true) {
    auto block = file->read(blockSize);
    if (!block || block->empty()) return changed;
    text += *block;
    const std::size_t size = text.rfind('\n') + 1;  // of the lines that are whole
    const std::string_view lines = std::string_view(text).substr(0, size);
    for (std::size_t at = lines.find(progressCall); at != std::string_view::npos;
         at = lines.find(progressCall, at + 1)) {
      std::size_t begin = lines.rfind('\n', at) + 1;
      take(lines.substr(begin, lines.find('\n', at) - begin));
    }
    // It is the last line, and the journal is not read beyond it.
    const std::string_view cut = KeptRun::lastLineOfJournal;
    if (size > cut.size() && lines.substr(size - 1 - cut.size(), cut.size()) == cut) _isCut = true;
    changed = changed || size > 0;
    _read += size;
    text.erase(0, size);
    // No line is as long: it is not ours.
    if (text.size() > blockSize) return changed;
  }
}

void RunProgress::take(std::string_view line) {
  auto record = device::parseJournalLine(line);
  if (!record || !record->arguments.dictionary()) return;
  auto fraction = (*record->arguments.dictionary())["progress"].real();
  if (fraction && std::isfinite(*fraction)) _fractions[record->app] = std::clamp(*fraction, 0.0, 1.0);
}

std::optional<double> RunProgress::fractionOf(std::string_view app) const {
  auto found = _fractions.find(app);
  if (found == _fractions.end()) return std::nullopt;
  return found->second;
}

void RunProgress::addTo(device::DeviceStatus& status) const {
  platform::BorrowedTextMap<double> open;
  for (auto& coordinator : status.coordinators) {
    auto fraction = coordinator.promisesPackage ? fractionOf(coordinator.app) : std::nullopt;
    if (fraction) coordinator.fraction = std::max(coordinator.fraction, *fraction);
    open[coordinator.app] = coordinator.fraction;
  }
  for (auto& app : status.apps) {
    auto found = open.find(app.id);
    if (found != open.end()) app.progress = std::max(app.progress, found->second);
  }
}

}  // namespace tsd
