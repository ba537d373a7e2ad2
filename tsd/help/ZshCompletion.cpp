#include "tsd/help/Completion.h"

namespace tsd {
namespace {

/// With a backslash before each of the characters, and inside single quotes.
std::string quoted(const std::string& text, const char* special) {
  std::string result;
  for (char each : text) {
    if (std::string(special).find(each) != std::string::npos) result += '\\';
    result += each == '\'' ? std::string("'\\''") : std::string(1, each);
  }
  return result;
}

std::string actionOf(const OptionEntry& option) {
  if (option.takesApp()) return "_tsd_apps";
  if (option.takesRule()) return "_tsd_rules";
  if (option.takesAsset()) return "_tsd_assets";
  if (option.takesSource()) return "_tsd_sources";
  if (option.takesFile()) return "_files";
  if (option.takesFolder()) return "_files -/";
  std::string words;
  for (const auto& word : option.words) words += (words.empty() ? "" : " ") + word;
  return words.empty() ? " " : '(' + quoted(words, "") + ')';
}

std::string specsOf(const CommandEntry& command) {
  std::string text;
  int place = 0;
  for (const auto& option : command.options) {
    if (option.isArgument) {
      text += " \\\n        '" + (option.isRepeatable ? "*" : std::to_string(++place)) + ':' +
              quoted(option.value, ":") + ':' + actionOf(option) + '\'';
      continue;
    }
    for (const auto& name : option.names) {
      text += std::string(" \\\n        '") + (option.isRepeatable ? "*" : "") + name +
              (option.value.empty() || name.size() == 2 ? "" : "=") + '[' + quoted(option.description, "[]:\\") + ']';
      if (!option.value.empty()) text += ':' + quoted(option.value, ":") + ':' + actionOf(option);
      text += '\'';
    }
  }
  return text;
}

// When it is sourced, the script registers its function; as a file of completions it is the function and is called.
constexpr const char* frame = R"frame(
_tsd_apps() {
  local device=${${(Q)words[2]}/#\~/$HOME}
  compadd -- ${(f)"$(tsd status --json -- $device 2>/dev/null | sed -n 's/^ *"id": "\([^"]*\)".*/\1/p')"}
}

_tsd_sources() {
  if [[ $words[2] == remove ]]; then
    local host=${${(Q)words[3]}/#\~/$HOME}
    local -a apps=($host/Packages/*.pkg(N:t:r) $host/*(N/:t))
    compadd -- ${apps:#(Packages|Restore)}
  else
    _files
  fi
}

_tsd_assets() {
  if compset -P '*[:,]'; then
    compadd -S '' -- ASSETS
  else
    local host=${${(Q)words[3]}/#\~/$HOME}
    compadd -S : -- $host/Packages/*.pkg(N:t:r)
  fi
}

_tsd_rules() {
  if compset -P '*='; then
    compadd -- ACTIONS
  else
    compadd -S = -- POINTS
  fi
}

if [[ ${funcstack[1]-} == _tsd ]]; then
  _tsd "$@"
else
  (( $+functions[compdef] )) || { autoload -Uz compinit && compinit }
  compdef _tsd tsd
fi
)frame";

std::string replaced(std::string text, const std::string& mark, const std::vector<std::string>& words) {
  std::string list;
  for (const auto& word : words) list += (list.empty() ? "" : " ") + word;
  return text.replace(text.find(mark), mark.size(), list);
}

}  // namespace

std::string zshCompletion(const OptionTable& table) {
  std::string name = table.program;
  std::string commands, cases;
  for (const auto& command : table.commands) {
    commands += "    '" + command.name + ':' + quoted(command.description, "") + "'\n";
    cases += "      " + command.name + ")\n        _arguments" + specsOf(command) + "\n        ;;\n";
  }
  return "#compdef " + name + "\n# Completes command lines of " + name + " in zsh.\n_" + name +
         "() {\n  local context state state_descr line\n  typeset -A opt_args\n  local -a commands=(\n" + commands +
         "  )\n  _arguments -C '--help[What the program does]' '--version[Which version it is]' \\\n"
         "    '1:command:->command' '*::argument:->arguments'\n"
         "  case $state in\n    command) _describe command commands ;;\n"
         "    arguments)\n      case $words[1] in\n" +
         cases + "      esac\n      ;;\n  esac\n}\n" +
         replaced(replaced(replaced(frame, "ACTIONS", table.actions), "POINTS", table.points), "ASSETS",
                  table.assetWords());
}

}  // namespace tsd
