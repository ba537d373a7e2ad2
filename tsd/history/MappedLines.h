#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "device/files/FileDescriptor.h"

namespace tsd {

/// A text file for many lines, written through mapped memory: the system has a line when `write` returns, so that it
/// survives the death of the process, and yet costs no system call. Until the file is closed it ends with zero bytes;
/// `trim` removes those that a killed process left. One thread at a time.
class MappedLines {
 public:
  /// At most `room` bytes; then `lastLine`, and nothing more. Replaces an older file. Throws a `CommandError` that
  /// names it.
  MappedLines(const std::string& path, std::uint64_t room, std::string lastLine);
  /// Closes the file at the end of what was written.
  ~MappedLines();
  MappedLines(const MappedLines&) = delete;
  MappedLines& operator=(const MappedLines&) = delete;

  /// The line must not contain line ends. A failure is only remembered.
  void write(std::string_view line);
  /// Whether a line could not be written, for want of room on the disk. From any thread.
  bool failed() const { return _failed; }

  /// Removes the zero bytes at the end of a file that was not closed. Ignores failures.
  static void trim(const std::string& path);

 private:
  void append(std::string_view bytes);
  bool mapNext();

  device::FileDescriptor _file;
  const std::uint64_t _most;
  const std::string _lastLine;
  char* _chunk = nullptr;    // mapped; null before the first line, and after a failure
  std::uint64_t _begin = 0;  // of the chunk in the file
  std::size_t _used = 0;     // bytes of the chunk
  bool _full = false;
  std::atomic<bool> _failed = false;
};

}  // namespace tsd
