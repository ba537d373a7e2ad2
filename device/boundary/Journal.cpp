#include "device/boundary/Journal.h"

#include <charconv>
#include <nlohmann/json.hpp>

#include "device/boundary/JsonText.h"

namespace device {

using json = nlohmann::ordered_json;
using platform::ErrorRef;
using platform::Value;

namespace {

void appendMember(std::string& line, std::string_view name, std::string_view text) {
  line += ",\"";
  line += name;
  line += "\":";
  appendJsonString(line, text);
}

void appendMember(std::string& line, std::string_view name, std::uint64_t number) {
  char digits[24];
  line += '"';
  line += name;
  line += "\":";
  line.append(digits, std::to_chars(digits, digits + sizeof digits, number).ptr);
}

void appendArguments(std::string& line, const CallRecord& record) {
  const auto* arguments = record.arguments.dictionary();
  const char* separator = "";
  for (const char* name : record.argumentNames) {
    line += separator;
    separator = ",";
    appendJsonString(line, name);
    line += ':';
    appendJson(line, arguments ? (*arguments)[name] : Value());
  }
}

Value valueOf(const json& item) {
  switch (item.type()) {
    case json::value_t::boolean:
      return item.get<bool>();
    case json::value_t::number_integer:
      return item.get<std::int64_t>();
    case json::value_t::number_unsigned:
      return item.get<std::uint64_t>();
    case json::value_t::number_float:
      return item.get<double>();
    case json::value_t::string:
      return item.get_ref<const std::string&>();
    case json::value_t::array: {
      Value array = Value::makeArray();
      for (const auto& element : item) array.array()->append(valueOf(element));
      return array;
    }
    case json::value_t::object: {
      Value dictionary = Value::makeDictionary();
      for (const auto& [key, value] : item.items()) dictionary.dictionary()->set(key, valueOf(value));
      return dictionary;
    }
    default:
      return {};
  }
}

ErrorRef errorOf(const Value& value) {
  const auto* facts = value.dictionary();
  if (!facts) return nullptr;
  return platform::makeError(
      std::string((*facts)["domain"].string().value_or("")), (*facts)["code"].integer().value_or(0),
      std::string((*facts)["description"].string().value_or("")), errorOf((*facts)["underlying"]));
}

}  // namespace

std::string jsonText(const Value& value, int indent) {
  std::string text;
  appendJson(text, value, indent);
  return text;
}

/// Whether arrays and objects are nested so deep at most.
static bool isNestedAtMost(std::size_t depth, std::string_view text) {
  std::size_t open = 0;
  for (std::size_t at = 0; at < text.size(); ++at) {
    char c = text[at];
    if (c == '"') {
      while (++at < text.size() && text[at] != '"') at += text[at] == '\\' ? 1 : 0;
    } else if (c == '[' || c == '{') {
      if (++open > depth) return false;
    } else if ((c == ']' || c == '}') && open > 0) {
      --open;
    }
  }
  return true;
}

Value valueOfJson(std::string_view text) {
  if (!isNestedAtMost(deepestJson, text)) return {};
  auto parsed = json::parse(text, nullptr, false);
  return parsed.is_discarded() ? Value() : valueOf(parsed);
}

void appendJournalLine(std::string& line, const CallRecord& record) {
  line += '{';
  appendMember(line, "n", record.number);
  line += ',';
  appendMember(line, "t", static_cast<std::uint64_t>(record.time.count()));
  appendMember(line, "thread", record.thread);
  appendMember(line, "service", record.service);
  appendMember(line, "op", record.operation);
  line += ",\"app\":";
  if (record.app.empty())
    line += "null";
  else
    appendJsonString(line, record.app);
  line += ',';
  if (record.service == "log") {
    // A message has neither parameters nor an outcome that anybody would look for.
    appendArguments(line, record);
    line += '}';
    return;
  }
  line += "\"args\":{";
  appendArguments(line, record);
  line += "},\"result\":";
  appendJson(line, record.result);
  line += ",\"error\":";
  appendJson(line, journalValueOfError(record.error));
  line += record.end ? ",\"end\":true}" : "}";
}

std::string journalLine(const CallRecord& record) {
  std::string line;
  appendJournalLine(line, record);
  return line;
}

std::optional<CallRecord> parseJournalLine(std::string_view line) {
  const Value value = valueOfJson(line);
  const auto* members = value.dictionary();
  if (!members || !(*members)["n"].unsignedInteger()) return std::nullopt;
  auto text = [&](const char* name) { return std::string((*members)[name].string().value_or("")); };
  CallRecord record;
  record.number = *(*members)["n"].unsignedInteger();
  record.time = std::chrono::microseconds((*members)["t"].integer().value_or(0));
  record.thread = text("thread");
  record.service = text("service");
  record.operation = text("op");
  record.app = text("app");
  record.arguments = record.service == "log" ? value : (*members)["args"];
  record.result = (*members)["result"];
  record.error = errorOf((*members)["error"]);
  record.end = (*members)["end"].boolValue();
  return record;
}

}  // namespace device
