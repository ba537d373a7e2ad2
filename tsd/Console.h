#pragma once

#include <cstddef>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace tsd {

/// Text from elsewhere, made harmless for a terminal: control characters and broken UTF-8 become '?'.
std::string printable(std::string_view text);
/// Columns that a text takes on a terminal, one for each character.
std::size_t columnsOf(std::string_view text);
/// `printable(text)` in exactly `columns` columns: filled up with spaces, or cut with "…" at its end.
std::string fitted(std::string_view text, std::size_t columns);

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
  /// Replaces the lines that are redrawn in place; none takes them away.
  void setRegion(std::vector<std::string> lines);
  /// The region's lines stay where they are as ordinary lines.
  void keepRegion();

  struct Size {
    std::size_t rows;
    std::size_t columns;
  };
  static bool isTerminal();
  static Size size();

 private:
  std::string eraseRegion() const;
  std::string drawRegion() const;

  std::mutex _mutex;
  std::vector<std::string> _region;  // guarded by _mutex
};

/// Writes to standard output; throws a `CommandError` when that fails.
void writeOutput(std::string_view text);

}  // namespace tsd
