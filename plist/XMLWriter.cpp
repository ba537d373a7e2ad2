#include "plist/XMLWriter.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <cstring>
#include <string>

#include "platform/DateText.h"
#include "plist/Base64.h"
#include "plist/Failure.h"
#include "plist/Unicode.h"

namespace plist {
namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;

/// What a character needs: nothing, a reference in its place, or (0) a closer look.
constexpr std::array<std::uint8_t, 256> costs = [] {
  std::array<std::uint8_t, 256> table{};
  for (std::size_t character = 0x20; character < 0x80; ++character) table[character] = 1;
  table['\t'] = table['\n'] = 1;
  table['&'] = table['\r'] = 5;
  table['<'] = table['>'] = 4;
  return table;
}();

/// A carriage return would be read as a line feed if it stood for itself.
std::string_view reference(char character) {
  switch (character) {
    case '&':
      return "&amp;";
    case '<':
      return "&lt;";
    case '>':
      return "&gt;";
  }
  return "&#13;";
}

/// Whether none of the eight characters needs more than being copied. May say no to some that do not.
bool isPlain(std::uint64_t word) {
  constexpr std::uint64_t ones = 0x0101010101010101, tops = 0x8080808080808080;
  auto has = [](std::uint64_t bytes, unsigned char character) {
    std::uint64_t zero = bytes ^ (ones * character);
    return (zero - ones) & ~zero;
  };
  std::uint64_t control = (word - ones * 0x20) & ~word;
  // "<" and ">" differ in one bit, in which no two other characters become one of them.
  return ((control | word | has(word, '&') | has(word | ones * 2, '>')) & tops) == 0;
}

std::size_t plainPrefix(std::string_view text) {
  std::size_t at = 0;
  for (; text.size() - at >= 8; at += 8) {
    std::uint64_t word;
    std::memcpy(&word, text.data() + at, 8);
    if (!isPlain(word)) return at;
  }
  while (at < text.size() && costs[static_cast<unsigned char>(text[at])] == 1) ++at;
  return at;
}

/// How many characters the text needs. Nothing if XML cannot carry it.
std::optional<std::size_t> escapedSize(std::string_view text) {
  std::size_t size = plainPrefix(text);
  text.remove_prefix(size);
  while (!text.empty()) {
    std::size_t cost = costs[static_cast<unsigned char>(text[0])], read = 1;
    if (cost == 0) {
      Character character = firstCharacter(text);
      if (character.code < 0x80 || character.code == 0xfffe || character.code == 0xffff) return {};
      cost = read = character.size;
    }
    size += cost;
    text.remove_prefix(read);
  }
  return size;
}

/// Where many small values lie very deep, the tabs would be nearly all there is.
std::size_t tabsAt(std::size_t depth) { return std::min<std::size_t>(depth, 16); }

}  // namespace

class XMLWriter::Counter {
 public:
  void add(std::string_view text) { size += text.size(); }
  void addTabs(std::size_t count) { size += tabsAt(count); }
  bool addEscaped(std::string_view text) {
    std::optional<std::size_t> escaped = escapedSize(text);
    size += escaped.value_or(0);
    return escaped.has_value();
  }
  void addBase64(std::string_view bytes) { size += base64Size(bytes.size()); }

  std::size_t size = 0;
};

class XMLWriter::Text {
 public:
  explicit Text(char* at) : _at(at) {}
  void add(std::string_view text) {
    std::memcpy(_at, text.data(), text.size());
    _at += text.size();
  }
  void addTabs(std::size_t count) {
    std::memset(_at, '\t', tabsAt(count));
    _at += tabsAt(count);
  }
  bool addEscaped(std::string_view text) {
    std::size_t plain = plainPrefix(text);
    add(text.substr(0, plain));
    for (char character : text.substr(plain)) {
      if (costs[static_cast<unsigned char>(character)] > 1) {
        add(reference(character));
      } else {
        *_at++ = character;
      }
    }
    return true;
  }
  void addBase64(std::string_view bytes) {
    writeBase64(bytes, _at);
    _at += base64Size(bytes.size());
  }

 private:
  char* _at;
};

