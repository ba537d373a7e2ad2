#include "tsd/help/ManualPage.h"

#include <algorithm>
#include <cctype>

#include "tsd/help/ManualText.h"

namespace tsd {
namespace {

/// Escaped so that the formatter shows the text as it is: hyphens can still be copied, and a full stop at the beginning
/// of a line is not a request.
std::string plain(const std::string& text) {
  std::string result;
  if (!text.empty() && (text.front() == '.' || text.front() == '\'')) result = "\\&";
  for (char each : text) {
    if (each == '\\') {
      result += "\\e";
    } else if (each == '-') {
      result += "\\-";
    } else {
      result += each;
    }
  }
  return result;
}

std::string bold(const std::string& text) { return "\\fB" + plain(text) + "\\fR"; }
std::string italic(const std::string& text) { return "\\fI" + plain(text) + "\\fR"; }

std::string sentence(std::string text) {
  if (!text.empty() && text.back() != '.') text += '.';
  return plain(text);
}

std::string start(const OptionTable& table, const std::string& name, const std::string& description) {
  std::string title = name;
  std::transform(title.begin(), title.end(), title.begin(), [](unsigned char each) { return std::toupper(each); });
  std::string lower = description;
  if (!lower.empty()) lower[0] = static_cast<char>(std::tolower(static_cast<unsigned char>(lower[0])));
  if (!lower.empty() && lower.back() == '.') lower.pop_back();
  return ".TH " + plain(title) + " 1 \"\" \"" + plain(table.program + ' ' + table.version) +
         "\" \"User Commands\"\n.SH NAME\n" + plain(name) + " \\- " + plain(lower) + '\n';
}

std::string heading(const char* title) { return std::string(".SH ") + title + '\n'; }

/// A paragraph with its tag in the margin.
std::string tagged(const std::string& tag, const std::string& text) { return ".TP\n" + tag + '\n' + text + '\n'; }

std::string tagOf(const OptionEntry& option) {
  if (option.isArgument) return italic(option.value);
  std::string tag;
  for (const auto& name : option.names) tag += (tag.empty() ? "" : ", ") + bold(name);
  if (!option.value.empty()) tag += ' ' + italic(option.value);
  return tag;
}

template <class Condition>
std::string section(const char* title, const CommandEntry& command, Condition belongs) {
  std::string text;
  for (const auto& option : command.options) {
    if (belongs(option)) text += tagged(tagOf(option), sentence(option.description));
  }
  return text.empty() ? text : heading(title) + text;
}

std::string exitStatus(const OptionTable& table) {
  std::string text = heading("EXIT STATUS");
  for (const auto& each : table.exitCodes) {
    text += tagged(bold(std::to_string(static_cast<int>(each.code))), sentence(each.meaning));
  }
  return text;
}

std::string itemsSection(const char* title, const std::vector<ManualItem>& items) {
  std::string text = heading(title);
  for (const auto& item : items) text += tagged(bold(item.tag), sentence(item.text));
  return text;
}

std::string examplesSection(const std::string& command) {
  auto examples = manualExamples(command);
  std::string text = examples.empty() ? "" : heading("EXAMPLES");
  for (const auto& example : examples) text += tagged(bold(example.line), sentence(example.text));
  return text;
}

std::string pageName(const OptionTable& table, const CommandEntry& command) {
  return table.program + '-' + command.name;
}

}  // namespace

std::string manualPage(const OptionTable& table) {
  std::string page = start(table, table.program, table.description);
  page += heading("SYNOPSIS") + bold(table.program) + ' ' + italic("COMMAND") + " [" + italic("OPTIONS") + "] ...\n";
  page += heading("DESCRIPTION") + sentence(table.description) + '\n';
  page += heading("COMMANDS");
  std::string pages;
  for (const auto& command : table.commands) {
    page += tagged(bold(command.name), sentence(command.description));
    pages += (pages.empty() ? "" : ",\n") + bold(pageName(table, command)) + "(1)";
  }
  page += itemsSection("INJECTION RULES", manualOfRules()) + itemsSection("ACTIONS OF RULES", manualOfActions());
  page += itemsSection("SETTINGS OF A DEVICE", manualOfSettings()) + exitStatus(table);
  page += itemsSection("ENVIRONMENT", manualOfEnvironment()) + itemsSection("FILES", manualOfFiles());
  return page + examplesSection("") + heading("SEE ALSO") + pages + '\n';
}

std::string manualPage(const OptionTable& table, const CommandEntry& command) {
  std::string page = start(table, pageName(table, command), command.description);
  page += heading("SYNOPSIS") + bold(table.program + ' ' + command.name) + " [" + italic("OPTIONS") + ']';
  for (const auto& option : command.options) {
    if (option.isArgument) page += ' ' + italic(option.value) + (option.isRepeatable ? " ..." : "");
  }
  page += '\n' + heading("DESCRIPTION") + sentence(command.description) + '\n';
  page += section("ARGUMENTS", command, [](const OptionEntry& each) { return each.isArgument; });
  page += section("OPTIONS", command, [](const OptionEntry& each) { return !each.isArgument && !each.isCommon; });
  page += section("COMMON OPTIONS", command, [](const OptionEntry& each) { return each.isCommon; });
  if (command.name == "set") page += itemsSection("SETTINGS", manualOfSettings());
  return page + exitStatus(table) + examplesSection(command.name) + heading("SEE ALSO") + bold(table.program) +
         "(1), for the rules of injection, the settings, the files and the environment\n";
}

}  // namespace tsd
