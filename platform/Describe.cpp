#include "platform/Describe.h"

#include <charconv>

#include "platform/DateText.h"

namespace platform {
namespace {

template <class Number>
void appendNumber(std::string& out, Number number) {
  char digits[32];
  out.append(digits, std::to_chars(digits, digits + sizeof(digits), number).ptr);
}

void appendDate(std::string& out, Date date) {
  if (std::optional<DateText> text = dateText(date)) {
    out += *text;
    return;
  }
  appendNumber(out, date.seconds);
  out += " s from 2001-01-01T00:00:00Z";
}

void append(std::string& out, const Value& value);

void appendArray(std::string& out, const Array& array) {
  out += '(';
  for (const Value& value : array) {
    if (&value != array.begin()) out += ", ";
    append(out, value);
  }
  out += ')';
}

void appendDictionary(std::string& out, const Dictionary& dictionary) {
  out += '{';
  for (const Dictionary::Entry& entry : dictionary) {
    if (&entry != dictionary.begin()) out += "; ";
    out += entry.key;
    out += " = ";
    append(out, entry.value);
  }
  out += '}';
}

void append(std::string& out, const Value& value) {
  switch (value.kind()) {
    case Value::Kind::absent:
      out += "(null)";
      break;
    case Value::Kind::boolean:
      out += value.boolValue() ? '1' : '0';
      break;
    case Value::Kind::integer:
      if (auto number = value.integer()) {
        appendNumber(out, *number);
      } else {
        appendNumber(out, *value.unsignedInteger());
      }
      break;
    case Value::Kind::real:
      appendNumber(out, *value.real());
      break;
    case Value::Kind::string:
      out += *value.string();
      break;
    case Value::Kind::data:
      out += '<';
      appendNumber(out, value.data()->size());
      out += " bytes>";
      break;
    case Value::Kind::date:
      appendDate(out, *value.date());
      break;
    case Value::Kind::array:
      appendArray(out, *value.array());
      break;
    case Value::Kind::dictionary:
      appendDictionary(out, *value.dictionary());
      break;
  }
}

}  // namespace

std::string describe(const Value& value) {
  std::string text;
  append(text, value);
  return text;
}

}  // namespace platform
