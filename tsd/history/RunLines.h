#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "device/files/FileTree.h"

namespace tsd {

/// A text file of a kept run that many lines are written to. A line is with the system when `write` returns, so that it
/// is there even when the process dies next. One thread at a time.
class RunLines {
 public:
  /// At most `room` bytes; then `lastLine`, and nothing more.
  RunLines(std::unique_ptr<device::FileWriter> file, std::uint64_t room, std::string lastLine)
      : _file(std::move(file)), _room(room), _lastLine(std::move(lastLine)) {}

  /// The line is one: it has no line ends in it. A failure is only remembered.
  void write(std::string_view line);
  /// Whether a line could not be written, for want of room on the disk. From any thread.
  bool failed() const { return _failed; }

 private:
  const std::unique_ptr<device::FileWriter> _file;
  std::uint64_t _room;
  const std::string _lastLine;
  std::string _whole;  // a line with its end, its memory kept
  bool _full = false;
  std::atomic<bool> _failed = false;
};

}  // namespace tsd
