#include "device/boundary/JournalValue.h"

namespace device {

using platform::Value;

namespace {

constexpr std::size_t longestShownText = 1024;

/// `room` is how many elements may still be shown, over all levels.
Value sketch(const Value& value, std::size_t& room) {
  if (auto text = value.string()) return sketchOfText(*text);
  if (auto data = value.data()) return data->size();
  std::size_t count = value.array() ? value.array()->size() : value.dictionary() ? value.dictionary()->size() : 0;
  if (count > room) return sketchOfList(count);
  room -= count;
  if (const auto* elements = value.array()) {
    Value array = Value::makeArray();
    for (const auto& element : *elements) array.array()->append(sketch(element, room));
    return array;
  }
  if (const auto* entries = value.dictionary()) {
    Value dictionary = Value::makeDictionary();
    for (const auto& [key, entry] : *entries) dictionary.dictionary()->set(sketchOfText(key), sketch(entry, room));
    return dictionary;
  }
  return value;
}

}  // namespace

Value sketchOf(const Value& value) {
  std::size_t room = longestShownList;
  return sketch(value, room);
}

std::string sketchOfText(std::string_view text) {
  if (text.size() <= longestShownText) return std::string(text);
  return std::string(text.substr(0, longestShownText)) + "… (" + std::to_string(text.size()) + " bytes)";
}

std::string sketchOfList(std::size_t count) { return "[" + std::to_string(count) + " elements]"; }

}  // namespace device
