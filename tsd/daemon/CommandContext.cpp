#include "tsd/daemon/CommandContext.h"

namespace tsd {

void CommandContext::report(std::string_view text, ExitCode code) const {
  if (!options.quiet) return writeOutput(text);
  if (code == ExitCode::done || text.empty()) return;
  text.remove_suffix(text.back() == '\n' ? 1 : 0);
  // A line that was wrapped goes on with an indented one.
  auto begin = text.rfind('\n');
  while (begin != text.npos && begin > 0 && text[begin + 1] == ' ') begin = text.rfind('\n', begin - 1);
  console.message(begin == text.npos ? text : text.substr(begin + 1));
}

}  // namespace tsd
