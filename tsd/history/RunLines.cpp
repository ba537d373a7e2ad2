#include "tsd/history/RunLines.h"

namespace tsd {

void RunLines::write(std::string_view line) {
  if (_full || _failed) return;
  _full = line.size() + 1 > _room;
  _whole = _full ? std::string_view(_lastLine) : line;
  _whole += '\n';
  if (!_full) _room -= _whole.size();
  _failed = !_file->write(_whole);
}

}  // namespace tsd
