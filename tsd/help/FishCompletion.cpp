#include <cstddef>
#include <set>
#include <string>

#include "tsd/help/Completion.h"

namespace tsd {
namespace {

std::string quoted(const std::string& text) {
  std::string result = "'";
  for (char each : text) {
    if (each == '\'' || each == '\\') result += '\\';
    result += each;
  }
  return result + '\'';
}

std::string listOf(const std::vector<std::string>& words) {
  std::string list;
  for (const auto& word : words) list += (list.empty() ? "" : " ") + word;
  return quoted(list);
}

std::string valueOf(const OptionEntry& option) {
  if (option.takesFile()) return " -r -F";
  if (option.takesFolder()) return " -x -a '(__fish_complete_directories)'";
  if (option.takesRule()) return " -x -a '(__tsd_rules)'";
  if (option.takesAsset()) return " -x -a '(__tsd_assets)'";
  return option.words.empty() ? " -x" : " -x -a " + listOf(option.words);
}

/// `place`: which argument of the subcommand it is, from 1 on.
std::string argumentLine(const std::string& start, const std::string& seen, std::size_t place,
                         const OptionEntry& argument) {
  const std::string more = argument.isRepeatable ? " more" : "";
  const std::string condition = start + " -n '" + seen + "; and __tsd_at " + std::to_string(place) + more;
  if (argument.takesSource())
    return condition + "; and __tsd_removes' -a '(__tsd_host_apps)'\n" + condition + "; and not __tsd_removes' -F\n";
  const std::string front = condition + '\'';
  if (argument.takesFile()) return front + " -F\n";
  if (argument.takesFolder()) return front + " -a '(__fish_complete_directories)'\n";
  if (argument.takesApp()) return front + " -a '(__tsd_apps)'\n";
  return argument.words.empty() ? "" : front + " -a " + listOf(argument.words) + '\n';
}

std::string lineOf(const std::string& front, const OptionEntry& option) {
  std::string line = front;
  for (const auto& name : option.names) line += name[1] == '-' ? " -l " + name.substr(2) : " -s " + name.substr(1);
  if (!option.value.empty()) line += valueOf(option);
  return line + " -d " + quoted(option.description) + '\n';
}

/// What tells at which argument of the subcommand the cursor is, or with "more" whether at a later one. What an option
/// takes does not count.
std::string placeFunction(const OptionTable& table) {
  std::set<std::string> taking;
  for (const auto& command : table.commands) {
    for (const auto& option : command.options) {
      if (!option.isArgument && !option.value.empty()) taking.insert(option.names.begin(), option.names.end());
    }
  }
  std::string text =
      "function __tsd_at\n  set -l place 1\n  set -l taken 0\n  for word in (commandline -opc)[3..]\n"
      "    if test $taken = 1\n      set taken 0\n    else if contains -- $word";
  for (const auto& name : taking) text += ' ' + name;
  return text +
         "\n      set taken 1\n    else if not string match -q -- '-*' $word\n"
         "      set place (math $place + 1)\n    end\n  end\n"
         "  test $place -eq $argv[1]; or test \"$argv[2]\" = more -a $place -ge $argv[1]\nend\n";
}

/// What completes apps of the device that the command line names, and rules.
std::string functionsOf(const OptionTable& table) {
  std::string text =
      "function __tsd_apps\n  set -l words (commandline -opc)\n"
      "  tsd status --json -- $words[3] 2>/dev/null | string match -rg '^ *\"id\": \"([^\"]*)\"'\nend\n"
      "function __tsd_removes\n  set -l words (commandline -opc)\n  test \"$words[3]\" = remove\nend\n"
      "function __tsd_host_apps\n  set -l words (commandline -opc)\n"
      "  for path in $words[4]/Packages/*.pkg $words[4]/*/\n"
      "    string match -rg '([^/]*?)(?:\\.pkg|/)$' -- $path | string match -v -r '^(Packages|Restore)$'\n  end\nend\n"
      "function __tsd_rules\n  set -l point (string match -rg '^([^=]*=)' -- (commandline -ct))\n"
      "  if test -n \"$point\"\n    string join \\n -- $point";
  text += "{";
  for (const auto& action : table.actions) text += (text.back() == '{' ? "" : ",") + action;
  text += "}\n  else\n    string join \\n --";
  for (const auto& point : table.points) text += ' ' + point + '=';
  text +=
      "\n  end\nend\nfunction __tsd_assets\n  set -l words (commandline -opc)\n"
      "  set -l front (string match -rg '^(.*[:,])' -- (commandline -ct))\n"
      "  if test -n \"$front\"\n    string join \\n -- $front{";
  for (const auto& word : table.assetWords()) text += (text.back() == '{' ? "" : ",") + word;
  return text +
         "}\n  else\n    for package in $words[4]/Packages/*.pkg\n"
         "      string replace -r '.*/(.*)\\.pkg$' '$1:' -- $package\n    end\n  end\nend\n";
}

}  // namespace

std::string fishCompletion(const OptionTable& table) {
  std::string start = "complete -c " + table.program;
  std::string text = "# Completes command lines of " + table.program + " in fish.\n";
  text += placeFunction(table) + functionsOf(table) + start + " -f\n";
  for (const auto& command : table.commands) {
    text += start + " -n __fish_use_subcommand -a " + command.name + " -d " + quoted(command.description) + '\n';
  }
  for (const auto& command : table.commands) {
    const std::string seen = "__fish_seen_subcommand_from " + command.name;
    const std::string front = start + " -n '" + seen + '\'';
    std::size_t place = 0;
    for (const auto& option : command.options)
      text += option.isArgument ? argumentLine(start, seen, ++place, option) : lineOf(front, option);
  }
  return text;
}

}  // namespace tsd
