#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "device/boundary/ObjectFacts.h"
#include "device/boundary/ObjectKind.h"
#include "platform/Error.h"
#include "platform/FileSystem.h"
#include "platform/StringSet.h"
#include "platform/Value.h"

namespace device {

/// An error as the journal shows it: a dictionary of "domain", "code", "description" and "underlying", the last two
/// if there are any; absent for no error.
platform::Value journalValueOfError(const platform::ErrorRef& error);

/// A value with long lists as their length ("[5000 elements]") and long texts cut, data as its count of bytes; small
/// ones as they are.
platform::Value sketchOf(const platform::Value& value);
std::string sketchOfText(std::string_view text);
std::string sketchOfList(std::size_t count);
constexpr std::size_t longestShownList = 32;

template <class Names>
platform::Value shownText(Names& names, std::string_view text) {
  return names.showsWhole() ? platform::Value(text) : platform::Value(sketchOfText(text));
}
template <class Names>
platform::Value shownValue(Names& names, const platform::Value& value) {
  return names.showsWhole() ? value : sketchOf(value);
}

/// How the journal shows results and arguments, by their type. `names` gives objects their names
/// (`Boundary::nameOfObject`) and tells whether lists and texts are shown whole. Any other type is shown as
/// absent.
template <class Names, class T>
platform::Value journalValue([[maybe_unused]] Names& names, [[maybe_unused]] const T& value,
                             [[maybe_unused]] bool textIsBytes = false) {
  if constexpr (std::is_same_v<T, platform::Value>) {
    return shownValue(names, value);
  } else if constexpr (std::is_same_v<T, platform::ErrorRef>) {
    return journalValueOfError(value);
  } else if constexpr (std::is_same_v<T, bool> || std::is_integral_v<T>) {
    return platform::Value(value);
  } else if constexpr (std::is_floating_point_v<T>) {
    return platform::Value(static_cast<double>(value));
  } else if constexpr (std::is_enum_v<T>) {
    return platform::Value(static_cast<std::underlying_type_t<T>>(value));
  } else if constexpr (std::is_convertible_v<const T&, std::string_view>) {
    std::string_view text = value;
    return textIsBytes ? platform::Value(text.size()) : shownText(names, text);
  } else if constexpr (std::is_same_v<T, platform::StringSet>) {
    return journalValue(names, value.members());
  } else if constexpr (std::is_same_v<T, platform::FileAttributes>) {
    auto attributes = platform::Value::makeDictionary();
    attributes.dictionary()->set("isDirectory", value.isDirectory);
    attributes.dictionary()->set("size", value.size);
    return attributes;
  } else {
    return journalValueOfContent(names, value, textIsBytes);
  }
}

template <class Names, class T>
platform::Value journalValueOfContent(Names&, const T&, bool) {
  return {};
}
template <class Names, class T>
platform::Value journalValueOfContent(Names& names, const std::optional<T>& value, bool textIsBytes) {
  return value ? journalValue(names, *value, textIsBytes) : platform::Value();
}
template <class Names, HasObjectKind T>
platform::Value journalValueOfContent(Names& names, const std::shared_ptr<T>& object, bool) {
  if (!object) return {};
  platform::Value name(names.nameOfObject(kindOfObject(object.get()), wholeObject(object.get()), object));
  if constexpr (requires { factsOf(*object); }) {
    if (names.showsWhole()) {
      platform::Value facts = factsOf(*object);
      facts.dictionary()->set("object", name);
      return facts;
    }
  }
  return name;
}
template <class Names, HasObjectKind T>
platform::Value journalValueOfContent(Names& names, const std::unique_ptr<T>& object, bool) {
  if (!object) return {};
  return platform::Value(names.nameOfObject(kindOfObject(object.get()), wholeObject(object.get())));
}
template <class Names, class T>
platform::Value journalValueOfContent(Names& names, const std::vector<T>& values, bool textIsBytes) {
  if (!names.showsWhole() && values.size() > longestShownList) return platform::Value(sketchOfList(values.size()));
  auto array = platform::Value::makeArray();
  array.array()->reserve(values.size());
  for (const auto& value : values) array.array()->append(journalValue(names, value, textIsBytes));
  return array;
}

}  // namespace device
