#include "record/Redact.h"

#include <algorithm>

#include "record/RecordingError.h"
#include "record/redacting/Secrets.h"
#include "record/replaying/Story.h"
#include "record/stream/EventReader.h"
#include "record/stream/EventWriter.h"

namespace record {

namespace {

bool isOneOf(std::string_view text, std::initializer_list<std::string_view> texts) {
  return std::find(texts.begin(), texts.end(), text) != texts.end();
}

/// Of an entry whose text is of the protocol.
bool isFixedEntry(std::string_view key) {
  return isOneOf(key, {"version", "bundleVersion", "KBBundleVersion", "Version", "operation", "applicationType",
                       "dataclass", "assetType"});
}

/// Of a parameter, of an operation that answers one, or of an error's parts.
bool isFixedArgument(std::string_view name) {
  return isOneOf(name, {"hostAnchor", "newAnchor", "name", "mainBundleIdentifier", "temporaryDirectory", "describe",
                        "textOfErrorNumber"});
}

/// Whether a text that it answers is bytes: the content of a file or a picture.
bool answersBytes(const Event& event, const OperationName& operation) {
  return (event.kind == EventKind::answer || event.kind == EventKind::threw) &&
         isOneOf(operation.name, {"readFile", "dataWithPropertyList", "QGImageDestinationCreateWithData",
                                  "QGImageDestinationAddImage", "QGImageDestinationFinalize"});
}

bool isLetter(char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z'); }

template <class Visit>
void forEachWord(std::string_view text, Visit visit) {
  for (std::size_t at = 0; at < text.size();) {
    std::size_t end = at;
    while (end < text.size() && isLetter(text[end])) ++end;
    if (end > at) visit(text.substr(at, end - at));
    at = std::max(end, at + 1);
  }
}

/// Goes through a recording and finds out what is somebody's.
class Collection {
 public:
  explicit Collection(Secrets& secrets) : _secrets(secrets) {}

  void look(const Event& event, const OperationName& operation) {
    std::string_view names(operation.parameters);
    const bool begins = opens(event.kind);
    const bool isHeard =
        event.kind == EventKind::answer || event.kind == EventKind::enter || event.kind == EventKind::threw;
    const bool isBytes = answersBytes(event, operation);
    ItemReader items(event.payload);
    // What an exception says is like what an error says.
    if (event.kind == EventKind::threw && !items.atEnd()) items.skip();
    while (!items.atEnd()) {
      const auto name = begins ? nextName(names) : std::string_view(operation.name);
      if (isHeard && !(isBytes && items.peek() == Tag::text))
        hear(items, name, isFixedArgument(name));
      else if (event.kind == EventKind::call && isOneOf(name, {"message", "description", "scenario"}))
        say(items);
      else
        items.skip();
    }
  }

 private:
  /// A word that the plug-in knows without having heard it is one of its own.
  void say(ItemReader& items) {
    if (items.peek() != Tag::text) return void(items.skip());
    forEachWord(items.text(), [this](std::string_view word) {
      if (!_heard.contains(word)) _secrets.keep(word);
    });
  }

  void text(std::string_view text, bool isFixed) {
    forEachWord(text, [this](std::string_view word) { _heard.emplace(word); });
    if (!isFixed) _secrets.add(text);
  }

  /// What somebody tells the plug-in.
  void hear(ItemReader& items, std::string_view name, bool isFixed) {
    switch (items.peek()) {
      case Tag::text:
        return text(items.text(), isFixed);
      case Tag::number:
        if (const auto number = items.number(); isOneOf(name, {"DSPersonID", "storePID"})) _secrets.add(number);
        return;
      case Tag::list:
        for (std::size_t count = items.list(); count > 0; --count) hear(items, name, isFixed);
        return;
      case Tag::dictionary:
        for (std::size_t count = items.dictionary(); count > 0; --count) {
          const auto key = items.text();
          text(key, !isTellingKey(key));
          hear(items, key, isFixedEntry(key));
        }
        return;
      case Tag::error:
        items.error();
        for (int part = 0; part < 4; ++part) hear(items, {}, true);
        return;
      case Tag::object:
        if (items.object().flags & ObjectMention::hasFacts) hear(items, name, isFixed);
        return;
      case Tag::packed: {
        ItemReader inside(items.packedBytes());
        return hear(inside, name, isFixed);
      }
      default:
        items.skip();
    }
  }

  Secrets& _secrets;
  std::set<std::string, std::less<>> _heard;
};

/// Writes items anew.
class Rewriting {
 public:
  explicit Rewriting(Secrets& secrets) : _secrets(secrets) {}

  std::string_view payload(const Event& event, const OperationName& operation) {
    _items.clear();
    const bool isBytes = answersBytes(event, operation);
    ItemReader items(event.payload);
    if (event.kind == EventKind::threw && !items.atEnd()) whole(items);
    while (!items.atEnd()) {
      if (isBytes && items.peek() == Tag::text)
        _items.text(_secrets.replacedBytes(items.text()));
      else
        whole(items);
    }
    return _items.bytes();
  }

 private:
  /// An argument: packed when it is large, as it is when it is recorded.
  void whole(ItemReader& items) {
    ItemReader inside{{}};
    const std::size_t begin = _items.bytes().size();
    const std::size_t size = items.rest().size();
    ItemReader& from = items.unpacked(inside);
    const bool wasPacked = &from != &items;
    const bool isDictionary = from.peek() == Tag::dictionary;
    item(from);
    const bool wasSmall = size - items.rest().size() < packedFrom;
    if (wasPacked || (isDictionary && wasSmall)) _items.packFrom(begin);
  }

  void item(ItemReader& items) {
    switch (items.peek()) {
      case Tag::text:
        return _items.text(_secrets.replaced(items.text()));
      case Tag::data:
        return _items.data(_secrets.replacedBytes(items.data()));
      case Tag::number:
        return _items.number(_secrets.replaced(items.number()));
      case Tag::list: {
        std::size_t count = items.list();
        _items.list(count);
        while (count-- > 0) item(items);
        return;
      }
      case Tag::dictionary:
        return dictionary(items, false);
      case Tag::error:
        items.error();
        _items.error();
        for (int part = 0; part < 4; ++part) item(items);
        return;
      case Tag::object: {
        const auto mention = items.object();
        _items.object(mention);
        if (!(mention.flags & ObjectMention::hasFacts)) return;
        return items.peek() == Tag::dictionary ? dictionary(items, true) : item(items);
      }
      case Tag::packed:
        return whole(items);
      default:
        _items.items(items.skip());
    }
  }

  void dictionary(ItemReader& items, bool isOfFacts) {
    std::size_t count = items.dictionary();
    _items.dictionary(count);
    while (count-- > 0) {
      const auto key = items.text();
      // Facts have names of this library's.
      _items.text(isOfFacts ? std::string(key) : _secrets.replaced(key));
      isOfFacts ? whole(items) : item(items);
    }
  }

  Secrets& _secrets;
  ItemWriter _items;
};

void collect(std::string_view recording, Secrets& secrets) {
  EventReader reader(recording);
  Collection collection(secrets);
  Event event;
  while (reader.next(event)) collection.look(event, reader.operations()[event.operation]);
  secrets.number();
}

}  // namespace

RedactionFacts redact(std::string_view recording, std::shared_ptr<Sink> sink) {
  RedactionFacts facts;
  Secrets secrets;
  EventReader reader(recording);
  try {
    collect(recording, secrets);
    facts.replaced = secrets.size();
    EventWriter writer(std::move(sink));
    Rewriting rewriting(secrets);
    std::size_t threads = 0;
    std::size_t operations = 0;
    Event event;
    while (reader.next(event)) {
      while (threads < reader.threads().size()) writer.addThread(reader.threads()[threads++]);
      while (operations < reader.operations().size()) writer.addOperation(reader.operations()[operations++]);
      writer.write(event.kind, event.thread, event.operation, event.time,
                   rewriting.payload(event, reader.operations()[event.operation]));
      ++facts.events;
    }
    facts.isWhole = reader.isWhole();
    facts.problem = reader.problem();
    facts.isWhole ? writer.finish() : writer.flush();
    if (writer.failed()) facts.problem = "the redacted recording cannot be written";
  } catch (const RecordingError& error) {
    facts.problem = "event " + std::to_string(facts.events + 1) + ": " + error.what();
  }
  return facts;
}

}  // namespace record
