#include "tsd/history/RunProgress.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cmath>
#include <cstring>

#include "device/boundary/Journal.h"
#include "device/files/FileDescriptor.h"
#include "tsd/history/RunHistory.h"

namespace tsd {
namespace {

constexpr std::size_t blockSize = std::size_t{1} << 20;
constexpr std::string_view progressCall = R"("op":"assetTransferUpdatedProgress","app":)";

/// The journal of the last sync, if that sync has not come to its end.
std::string openJournalOf(const std::string& runs) {
  auto all = keptRuns(runs);
  auto last = std::find_if(all.rbegin(), all.rend(), [](const auto& run) { return run.command == "sync"; });
  return last == all.rend() || last->ended ? "" : last->folder + "/calls.jsonl";
}

}  // namespace

bool RunProgress::refresh() {
  std::string journal = openJournalOf(_runs);
  bool changed = journal != _journal;
  if (changed) {
    _journal = std::move(journal);
    _read = 0;
    _fractions.clear();
  }
  device::FileDescriptor file(_journal.empty() ? -1 : ::open(_journal.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW));
  if (!file.isOpen()) return changed;
  std::string block;
  while (true) {
    std::size_t kept = block.size();
    block.resize(kept + blockSize);
    ssize_t count = ::pread(file.get(), block.data() + kept, blockSize, static_cast<off_t>(_read + kept));
    if (count < 0 && errno == EINTR) count = 0;
    block.resize(kept + static_cast<std::size_t>(std::max<ssize_t>(0, count)));
    // Behind the last line of a run that is still going on there are zeros.
    std::size_t end = std::min(block.find('\0', kept), block.size());
    std::string_view text = std::string_view(block).substr(0, end);
    const std::size_t lines = text.rfind('\n') + 1;  // bytes of those that are whole
    text = text.substr(0, lines);
    for (std::size_t at = text.find(progressCall); at != std::string_view::npos; at = text.find(progressCall, at + 1)) {
      std::size_t begin = text.rfind('\n', at) + 1;
      take(text.substr(begin, text.find('\n', at) - begin));
    }
    changed = changed || lines > 0;
    _read += lines;
    if (end < block.size() || count <= 0) return changed;
    block.erase(0, lines);
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
