#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "platform/Value.h"
#include "tsd/CommonOptions.h"
#include "tsd/ExitCode.h"

namespace tsd {

/// The beginning of a command's JSON document: its schema number and, unless empty, the command's name.
platform::Value startDocument(std::string_view command);
/// Writes the document to standard output.
void writeDocument(const platform::Value& document);
/// The document of a command that could not go on.
void writeFailure(const CommonOptions& options, ExitCode code, std::string_view message);

/// The result in a document: "done", "partial" (some apps failed, or a deadline passed), "failed" or "cancelled".
const char* nameOfResult(ExitCode code);
/// The same for people: "done", "not complete", "failed" or "cancelled".
std::string wordsOfEnd(ExitCode code);

/// A length of time: "4.27 s", "3 min 8 s", "1 h 2 min".
std::string durationText(double seconds);
/// "2024-02-29 12:34:56" of "2024-02-29T12:34:56.789Z".
std::string dayAndTime(const std::string& moment);

/// An array of strings.
platform::Value arrayOf(const std::vector<std::string>& texts);

/// An error's one-line description without its domain and code if words follow them; the plug-in's own codes, which
/// have no description, in words.
std::string reasonForPeople(std::string_view description);

/// The columns of the terminal on standard output, 80 if it is not a terminal.
std::size_t lineWidth();
/// The front and the text on a line no wider than that, followed by as many more lines as the text needs, indented by
/// the front's width as far as that leaves room. The front is printable.
std::string wrappedLine(const std::string& front, std::string_view text);
/// The same, but in one line if standard output is not a terminal, so that it can be searched; further lines are
/// indented a little.
std::string noteLine(const std::string& front, std::string_view text);

/// A table for people: columns as wide as their content, the whole no wider than a line (see `wrappedLine`) as long as
/// the columns that may be shortened allow it.
class Table {
 public:
  struct Column {
    std::string title;
    std::size_t least = 0;             // may be shortened to this width; 0: never
    bool keepsEnd = false;             // its front is what goes
    bool isWholeElsewhere = keepsEnd;  // shortened on a terminal alone: others look for the whole of it
  };
  explicit Table(std::vector<Column> columns) : _columns(std::move(columns)) {}
  void add(std::vector<std::string> cells) { _rows.push_back(std::move(cells)); }
  bool empty() const { return _rows.empty(); }
  std::string text() const;

 private:
  std::vector<std::size_t> widths() const;

  std::vector<Column> _columns;
  std::vector<std::vector<std::string>> _rows;
};

}  // namespace tsd
