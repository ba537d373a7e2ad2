#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"
#include "tsd/terminal/TerminalText.h"

namespace tsd {

/// Standard error: messages above, and below them, on a terminal, a few lines that are redrawn in place.
/// From any thread; never fails.
class Console {
 public:
  Console() = default;
  Console(const Console&) = delete;
  Console& operator=(const Console&) = delete;

  /// One line, whole.
  void line(std::string_view text);
  /// "tsd: " and the text, one line.
  void message(std::string_view text);
  /// Whoever finds something wrong says it by this: a message.
  std::function<void(const std::string& problem)> problems() {
    return [this](const std::string& problem) { message(problem); };
  }
  /// Replaces the lines that are redrawn in place; an empty list removes them. The terminal cuts lines that are too
  /// wide; it may have become narrower since the last time.
  void setRegion(std::vector<TerminalLine> lines);

  struct Size {
    std::size_t rows;
    std::size_t columns;
  };
  static bool isTerminal();
  /// Whether the person wants colours on a terminal.
  static bool wantsColours();
  static Size size();

 private:
  std::string toRegionsBegin() const REQUIRES(_mutex);
  std::string drawRegion() const REQUIRES(_mutex);

  platform::Mutex _mutex;
  std::vector<TerminalLine> _region GUARDED_BY(_mutex);
};

/// Writes to standard output; throws a `CommandError` when that fails.
void writeOutput(std::string_view text);

}  // namespace tsd
