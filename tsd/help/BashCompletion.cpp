#include "tsd/help/Completion.h"

namespace tsd {
namespace {

// What does not depend on the options. The shell treats "=" and ":" as words of their own; they are joined again, and
// what precedes the last of them is cut off the answers.
constexpr const char* frame = R"frame(# Completes command lines of PROGRAM in bash.
_PROGRAM() {
  local -a words=()
  local each before i
  for ((i = 0; i <= COMP_CWORD; ++i)); do
    each=${COMP_WORDS[i]}
    if ((i > 1)) && [[ $each == [=:]* || (-n $each && $before == *[=:]) ]]; then
      words[-1]+=$each
    else
      words+=("$each")
    fi
    before=$each
  done

  local last=$((${#words[@]} - 1)) command=${words[1]-}
  local word=${words[last]} kind
  local -a options=() arguments=()
  COMPREPLY=()
  if ((last == 1)); then
    kind="words COMMANDS"
    [[ $word != -* ]] || kind="words --help --version"
    _PROGRAM_answer "$kind"
    return
  fi
  _PROGRAM_command "$command" || return 0

  if [[ $word == --*=* ]]; then
    kind=$(_PROGRAM_kind "$command" "${word%%=*}")
    word=${word#*=}
  elif kind=$(_PROGRAM_kind "$command" "${words[last - 1]}") && [[ -n $kind ]]; then
    :
  elif [[ $word == -* ]]; then
    kind="words ${options[*]}"
  else
    local place=0
    for ((i = 2; i < last; ++i)); do
      if [[ ${words[i]} != -* ]]; then
        ((++place))
      elif [[ ${words[i]} != *=* && -n $(_PROGRAM_kind "$command" "${words[i]}") ]]; then
        ((++i))
      fi
    done
    ((place < ${#arguments[@]} || ${#arguments[@]} == 0)) || place=$((${#arguments[@]} - 1))
    kind=${arguments[place]-}
  fi
  _PROGRAM_answer "$kind"
}

_PROGRAM_answer() {
  local kind=$1
  [[ $kind != source ]] || { [[ ${words[2]-} == remove ]] && kind=host-app || kind=file; }
  case $kind in
    file) compopt -o filenames 2>/dev/null; mapfile -t COMPREPLY < <(compgen -f -- "$word") ;;
    folder) compopt -o filenames 2>/dev/null; mapfile -t COMPREPLY < <(compgen -d -- "$word") ;;
    words*) mapfile -t COMPREPLY < <(compgen -W "${kind#words}" -- "$word") ;;
    host-app) _PROGRAM_host_apps ;;
    app) mapfile -t COMPREPLY < <(compgen -W "$(_PROGRAM_apps "${words[2]-}")" -- "$word") ;;
    asset*)
      if [[ $word == *[:,]* ]]; then
        local begin=${word##*[:,]}
        mapfile -t COMPREPLY < <(compgen -P "${word%"$begin"}" -W "${kind#asset}" -- "$begin")
      else
        local host=${words[3]-}
        mapfile -t COMPREPLY < <(cd "${host/#\~/$HOME}/Packages" 2>/dev/null && compgen -S : -X '!*.pkg' -f -- "$word")
        COMPREPLY=("${COMPREPLY[@]/%.pkg:/:}")
      fi
      ;;
    rule)
      if [[ $word == *=* ]]; then
        mapfile -t COMPREPLY < <(compgen -P "${word%%=*}=" -W "ACTIONS" -- "${word#*=}")
      else
        mapfile -t COMPREPLY < <(compgen -S = -W "POINTS" -- "$word")
      fi
      ;;
  esac
  [[ ${COMPREPLY[*]-} != *[=:] ]] || compopt -o nospace 2>/dev/null
  local current=${COMP_WORDS[COMP_CWORD]}
  [[ $current != [=:] ]] || current=
  local front=${word%"$current"}
  [[ -z $front ]] || COMPREPLY=("${COMPREPLY[@]#"$front"}")
}

# The apps that a host has something of.
_PROGRAM_host_apps() {
  local host=${words[3]-}
  host=${host/#\~/$HOME}
  mapfile -t COMPREPLY < <({
    (cd "$host/Packages" 2>/dev/null && compgen -X '!*.pkg' -f -- "$word" | sed 's/\.pkg$//')
    (cd "$host" 2>/dev/null && compgen -d -- "$word" | sed '/^Packages$/d; /^Restore$/d')
  } | sort -u)
}

# The apps of a device.
_PROGRAM_apps() {
  PROGRAM status --json -- "$1" 2>/dev/null | sed -n 's/^ *"id": "\([^"]*\)".*/\1/p'
}
)frame";

std::string replaced(std::string text, const std::string& from, const std::string& by) {
  for (std::size_t place = 0; (place = text.find(from, place)) != text.npos; place += by.size()) {
    text.replace(place, from.size(), by);
  }
  return text;
}

std::string joined(const std::vector<std::string>& words) {
  std::string text;
  for (const auto& word : words) text += (text.empty() ? "" : " ") + word;
  return text;
}

std::string kindOf(const OptionEntry& option) {
  if (option.takesFile()) return "file";
  if (option.takesFolder()) return "folder";
  if (option.takesSource()) return "source";
  if (option.takesApp()) return "app";
  if (option.takesRule()) return "rule";
  std::string words = option.takesAsset() ? "asset" : "words";
  for (const auto& word : option.words) words += ' ' + word;
  return words;
}

/// The line that sets the options and arguments of a subcommand.
std::string commandCase(const CommandEntry& command) {
  std::string options, arguments;
  bool isRepeatable = false;
  for (const auto& option : command.options) {
    if (option.isArgument) {
      arguments += " \"" + kindOf(option) + '"';
      isRepeatable = option.isRepeatable;
    } else {
      for (const auto& name : option.names) options += ' ' + name;
    }
  }
  if (!arguments.empty() && !isRepeatable) arguments += " none";
  return "    " + command.name + ") options=(" + options.erase(0, 1) + ") arguments=(" +
         (arguments.empty() ? "none" : arguments.substr(1)) + ") ;;\n";
}

/// The lines that tell which values the options of a subcommand take.
std::string kindCases(const CommandEntry& command) {
  std::string cases;
  for (const auto& option : command.options) {
    if (option.isArgument || option.value.empty()) continue;
    std::string pattern;
    for (const auto& name : option.names)
      pattern += (pattern.empty() ? "'" : " | '") + command.name + ' ' + name + '\'';
    cases += "    " + pattern + ") echo '" + kindOf(option) + "' ;;\n";
  }
  return cases;
}

}  // namespace

std::string bashCompletion(const OptionTable& table) {
  std::string names, commands, kinds;
  for (const auto& command : table.commands) {
    names += (names.empty() ? "" : " ") + command.name;
    commands += commandCase(command);
    kinds += kindCases(command);
  }
  std::string own = replaced(replaced(frame, "POINTS", joined(table.points)), "ACTIONS", joined(table.actions));
  std::string text = replaced(own, "COMMANDS", names) +
                     "\n# What a subcommand takes: its options, and the kinds of its arguments.\n"
                     "_PROGRAM_command() {\n  case $1 in\n" +
                     commands + "    *) return 1 ;;\n  esac\n}\n" +
                     "\n# The kind of an option's value; nothing for what takes none.\n"
                     "_PROGRAM_kind() {\n  case \"$1 $2\" in\n" +
                     kinds + "  esac\n}\n" + "\ncomplete -F _PROGRAM PROGRAM\n";
  return replaced(text, "PROGRAM", table.program);
}

}  // namespace tsd
