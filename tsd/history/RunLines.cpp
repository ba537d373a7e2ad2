#include "tsd/history/RunLines.h"

#include <exception>

namespace tsd {

/// So much is handed over in any case.
constexpr std::size_t mostGathered = std::size_t{64} << 10;

void RunLines::write(std::string_view line) noexcept {
  platform::Mutex::Lock lock(_mutex);
  if (_full || _failed) return;
  const std::size_t whole = _gathered.size();
  try {
    _full = line.size() + 1 > _room;
    if (!_full) _room -= line.size() + 1;
    _gathered += _full ? std::string_view(_lastLine) : line;
    _gathered += '\n';
  } catch (const std::exception&) {
    _gathered.resize(whole);
    handOverGathered();
    _failed = true;
  }
  if (_gathered.size() >= mostGathered) handOverGathered();
}

void RunLines::handOver() noexcept {
  platform::Mutex::Lock lock(_mutex);
  handOverGathered();
}

void RunLines::handOverGathered() {
  if (_gathered.empty()) return;
  if (!_failed && !_file->write(_gathered)) _failed = true;
  _gathered.clear();
}

}  // namespace tsd
