#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace tsd {

/// Text from elsewhere, made harmless for a terminal: control characters and broken UTF-8 become '?'.
std::string printable(std::string_view text);
/// The columns of a printable text on a terminal: two for each wide character, none for a combining mark.
std::size_t columnsOf(std::string_view text);
/// `printable(text)` in exactly `columns` columns: padded with spaces, or cut with "…" at its end.
std::string fitted(std::string_view text, std::size_t columns);
/// The same, cut with "…" at its front: an identifier differs from others at its end.
std::string fittedToEnd(std::string_view text, std::size_t columns);

/// A line for a terminal, put together from parts, some of them in colour.
class TerminalLine {
 public:
  enum class Colour { none, dim, good, bad, busy };

  explicit TerminalLine(bool colours) : _colours(colours) {}
  /// `text` is printable.
  void add(std::string_view text, Colour colour = Colour::none);

  const std::string& text() const { return _text; }  // with the terminal's codes in it
  std::size_t columns() const { return _columns; }

 private:
  bool _colours;
  std::string _text;
  std::size_t _columns = 0;
};

}  // namespace tsd
