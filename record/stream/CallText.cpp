#include "record/stream/CallText.h"

#include <algorithm>
#include <charconv>

#include "platform/DateText.h"
#include "plist/Unicode.h"
#include "record/RecordingError.h"
#include "record/replaying/Story.h"
#include "record/stream/Item.h"

namespace record {

namespace {

constexpr std::size_t longestText = 240;
constexpr std::size_t longestLine = 2000;

bool isText(std::string_view bytes) {
  return plist::utf16Units(bytes) &&
         std::none_of(bytes.begin(), bytes.end(), [](char c) { return static_cast<unsigned char>(c) < 0x20; });
}

/// The text up to there, without a character that is cut in two.
std::string_view cutText(std::string_view text, std::size_t size) {
  if (text.size() <= size) return text;
  while (size > 0 && (static_cast<unsigned char>(text[size]) & 0xc0) == 0x80) --size;
  return text.substr(0, size);
}

std::string shownText(std::string_view text) {
  if (!isText(text)) return "<" + std::to_string(text.size()) + " bytes>";
  if (text.size() <= longestText) return "\"" + std::string(text) + "\"";
  return "\"" + std::string(cutText(text, longestText)) + "...\" (" + std::to_string(text.size()) + " bytes)";
}

std::string shownReal(double value) {
  char digits[40];
  return {digits, std::to_chars(digits, digits + sizeof digits, value).ptr};
}

/// Writes items as text until there is enough of it.
class TextWriter {
 public:
  void item(ItemReader& items) {
    if (_text.size() > longestLine) {
      items.skip();
      return;
    }
    switch (items.peek()) {
      case Tag::absent:
        items.takeAbsent();
        _text += "null";
        return;
      case Tag::no:
      case Tag::yes:
        _text += items.boolean() ? "true" : "false";
        return;
      case Tag::number:
        _text += std::to_string(items.number());
        return;
      case Tag::negative:
        _text += std::to_string(items.signedNumber());
        return;
      case Tag::real:
        _text += shownReal(items.real());
        return;
      case Tag::text:
        _text += shownText(items.text());
        return;
      case Tag::data:
        _text += "<" + std::to_string(items.data().size()) + " bytes>";
        return;
      case Tag::date: {
        const platform::Date date{items.date()};
        const auto text = platform::dateText(date);
        _text += text ? std::string(std::string_view(*text)) : shownReal(date.seconds);
        return;
      }
      default:
        return compound(items);
    }
  }
  std::string take() {
    if (_text.size() > longestLine) {
      _text.resize(cutText(_text, longestLine).size());
      _text += "...";
    }
    return std::move(_text);
  }
  std::string& text() { return _text; }

 private:
  void compound(ItemReader& items) {
    switch (items.peek()) {
      case Tag::list:
        return parts("[", items.list(), items, "]", false);
      case Tag::dictionary:
        return parts("{", items.dictionary(), items, "}", true);
      case Tag::packed: {
        ItemReader inside{{}};
        return item(items.unpacked(inside));
      }
      case Tag::error: {
        items.error();
        _text += items.text();
        _text += ' ';
        item(items);
        const auto description = items.text();
        if (!description.empty()) _text += ": " + std::string(description);
        if (items.takeAbsent()) return;
        _text += " because of ";
        return item(items);
      }
      default: {
        const auto mention = items.object();
        _text += nameOf(mention.kind);
        _text += "#" + std::to_string(mention.number);
        if (!(mention.flags & ObjectMention::hasFacts)) return;
        _text += ' ';
        return item(items);
      }
    }
  }

  void parts(const char* begin, std::size_t count, ItemReader& items, const char* end, bool named) {
    _text += begin;
    for (std::size_t i = 0; i < count; ++i) {
      if (i > 0) _text += ", ";
      if (named) _text += std::string(items.text()) + ": ";
      item(items);
    }
    _text += end;
  }

  std::string _text;
};

std::string itemsText(std::string_view names, std::string_view payload) {
  TextWriter writer;
  try {
    for (ItemReader items(payload); !items.atEnd();) {
      if (!writer.text().empty()) writer.text() += ", ";
      const auto name = nextName(names);
      if (!name.empty() && name != "->") writer.text() += std::string(name) + " ";
      writer.item(items);
    }
  } catch (const RecordingError& error) {
    writer.text() += std::string(" (") + error.what() + ")";
  }
  return writer.take();
}

}  // namespace

std::string itemText(std::string_view item) { return itemsText({}, item); }

std::string callLine(const OperationName& operation, std::string_view arguments) {
  const std::string_view parameters(operation.parameters);
  return operation.service + "." + operation.name + "(" +
         itemsText(parameters.substr(0, parameters.find("->")), arguments) + ")";
}

std::string resultLine(const OperationName& operation, std::string_view result) {
  return operation.service + "." + operation.name + " returns " + (result.empty() ? "" : itemsText({}, result));
}

std::string throwLine(const OperationName& operation, std::string_view thrown) {
  std::string text;
  try {
    ItemReader items(thrown);
    if (items.atEnd() || items.peek() == Tag::absent)
      text = "that there is no memory";
    else if (items.peek() == Tag::no)
      text = "no exception of the standard library";
    else if (items.peek() == Tag::yes)
      text = "what was thrown inside of it";
    if (!text.empty() && !items.atEnd()) thrown.remove_prefix(items.skip().size());
  } catch (const RecordingError&) {
    text.clear();
  }
  if (!text.empty() && !thrown.empty()) text += ", ";
  return operation.service + "." + operation.name + " throws " + text + itemsText({}, thrown);
}

std::string eventLine(EventKind kind, const OperationName& operation, std::string_view items) {
  if (opens(kind)) return callLine(operation, items);
  const bool isThrown = kind == EventKind::threw || kind == EventKind::thrown;
  return isThrown ? throwLine(operation, items) : resultLine(operation, items);
}

OperationClass classOf(const OperationName& operation) {
  // What describes itself does so in a message.
  if (operation.service == "LogHandle" || operation.name == "TSGetLogCategory" || operation.name == "describe")
    return OperationClass::message;
  if (operation.name == "logStep" || operation.name == "logScenario") return OperationClass::step;
  if (operation.service == "Clock") return OperationClass::wait;
  return OperationClass::service;
}

namespace {

void collect(ItemReader& items, std::deque<std::uint64_t>& numbers) {
  switch (items.peek()) {
    case Tag::object: {
      const auto mention = items.object();
      if (mention.flags & ObjectMention::isNew) numbers.push_back(mention.number);
      if (mention.flags & ObjectMention::hasFacts) items.skip();
      return;
    }
    case Tag::list:
    case Tag::packed: {
      ItemReader inside{{}};
      ItemReader& list = items.unpacked(inside);
      if (list.peek() != Tag::list) return;
      for (std::size_t count = list.list(); count > 0; --count) collect(list, numbers);
      return;
    }
    default:
      items.skip();
  }
}

}  // namespace

std::deque<std::uint64_t> newObjectsOf(const Event& event) {
  std::deque<std::uint64_t> numbers;
  try {
    for (ItemReader items(event.payload, &event.large); !items.atEnd();) collect(items, numbers);
  } catch (const RecordingError&) {
    return numbers;
  }
  return numbers;
}

}  // namespace record
