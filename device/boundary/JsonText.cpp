#include "device/boundary/JsonText.h"

#include <charconv>
#include <cmath>

#include "platform/Describe.h"
#include "platform/Value.h"
#include "plist/Unicode.h"

namespace device {

using platform::Value;

namespace {

template <class Number>
void appendNumber(std::string& json, Number number) {
  char digits[32];
  char* end = std::to_chars(digits, digits + sizeof digits, number).ptr;
  json.append(digits, end);
}

void appendReal(std::string& json, double number) {
  if (!std::isfinite(number)) {
    json += "null";
    return;
  }
  std::size_t begin = json.size();
  appendNumber(json, number);
  if (json.find_first_of(".e", begin) == std::string::npos) json += ".0";
}

void appendEscaped(std::string& json, char c) {
  switch (c) {
    case '"':
      json += "\\\"";
      break;
    case '\\':
      json += "\\\\";
      break;
    case '\n':
      json += "\\n";
      break;
    case '\t':
      json += "\\t";
      break;
    case '\r':
      json += "\\r";
      break;
    default: {
      constexpr char digits[] = "0123456789abcdef";
      json += "\\u00";
      json += digits[static_cast<unsigned char>(c) >> 4];
      json += digits[c & 15];
    }
  }
}

void appendLine(std::string& json, int indent, int level) {
  if (indent < 0) return;
  json += '\n';
  json.append(static_cast<std::size_t>(indent) * static_cast<std::size_t>(level), ' ');
}

}  // namespace

void appendJsonString(std::string& json, std::string_view text) {
  json += '"';
  std::size_t plain = 0;  // bytes at the front that stand as they are
  while (plain < text.size()) {
    char c = text[plain];
    bool isAscii = static_cast<unsigned char>(c) < 0x80;
    std::size_t size = isAscii ? 1 : plist::firstCharacter(text.substr(plain)).size;
    if (size != 0 && !(isAscii && (static_cast<unsigned char>(c) < 0x20 || c == '"' || c == '\\'))) {
      plain += size;
      continue;
    }
    json += text.substr(0, plain);
    if (isAscii)
      appendEscaped(json, c);
    else
      json += "\xEF\xBF\xBD";
    text.remove_prefix(plain + 1);
    plain = 0;
  }
  json += text;
  json += '"';
}

static void appendArray(std::string& json, const platform::Array& array, int indent, int level) {
  json += '[';
  const char* separator = "";
  for (const auto& element : array) {
    json += separator;
    separator = ",";
    appendLine(json, indent, level + 1);
    appendJson(json, element, indent, level + 1);
  }
  if (*separator) appendLine(json, indent, level);
  json += ']';
}

static void appendDictionary(std::string& json, const platform::Dictionary& dictionary, int indent, int level) {
  json += '{';
  const char* separator = "";
  for (const auto& [key, value] : dictionary) {
    json += separator;
    separator = ",";
    appendLine(json, indent, level + 1);
    appendJsonString(json, key);
    json += indent < 0 ? ":" : ": ";
    appendJson(json, value, indent, level + 1);
  }
  if (*separator) appendLine(json, indent, level);
  json += '}';
}

void appendJson(std::string& json, const Value& value, int indent, int level) {
  switch (value.kind()) {
    case Value::Kind::absent:
      json += "null";
      break;
    case Value::Kind::boolean:
      json += *value.boolean() ? "true" : "false";
      break;
    case Value::Kind::integer:
      if (auto number = value.integer())
        appendNumber(json, *number);
      else
        appendNumber(json, *value.unsignedInteger());
      break;
    case Value::Kind::real:
      appendReal(json, *value.real());
      break;
    case Value::Kind::string:
      appendJsonString(json, *value.string());
      break;
    case Value::Kind::data:
      appendNumber(json, value.data()->size());
      break;
    case Value::Kind::date:
      appendJsonString(json, platform::describe(value));
      break;
    case Value::Kind::array:
      appendArray(json, *value.array(), indent, level);
      break;
    case Value::Kind::dictionary:
      appendDictionary(json, *value.dictionary(), indent, level);
      break;
  }
}

}  // namespace device