std::optional<platform::Bytes> XMLWriter::write(const Value& value, platform::ErrorRef& error) {
  Counter counter;
  if (!document(counter, value)) {
    error = _error;
    return {};
  }
  platform::Bytes bytes(counter.size, '\0');
  Text text(bytes.data());
  document(text, value);
  return bytes;
}

bool XMLWriter::fail(platform::ErrorRef error) {
  _error = std::move(error);
  return false;
}

template <class Sink>
bool XMLWriter::document(Sink& sink, const Value& value) {
  sink.add("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n");
  if (!write(sink, value, 0)) return false;
  sink.add("</plist>\n");
  return true;
}

namespace {

template <class Sink, class Number>
void addNumber(Sink& sink, std::string_view start, Number number, std::string_view end) {
  char digits[32];
  char* last = std::to_chars(digits, digits + sizeof(digits), number).ptr;
  sink.add(start);
  sink.add({digits, static_cast<std::size_t>(last - digits)});
  sink.add(end);
}

template <class Sink>
void addInteger(Sink& sink, const Value& value) {
  if (auto number = value.integer()) {
    addNumber(sink, "<integer>", *number, "</integer>\n");
  } else {
    addNumber(sink, "<integer>", *value.unsignedInteger(), "</integer>\n");
  }
}

template <class Sink>
bool addText(Sink& sink, std::string_view start, std::string_view text, std::string_view end) {
  sink.add(start);
  bool carried = sink.addEscaped(text);
  sink.add(end);
  return carried;
}

platform::ErrorRef notCarried(std::string_view text) {
  return failure(ErrorCode::notRepresentable, "XML cannot carry the string " + quoted(text));
}

}  // namespace

template <class Sink>
bool XMLWriter::write(Sink& sink, const Value& value, std::size_t depth) {
  sink.addTabs(depth);
  switch (value.kind()) {
    case Value::Kind::absent:
      return fail(failure(ErrorCode::notRepresentable, "an absent value"));
    case Value::Kind::boolean:
      sink.add(*value.boolean() ? "<true/>\n" : "<false/>\n");
      return true;
    case Value::Kind::integer:
      addInteger(sink, value);
      return true;
    case Value::Kind::real:
      // The sign of a NaN says nothing.
      addNumber(sink, "<real>", std::isnan(*value.real()) ? std::abs(*value.real()) : *value.real(), "</real>\n");
      return true;
    case Value::Kind::string:
      if (addText(sink, "<string>", *value.string(), "</string>\n")) return true;
      return fail(notCarried(*value.string()));
    case Value::Kind::data:
      sink.add("<data>");
      sink.addBase64(*value.data());
      sink.add("</data>\n");
      return true;
    case Value::Kind::date:
      if (auto text = platform::dateText(*value.date())) {
        sink.add("<date>");
        sink.add(*text);
        sink.add("</date>\n");
        return true;
      }
      return fail(failure(ErrorCode::outOfRange, "a date outside the years 1 to 9999"));
    case Value::Kind::array:
      return writeArray(sink, *value.array(), depth);
    case Value::Kind::dictionary:
      return writeDictionary(sink, *value.dictionary(), depth);
  }
  return false;
}

template <class Sink>
bool XMLWriter::writeArray(Sink& sink, const Array& array, std::size_t depth) {
  if (depth == maximumDepth) return fail(tooDeep());
  if (array.empty()) {
    sink.add("<array/>\n");
    return true;
  }
  sink.add("<array>\n");
  for (const Value& value : array) {
    if (!write(sink, value, depth + 1)) return false;
  }
  sink.addTabs(depth);
  sink.add("</array>\n");
  return true;
}

template <class Sink>
bool XMLWriter::writeDictionary(Sink& sink, const Dictionary& dictionary, std::size_t depth) {
  if (depth == maximumDepth) return fail(tooDeep());
  if (dictionary.empty()) {
    sink.add("<dict/>\n");
    return true;
  }
  sink.add("<dict>\n");
  for (const Dictionary::Entry& entry : dictionary) {
    sink.addTabs(depth + 1);
    if (!addText(sink, "<key>", entry.key, "</key>\n")) return fail(notCarried(entry.key));
    if (!write(sink, entry.value, depth + 1)) return false;
  }
  sink.addTabs(depth);
  sink.add("</dict>\n");
  return true;
}

}  // namespace plist
