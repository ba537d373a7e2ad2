#include "device/Journal.h"

#include <nlohmann/json.hpp>

#include "platform/Describe.h"

namespace device {

using nlohmann::ordered_json;
using platform::Value;

namespace {

ordered_json jsonOf(const Value& value);

ordered_json jsonOfDictionary(const platform::Dictionary& dictionary) {
  ordered_json::object_t object;
  object.reserve(dictionary.size());
  // Keys differ already; the object's own way to add one compares it with all the others.
  for (const auto& [key, value] : dictionary) object.emplace_back(std::string(key), jsonOf(value));
  return object;
}

ordered_json jsonOf(const Value& value) {
  switch (value.kind()) {
    case Value::Kind::absent:
      return nullptr;
    case Value::Kind::boolean:
      return *value.boolean();
    case Value::Kind::integer:
      if (auto number = value.integer()) return *number;
      return value.unsignedInteger().value_or(0);
    case Value::Kind::real:
      return *value.real();  // null for what JSON cannot hold
    case Value::Kind::string:
      return std::string(*value.string());
    case Value::Kind::data:
      return value.data()->size();
    case Value::Kind::date:
      return platform::describe(value);
    case Value::Kind::array: {
      auto array = ordered_json::array();
      for (const auto& element : *value.array()) array.push_back(jsonOf(element));
      return array;
    }
    case Value::Kind::dictionary:
      return jsonOfDictionary(*value.dictionary());
  }
  return nullptr;
}

void addArguments(ordered_json& object, const CallRecord& record) {
  const auto* arguments = record.arguments.dictionary();
  for (const char* name : record.argumentNames) object[name] = arguments ? jsonOf((*arguments)[name]) : ordered_json();
}

std::string textOf(const ordered_json& json, int indent) {
  return json.dump(indent, ' ', false, ordered_json::error_handler_t::replace);
}

}  // namespace

std::string jsonText(const Value& value, int indent) { return textOf(jsonOf(value), indent); }

std::string journalLine(const CallRecord& record) {
  ordered_json line;
  line["n"] = record.number;
  line["thread"] = record.thread;
  line["service"] = record.service;
  line["op"] = record.operation;
  line["app"] = record.app.empty() ? ordered_json() : ordered_json(record.app);
  if (record.service == "log") {
    // A message has neither parameters nor an outcome that anybody would look for.
    addArguments(line, record);
    return textOf(line, -1);
  }
  addArguments(line["args"] = ordered_json::object(), record);
  line["result"] = jsonOf(record.result);
  line["error"] = jsonOf(journalValueOfError(record.error));
  if (record.end) line["end"] = true;
  return textOf(line, -1);
}

}  // namespace device
