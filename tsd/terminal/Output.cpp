#include "tsd/terminal/Output.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <cstdio>

#include "device/boundary/Journal.h"
#include "tsd/CommandError.h"
#include "tsd/terminal/Console.h"

namespace tsd {

using platform::Value;

namespace {

constexpr std::size_t ordinaryWidth = 80;
constexpr std::size_t leastWidth = 20;
constexpr std::size_t noteIndent = 2;

}  // namespace

std::size_t lineWidth() {
  struct winsize size {};
  if (::ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return ordinaryWidth;
  return std::max<std::size_t>(size.ws_col, leastWidth);
}

namespace {

/// Lines of at most `width` columns, broken between words; all but the first are indented.
std::string wrappedTo(std::size_t width, const std::string& front, std::string_view text, std::size_t indent) {
  std::string result;
  std::string line = front;
  bool isEmpty = true;
  std::size_t start = 0;
  std::string whole = printable(text);
  while (start <= whole.size()) {
    std::size_t end = std::min(whole.find(' ', start), whole.size());
    std::string word = whole.substr(start, end - start);
    if ((!isEmpty || columnsOf(line) > indent) && columnsOf(line) + (isEmpty ? 0 : 1) + columnsOf(word) > width) {
      line.erase(line.find_last_not_of(' ') + 1);
      result += line + "\n";
      line = std::string(indent, ' ');
      isEmpty = true;
    }
    line += (isEmpty ? "" : " ") + word;
    isEmpty = false;
    start = end + 1;
  }
  return result + line + "\n";
}

}  // namespace

Value startDocument(std::string_view command) {
  Value document = Value::makeDictionary();
  document.dictionary()->set("schema", 1);
  if (!command.empty()) document.dictionary()->set("command", command);
  return document;
}

void writeDocument(const Value& document) { writeOutput(device::jsonText(document, 2) + "\n"); }

void writeFailure(const CommonOptions& options, ExitCode code, std::string_view message) {
  Value document = startDocument(options.command);
  document.dictionary()->set("result", "failed");
  Value error = Value::makeDictionary();
  error.dictionary()->set("exitCode", static_cast<int>(code));
  error.dictionary()->set("message", message);
  document.dictionary()->set("error", error);
  try {
    writeDocument(document);
  } catch (const CommandError&) {
    // The failure is reported on standard error, and most likely it is this very one.
  }
}

const char* nameOfResult(ExitCode code) {
  switch (code) {
    case ExitCode::done:
      return "done";
    case ExitCode::someFailed:
    case ExitCode::deadline:
      return "partial";
    case ExitCode::cancelled:
      return "cancelled";
    default:
      return "failed";
  }
}

std::string wordsOfEnd(ExitCode code) {
  std::string name = nameOfResult(code);
  return name == "partial" ? "not complete" : name;
}

std::string durationText(double seconds) {
  char text[48];
  const auto whole = static_cast<long long>(std::llround(seconds));
  if (seconds < 60)
    std::snprintf(text, sizeof text, "%.2f s", seconds);
  else if (whole < 3600)
    std::snprintf(text, sizeof text, "%lld min %lld s", whole / 60, whole % 60);
  else
    std::snprintf(text, sizeof text, "%lld h %lld min", whole / 3600, whole / 60 % 60);
  return text;
}

std::string dayAndTime(const std::string& moment) {
  std::string text = moment.substr(0, 19);
  std::replace(text.begin(), text.end(), 'T', ' ');
  return text;
}

Value arrayOf(const std::vector<std::string>& texts) {
  Value array = Value::makeArray();
  array.array()->reserve(texts.size());
  for (const auto& each : texts) array.array()->append(each);
  return array;
}

std::string reasonForPeople(std::string_view description) {
  if (description == "TSError 1") return "its install could not be prepared";
  if (description == "TSError 29") return "its restore could not be prepared";
  if (description == "TSError 30") return "its package never came";
  std::size_t colon = description.find(": ");
  std::string_view front = description.substr(0, colon);
  std::size_t space = front.rfind(' ');
  bool isCode = colon != std::string_view::npos && space != std::string_view::npos && front.find(' ') == space &&
                front.find_first_not_of("-0123456789", space + 1) == std::string_view::npos;
  return std::string(isCode ? description.substr(colon + 2) : description);
}

std::string wrappedLine(const std::string& front, std::string_view text) {
  std::size_t width = lineWidth();
  std::size_t begin = columnsOf(front);
  return wrappedTo(width, front, text, begin * 2 > width ? noteIndent * 2 : begin);
}

std::string noteLine(const std::string& front, std::string_view text) {
  if (::isatty(STDOUT_FILENO) == 0) return front + printable(text) + "\n";
  return wrappedTo(lineWidth(), front, text, noteIndent);
}

std::vector<std::size_t> Table::widths() const {
  constexpr std::size_t gap = 2;
  std::vector<std::size_t> widths;
  std::size_t total = gap * (_columns.size() - 1);
  for (std::size_t column = 0; column < _columns.size(); ++column) {
    std::size_t widest = columnsOf(_columns[column].title);
    for (const auto& row : _rows) widest = std::max(widest, columnsOf(printable(row[column])));
    widths.push_back(widest);
    total += widest;
  }
  const std::size_t width = lineWidth();
  const bool isTerminal = ::isatty(STDOUT_FILENO) != 0;
  while (total > width) {
    std::size_t widest = _columns.size();
    for (std::size_t column = 0; column < _columns.size(); ++column) {
      bool mayShrink = _columns[column].least && widths[column] > _columns[column].least &&
                       (isTerminal || !_columns[column].isWholeElsewhere);
      if (mayShrink && (widest == _columns.size() || widths[column] > widths[widest])) widest = column;
    }
    if (widest == _columns.size()) break;
    --widths[widest];
    --total;
  }
  return widths;
}

std::string Table::text() const {
  auto columns = widths();
  std::string text;
  auto appendRow = [&](auto cell) {
    std::string line;
    for (std::size_t column = 0; column < columns.size(); ++column) {
      line += (_columns[column].keepsEnd ? fittedToEnd : fitted)(cell(column), columns[column]) + "  ";
    }
    line.erase(line.find_last_not_of(' ') + 1);
    text += line + "\n";
  };
  appendRow([&](std::size_t column) { return _columns[column].title; });
  for (const auto& row : _rows) appendRow([&](std::size_t column) { return row[column]; });
  return text;
}

}  // namespace tsd
