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

std::string lineOf(const std::string& front, const OptionEntry& option) {
  if (option.isArgument) {
    if (option.takesFile()) return front + " -F\n";
    if (option.takesFolder()) return front + " -a '(__fish_complete_directories)'\n";
    if (option.takesApp()) return front + " -a '(__tsd_apps)'\n";
    return option.words.empty() ? "" : front + " -a " + listOf(option.words) + '\n';
  }
  std::string line = front;
  for (const auto& name : option.names) line += name[1] == '-' ? " -l " + name.substr(2) : " -s " + name.substr(1);
  if (!option.value.empty()) line += valueOf(option);
  return line + " -d " + quoted(option.description) + '\n';
}

/// What completes apps of the device that the command line names, and rules.
std::string functionsOf(const OptionTable& table) {
  std::string text =
      "function __tsd_apps\n  set -l words (commandline -opc)\n"
      "  tsd status --json -- $words[3] 2>/dev/null | string match -rg '^ *\"id\": \"([^\"]*)\"'\nend\n"
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
  text += functionsOf(table) + start + " -f\n";
  for (const auto& command : table.commands) {
    text += start + " -n __fish_use_subcommand -a " + command.name + " -d " + quoted(command.description) + '\n';
  }
  for (const auto& command : table.commands) {
    std::string front = start + " -n '__fish_seen_subcommand_from " + command.name + '\'';
    for (const auto& option : command.options) text += lineOf(front, option);
  }
  return text;
}

}  // namespace tsd
