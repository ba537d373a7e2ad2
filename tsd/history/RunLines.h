#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "device/files/FileTree.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace tsd {

/// A text file of a kept run that many lines are written to. They are gathered, so that a line costs no call of the
/// system; what is not handed over when the process dies is lost. Callable from any thread.
class RunLines {
 public:
  /// At most `room` bytes; then `lastLine`, and nothing more.
  RunLines(std::unique_ptr<device::FileWriter> file, std::uint64_t room, std::string lastLine)
      : _file(std::move(file)), _room(room), _lastLine(std::move(lastLine)) {}

  ~RunLines() { handOver(); }
  RunLines(const RunLines&) = delete;
  RunLines& operator=(const RunLines&) = delete;

  /// The line is one: it has no line ends in it. A failure is only remembered.
  void write(std::string_view line) noexcept;
  /// The lines written so far are with the system when it returns.
  void handOver() noexcept;
  /// Whether a line could not be written, for want of room on the disk.
  bool failed() const { return _failed; }

 private:
  void handOverGathered() REQUIRES(_mutex);

  platform::Mutex _mutex;
  const std::unique_ptr<device::FileWriter> _file PT_GUARDED_BY(_mutex);
  std::uint64_t _room GUARDED_BY(_mutex);
  const std::string _lastLine;
  std::string _gathered GUARDED_BY(_mutex);  // whole lines
  bool _full GUARDED_BY(_mutex) = false;
  std::atomic<bool> _failed = false;
};

}  // namespace tsd
