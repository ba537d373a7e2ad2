#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "platform/Describe.h"
#include "platform/Error.h"
#include "platform/StringSet.h"
#include "platform/Value.h"

namespace platform {

/// Something that can stand in a message as one line of text.
template <class T>
concept Describable = requires(const T& object) {
  { object.describe() } -> std::convertible_to<std::string>;
};

/// The text of an object in a message. Absent is "(null)".
inline void appendText(std::string& out, std::string_view text) { out += text; }
inline void appendText(std::string& out, const char* text) { out += text ? text : "(null)"; }
template <std::same_as<Value> T>
void appendText(std::string& out, const T& value) {
  out += describe(value);
}
void appendText(std::string& out, const StringSet& set);
template <class Number>
requires std::is_arithmetic_v<Number>
void appendText(std::string& out, Number number) { out += std::to_string(number); }
template <Describable T>
void appendText(std::string& out, const T& object) {
  out += object.describe();
}
template <class T>
void appendText(std::string& out, const T* object) {
  if (object)
    appendText(out, *object);
  else
    out += "(null)";
}
template <class T>
void appendText(std::string& out, const std::vector<T>& objects);
template <class T>
void appendText(std::string& out, const std::shared_ptr<T>& object) {
  appendText(out, object.get());
}
template <class T>
void appendText(std::string& out, const std::optional<T>& object) {
  if (object)
    appendText(out, *object);
  else
    out += "(null)";
}
template <class T>
void appendText(std::string& out, const std::vector<T>& objects) {
  out += '(';
  for (std::size_t i = 0; i < objects.size(); ++i) {
    if (i) out += ", ";
    appendText(out, objects[i]);
  }
  out += ')';
}

/// What a conversion of a message takes.
enum class ConversionKind : std::uint8_t { string, integer, real, character, object };

/// One argument of a message, its type forgotten. Lives for the call that logs it.
struct MessageArgument {
  ConversionKind kind;
  bool negative = false;
  std::uint64_t number = 0;
  double real = 0;
  std::string_view text{};
  const void* object = nullptr;
  void (*append)(std::string& out, const void* object) = nullptr;
};

template <class T>
consteval bool fits(ConversionKind kind) {
  using Plain = std::remove_cvref_t<T>;
  constexpr bool text = std::is_convertible_v<const Plain&, std::string_view>;
  switch (kind) {
    case ConversionKind::string:
      return text;
    case ConversionKind::integer:
      return std::is_integral_v<Plain> && !std::is_same_v<Plain, char>;
    case ConversionKind::real:
      return std::is_floating_point_v<Plain>;
    case ConversionKind::character:
      return std::is_same_v<Plain, char>;
    case ConversionKind::object:
      return true;
  }
  return false;
}

/// Reads the conversion that begins at text[at] == '%': its kind, and its length into `length`. Throws, which
/// ends the compilation, when the log has no such conversion.
constexpr ConversionKind conversionAt(std::string_view text, std::size_t at, std::size_t& length) {
  struct Known {
    std::string_view text;
    ConversionKind kind;
  };
  constexpr Known known[] = {
      {"%{public}@", ConversionKind::object}, {"%s", ConversionKind::string},    {"%c", ConversionKind::character},
      {"%d", ConversionKind::integer},        {"%lu", ConversionKind::integer},  {"%ld", ConversionKind::integer},
      {"%lld", ConversionKind::integer},      {"%llu", ConversionKind::integer}, {"%f", ConversionKind::real},
      {"%lf", ConversionKind::real},
  };
  for (const auto& each : known) {
    if (text.substr(at, each.text.size()) == each.text) {
      length = each.text.size();
      return each.kind;
    }
  }
  throw "no such conversion in a message";
}

/// The format of a message, checked against the types of its arguments when it is compiled: a wrong count or
/// type does not build. An integer conversion takes an integer of any width and prints its own value.
template <class... Arguments>
class MessageFormat {
 public:
  template <std::size_t N>
  consteval MessageFormat(const char (&text)[N]) : _text(text, N - 1) {
    std::size_t argument = 0;
    for (std::size_t i = 0; i < _text.size(); ++i) {
      if (_text[i] != '%') continue;
      std::size_t length = 0;
      ConversionKind kind = conversionAt(_text, i, length);
      if (!fitsArgument(kind, argument++)) throw "an argument of a message does not fit its conversion";
      i += length - 1;
    }
    if (argument != sizeof...(Arguments)) throw "a message has more arguments than conversions";
  }

  constexpr std::string_view text() const { return _text; }

 private:
  static consteval bool fitsArgument([[maybe_unused]] ConversionKind kind, std::size_t index) {
    std::size_t i = 0;
    bool result = false;
    ((i++ == index ? void(result = fits<Arguments>(kind)) : void()), ...);
    return result;
  }

  std::string_view _text;
};

template <class T>
MessageArgument messageArgument(const T& value) {
  MessageArgument argument{ConversionKind::object};
  if constexpr (std::is_same_v<T, char>) {
    argument.text = std::string_view(&value, 1);
  } else if constexpr (std::is_integral_v<T>) {
    argument.negative = value < T{};
    argument.number = static_cast<std::uint64_t>(value);
  } else if constexpr (std::is_floating_point_v<T>) {
    argument.real = value;
  } else if constexpr (std::is_convertible_v<const T&, std::string_view>) {
    argument.text = value;
  }
  argument.object = &value;
  argument.append = [](std::string& out, const void* object) { appendText(out, *static_cast<const T*>(object)); };
  return argument;
}

/// The message in full. `prefix` stands in front of it.
std::string formatMessage(std::string_view prefix, std::string_view format, const MessageArgument* arguments);

}  // namespace platform
