#include "plist/XMLReader.h"

#include <expat.h>

#include <algorithm>
#include <charconv>
#include <cstring>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "platform/DateText.h"
#include "platform/ValueBuilder.h"
#include "plist/Base64.h"
#include "plist/Failure.h"
#include "plist/Unicode.h"

namespace plist {
namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;
using platform::ValueBuilder;

enum class Element : std::uint8_t {
  none,
  plist,
  array,
  dictionary,
  key,
  string,
  integer,
  real,
  date,
  data,
  trueValue,
  falseValue,
};

/// Compares with the names themselves and not with a table: this runs for every element.
Element elementNamed(std::string_view name) {
  switch (name.size()) {
    case 3:
      if (name == "key") return Element::key;
      break;
    case 4:
      if (name == "dict") return Element::dictionary;
      if (name == "true") return Element::trueValue;
      if (name == "real") return Element::real;
      if (name == "date") return Element::date;
      if (name == "data") return Element::data;
      break;
    case 5:
      if (name == "array") return Element::array;
      if (name == "false") return Element::falseValue;
      if (name == "plist") return Element::plist;
      break;
    case 6:
      if (name == "string") return Element::string;
      break;
    case 7:
      if (name == "integer") return Element::integer;
      break;
  }
  return Element::none;
}

bool isBlank(char character) { return character == '\t' || character == '\n' || character == ' ' || character == '\r'; }

std::string_view trimmed(std::string_view text) {
  while (!text.empty() && isBlank(text.front())) text.remove_prefix(1);
  while (!text.empty() && isBlank(text.back())) text.remove_suffix(1);
  return text;
}

/// The number that the whole text is, with at most one sign.
template <class Number, class... Format>
std::errc parse(std::string_view text, Number& number, Format... format) {
  if (text.starts_with('+')) {
    text.remove_prefix(1);
    if (text.starts_with('-')) return std::errc::invalid_argument;
  }
  auto [end, result] = std::from_chars(text.data(), text.data() + text.size(), number, format...);
  if (result != std::errc()) return result;
  return end == text.data() + text.size() ? std::errc() : std::errc::invalid_argument;
}

struct ParserDeleter {
  void operator()(XML_Parser parser) const { XML_ParserFree(parser); }
};
using Parser = std::unique_ptr<std::remove_pointer_t<XML_Parser>, ParserDeleter>;

constexpr std::string_view dataTag = "<data>";

/// What stands between such a tag and the next one, which ends the element.
struct LongData {
  std::size_t begin, end;
};

/// The next of them from the byte `at` on that is worth finding: surely one that is twice as long as a block. Mostly
/// nothing is looked at but the first tag of each block.
std::optional<LongData> nextLongData(std::string_view input, std::size_t at) {
  constexpr std::size_t block = 256;
  while (input.size() - at > block) {
    if (input.substr(at, block).find('<') != input.npos) {
      at += block;
      continue;
    }
    std::size_t before = input.rfind('<', at), end = input.find('<', at + block);
    if (end == input.npos) break;
    if (before != input.npos && input.substr(before).starts_with(dataTag) && input.substr(end).starts_with("</data")) {
      return LongData{before + dataTag.size(), end};
    }
    at = end;
  }
  return {};
}

/// How many lines end in the text, as the parser counts them.
std::size_t lineEnds(std::string_view text) {
  std::size_t count = 0;
  char before = 0;
  for (char character : text) {
    count += character == '\r' || (character == '\n' && before != '\r');
    before = character;
  }
  return count;
}

/// Reads one document.
///
/// Long data is not shown to the parser: no rule of XML concerns text that is base64. Behind the tag <data> the parser
/// goes on with </data>.
///
/// The parser hands out text in pieces of its own copy of the input. Where the pieces of a text follow one another
/// there, as they nearly always do, the text is taken from the input itself. What has been read of the open containers
/// waits in _pending until its container ends and its size is known. After an error the parser may deliver a few more
/// events; they are ignored.
class XMLReader {
 public:
  /// `encoding` may be null: what the document says.
  XMLReader(platform::Bytes input, const char* encoding)
      : _builder(std::move(input)), _input(_builder.input()), _parser(XML_ParserCreate(encoding)) {
    if (!_parser) throw std::bad_alloc();
  }

  Value read(platform::ErrorRef& error);

 private:
  struct Container {
    Element element;
    std::size_t first;  // of its values in _pending
    bool hasKey;
    std::string_view key;
  };
  /// The bits of an entry; an array's values have no key.
  struct PendingEntry {
    alignas(Dictionary::Entry) std::byte bits[sizeof(Dictionary::Entry)];
    const Dictionary::Entry& entry() const { return *reinterpret_cast<const Dictionary::Entry*>(bits); }
  };

  void setHandlers();
  void parse();
  XML_Status parsePiece(std::size_t from, std::size_t end);
  bool passOver(LongData found);
  std::size_t place() const;
  const char* inInput(std::string_view piece);
  template <class Event>
  static void deliver(void* reader, Event event);
  void start(const char* name);
  void end();
  void text(std::string_view piece);

  void open(Element element);
  void endLeaf();
  void endContainer();
  void add(const Value& value);
  std::string_view keptText();
  Value integer(std::string_view text);
  Value real(std::string_view text);
  Value date(std::string_view text);
  Value data(std::string_view text);
  std::optional<std::string_view> decoded(std::string_view text);
  Value array(std::size_t first);
  Value dictionary(std::size_t first);
  void fail(ErrorCode code, const std::string& description);

  ValueBuilder _builder;
  std::string_view _input;
  Parser _parser;
  std::string_view _copy;   // what the parser holds of the input, from the piece's first text on
  std::size_t _copyAt = 0;  // where that begins in the input
  bool _knowsCopy = false;
  std::vector<std::string_view> _passedOver;  // of the input, not shown to the parser
  std::size_t _passedOverSize = 0;
  std::vector<Container> _open;
  std::vector<PendingEntry> _pending;
  Element _leaf = Element::none;  // the element without children that is open
  bool _takesText = false;        // so does the leaf, if there is one
  std::string_view _text;         // of the leaf: in the input, or all of _textBuffer
  bool _textInInput = true;
  std::string _textBuffer;
  std::size_t _dataBegin = 0;                // where the text of the last data begins, if its tag is plain
  std::optional<std::string_view> _decoded;  // of the data that is open, if its text was passed over
  platform::ErrorRef _error;
};

Value XMLReader::read(platform::ErrorRef& error) {
  setHandlers();
  parse();
  error = _error;
  if (_error) return {};
  return _builder.finish(_pending.front().entry().value);
}

void XMLReader::setHandlers() {
  XML_SetUserData(_parser.get(), this);
  XML_SetElementHandler(
      _parser.get(),
      [](void* reader, const char* name, const char**) {
        deliver(reader, [name](XMLReader& self) { self.start(name); });
      },
      [](void* reader, const char*) { deliver(reader, [](XMLReader& self) { self.end(); }); });
  XML_SetCharacterDataHandler(_parser.get(), [](void* reader, const char* piece, int size) {
    deliver(reader, [=](XMLReader& self) { self.text({piece, static_cast<std::size_t>(size)}); });
  });
  // Before its first declaration: some take the parser a time that grows with the square of their length.
  XML_SetStartDoctypeDeclHandler(_parser.get(), [](void* reader, const char*, const char*, const char*,
                                                   int hasDeclarations) {
    if (!hasDeclarations) return;
    deliver(reader, [](XMLReader& self) { self.fail(ErrorCode::unsupported, "a document type with declarations"); });
  });
  XML_SetSkippedEntityHandler(_parser.get(), [](void* reader, const char*, int) {
    deliver(reader, [](XMLReader& self) { self.fail(ErrorCode::unsupported, "an entity that is declared elsewhere"); });
  });
}

/// The parser is plain C: nothing may be thrown through it.
template <class Event>
void XMLReader::deliver(void* reader, Event event) {
  auto& self = *static_cast<XMLReader*>(reader);
  if (self._error) return;
  try {
    event(self);
  } catch (const std::bad_alloc&) {
    self.fail(ErrorCode::outOfMemory, "out of memory");
  } catch (...) {
    self.fail(ErrorCode::tooLarge, "more than memory can hold");
  }
}

static ErrorCode codeOf(XML_Error reason) {
  if (reason == XML_ERROR_NO_MEMORY) return ErrorCode::outOfMemory;
  return reason == XML_ERROR_UNKNOWN_ENCODING ? ErrorCode::unsupported : ErrorCode::malformed;
}

/// In as few pieces as can be: each further one has the parser count the lines of the one before, and begin anew at the
/// start of whatever was cut. So a first cut that was none between a tag and its data is the last.
void XMLReader::parse() {
  XML_Status status = XML_STATUS_OK;
  std::size_t at = 0;
  while (status == XML_STATUS_OK) {
    std::optional<LongData> found = nextLongData(_input, at);
    // In a CDATA section a tag is text, and a cut would show in what is said of that.
    if (!found || _input.substr(at, found->begin - at).find("<![") != _input.npos) break;
    status = parsePiece(at, found->begin);
    at = found->begin;
    if (status != XML_STATUS_OK || _leaf != Element::data || _dataBegin != at || !passOver(*found)) break;
    at = found->end;
  }
  if (status == XML_STATUS_OK && !_error) status = parsePiece(at, _input.size());
  if (_error) return;
  if (status != XML_STATUS_OK) {
    XML_Error reason = XML_GetErrorCode(_parser.get());
    fail(codeOf(reason), XML_ErrorString(reason));
  } else if (_pending.empty()) {
    fail(ErrorCode::malformed, "<plist> without a value");
  }
}

/// The input from one byte to another, as much at a time as the parser takes.
XML_Status XMLReader::parsePiece(std::size_t from, std::size_t end) {
  constexpr std::size_t most = std::size_t{1} << 30;
  XML_Status status = XML_STATUS_OK;
  for (std::size_t size; status == XML_STATUS_OK && from < end; from += size) {
    size = std::min(end - from, most);
    _knowsCopy = false;
    status = XML_Parse(_parser.get(), _input.data() + from, static_cast<int>(size), from + size == _input.size());
  }
  return status;
}

/// Decodes the data that was just opened. False if it is not plain base64: the parser has to see it then.
bool XMLReader::passOver(LongData found) {
  deliver(this, [found](XMLReader& self) {
    std::string_view text = self._input.substr(found.begin, found.end - found.begin);
    self._decoded = self.decoded(text);
    if (!self._decoded) return;
    self._passedOver.push_back(text);
    self._passedOverSize += text.size();
  });
  return _decoded.has_value();
}

void XMLReader::fail(ErrorCode code, const std::string& description) {
  if (_error) return;
  std::size_t line = XML_GetCurrentLineNumber(_parser.get());
  for (std::string_view text : _passedOver) line += lineEnds(text);
  _error = failure(code, "line " + std::to_string(line) + ": " + description);
  XML_StopParser(_parser.get(), XML_FALSE);
}

void XMLReader::start(const char* name) {
  Element element = elementNamed(name);
  if (element == Element::none) return fail(ErrorCode::malformed, "no element is named " + quoted(name));
  if (_leaf != Element::none) return fail(ErrorCode::malformed, "an element inside one that holds text only");
  if (_open.empty() != (element == Element::plist)) {
    return fail(ErrorCode::malformed, "<plist> must be the outermost element and no other");
  }
  if (element == Element::key) {
    if (_open.back().element != Element::dictionary) return fail(ErrorCode::malformed, "<key> outside of <dict>");
    if (_open.back().hasKey) return fail(ErrorCode::malformed, "a key instead of the value of the key before");
  } else if (element != Element::plist) {
    const Container& container = _open.back();
    if (container.element == Element::dictionary && !container.hasKey) {
      return fail(ErrorCode::malformed, "a value without a key");
    }
    if (container.element == Element::plist && !_pending.empty()) {
      return fail(ErrorCode::malformed, "<plist> with a second value");
    }
  }
  open(element);
}

void XMLReader::open(Element element) {
  if (element == Element::array || element == Element::dictionary || element == Element::plist) {
    // The <plist> element itself is not counted.
    if (_open.size() > maximumDepth) {
      return fail(ErrorCode::tooDeep, "containers more than " + std::to_string(maximumDepth) + " deep");
    }
    _open.push_back({element, _pending.size(), false, {}});
    return;
  }
  if (element == Element::data) _dataBegin = place() + dataTag.size();
  _leaf = element;
  _takesText = element != Element::trueValue && element != Element::falseValue;
  _text = {};
  _textInInput = true;
}

void XMLReader::text(std::string_view piece) {
  if (!_takesText) {
    if (std::all_of(piece.begin(), piece.end(), isBlank)) return;
    return fail(ErrorCode::malformed, "text " + quoted(trimmed(piece)) + " between values");
  }
  if (_textInInput) {
    const char* at = inInput(piece);
    if (at && (_text.empty() || _text.data() + _text.size() == at)) {
      _text = {_text.empty() ? at : _text.data(), _text.size() + piece.size()};
      return;
    }
    _textInInput = false;
    _textBuffer = _text;
  }
  _textBuffer += piece;
  _text = _textBuffer;
}

/// Where in the input the present event begins.
std::size_t XMLReader::place() const {
  return static_cast<std::size_t>(XML_GetCurrentByteIndex(_parser.get())) + _passedOverSize;
}

/// Where the piece lies in the input. Null if it does not: the parser made it from a reference, a line end of two
/// characters, or another encoding.
const char* XMLReader::inInput(std::string_view piece) {
  if (!_knowsCopy) {
    int offset = 0, size = 0;
    const char* context = XML_GetInputContext(_parser.get(), &offset, &size);
    _knowsCopy = true;
    // From the event on: what the parser holds before that need not follow one another in the input.
    _copy = context ? std::string_view(context + offset, static_cast<std::size_t>(size - offset)) : std::string_view();
    _copyAt = place();
  }
  std::size_t at = reinterpret_cast<std::uintptr_t>(piece.data()) - reinterpret_cast<std::uintptr_t>(_copy.data());
  return at < _copy.size() && piece.size() <= _copy.size() - at ? _input.data() + _copyAt + at : nullptr;
}

/// The leaf's text, where it stays as long as the document's values.
std::string_view XMLReader::keptText() {
  if (_text.empty()) return {"", 0};
  if (_textInInput) return _text;
  char* kept = _builder.allocateText(_text.size());
  std::memcpy(kept, _text.data(), _text.size());
  return {kept, _text.size()};
}

void XMLReader::end() {
  if (_leaf != Element::none) {
    endLeaf();
    _leaf = Element::none;
    _takesText = false;
  } else {
    endContainer();
  }
}

void XMLReader::endLeaf() {
  switch (_leaf) {
    case Element::key:
      _open.back().key = keptText();
      _open.back().hasKey = true;
      return;
    case Element::string:
      return add(ValueBuilder::string(keptText()));
    case Element::integer:
      return add(integer(trimmed(_text)));
    case Element::real:
      return add(real(trimmed(_text)));
    case Element::date:
      return add(date(trimmed(_text)));
    case Element::data:
      return add(_decoded ? ValueBuilder::data(*std::exchange(_decoded, {})) : data(_text));
    default:
      return add(Value(_leaf == Element::trueValue));
  }
}

void XMLReader::endContainer() {
  Container container = _open.back();
  if (container.hasKey) return fail(ErrorCode::malformed, "the key " + quoted(container.key) + " without a value");
  _open.pop_back();
  if (container.element == Element::array) add(array(container.first));
  if (container.element == Element::dictionary) add(dictionary(container.first));
}

/// Adds a value to the container that is open. An absent one comes after an error.
void XMLReader::add(const Value& value) {
  if (value.isAbsent()) return;
  Container& container = _open.back();
  PendingEntry& pending = _pending.emplace_back();
  // Contained values own nothing, so their bits are all there is to copy.
  auto* entry = ::new (pending.bits) Dictionary::Entry{container.key, Value()};
  std::memcpy(static_cast<void*>(&entry->value), static_cast<const void*>(&value), sizeof(Value));
  container.hasKey = false;
}

/// Decimal with an optional sign, or hexadecimal after "0x".
Value XMLReader::integer(std::string_view text) {
  std::int64_t number = 0;
  std::uint64_t large = 0;
  std::errc result;
  if (text.starts_with("0x") || text.starts_with("0X")) {
    std::string_view digits = text.substr(2);
    bool sign = digits.starts_with('+');
    result = sign ? std::errc::invalid_argument : plist::parse(digits, large, 16);
  } else {
    result = plist::parse(text, number);
    if (result == std::errc()) return Value(number);
    if (result == std::errc::result_out_of_range && !text.starts_with('-')) result = plist::parse(text, large);
  }
  if (result == std::errc()) return Value(large);
  if (result == std::errc::result_out_of_range) {
    fail(ErrorCode::outOfRange, "the integer " + quoted(text) + " is beyond 64 bits");
  } else {
    fail(ErrorCode::malformed, quoted(text) + " is not an integer");
  }
  return {};
}

Value XMLReader::real(std::string_view text) {
  double number = 0;
  // A NaN may carry a payload for the parser below, but not here.
  bool payload = text.ends_with(')');
  std::errc result = payload ? std::errc::invalid_argument : plist::parse(text, number);
  if (result == std::errc()) return Value(number);
  if (result == std::errc::result_out_of_range) {
    fail(ErrorCode::outOfRange, "the real " + quoted(text) + " is beyond what a real can be");
  } else {
    fail(ErrorCode::malformed, quoted(text) + " is not a real");
  }
  return {};
}

Value XMLReader::date(std::string_view text) {
  if (auto date = platform::dateFromText(text)) return Value(*date);
  fail(ErrorCode::malformed, quoted(text) + " is not a date of the form YYYY-MM-DDThh:mm:ssZ");
  return {};
}

Value XMLReader::data(std::string_view text) {
  if (auto bytes = decoded(text)) return ValueBuilder::data(*bytes);
  fail(ErrorCode::malformed, "<data> that is not base64");
  return {};
}

/// The bytes that the text stands for. Nothing if it is not base64.
std::optional<std::string_view> XMLReader::decoded(std::string_view text) {
  std::size_t room = base64Room(text);
  char* bytes = _builder.allocateText(room);
  std::optional<std::size_t> size = readBase64(text, bytes);
  _builder.giveBackText(room - size.value_or(0));
  if (!size) return {};
  return std::string_view(bytes, *size);
}

Value XMLReader::array(std::size_t first) {
  Array& array = _builder.makeArray(_pending.size() - first);
  void* place = ValueBuilder::places(array);
  for (std::size_t at = first; at < _pending.size(); ++at) {
    std::memcpy(place, static_cast<const void*>(&_pending[at].entry().value), sizeof(Value));
    place = static_cast<Value*>(place) + 1;
  }
  _pending.resize(first);
  return ValueBuilder::contained(array);
}

Value XMLReader::dictionary(std::size_t first) {
  std::size_t count = _pending.size() - first;
  Dictionary& dictionary = _builder.makeDictionary(count);
  void* places = ValueBuilder::places(dictionary);
  if (count) std::memcpy(places, &_pending[first], count * sizeof(PendingEntry));
  _pending.resize(first);
  if (auto twice = _builder.seal(dictionary)) {
    fail(ErrorCode::duplicateKey, "the key " + quoted(dictionary.begin()[*twice].key) + " appears twice");
    return {};
  }
  return ValueBuilder::contained(dictionary);
}

}  // namespace

Value readXML(platform::Bytes input, platform::ErrorRef& error) {
  // The parser lets broken surrogate pairs pass, so UTF-16 is checked and converted before.
  std::string_view start = std::string_view(input).substr(0, 2);
  bool mark = start == "\xff\xfe" || start == "\xfe\xff";
  if (!mark && start.find('\0') == std::string_view::npos) return XMLReader(std::move(input), nullptr).read(error);
  ByteOrder order = start[0] == '\xfe' || start[0] == '\0' ? ByteOrder::big : ByteOrder::little;
  std::string_view utf16 = std::string_view(input).substr(mark ? 2 : 0);
  std::optional<std::size_t> size = utf8Size(utf16, order);
  if (!size) {
    error = failure(ErrorCode::malformed, "the document is not valid UTF-16");
    return {};
  }
  platform::Bytes converted(*size, '\0');
  writeUTF8(utf16, order, converted.data());
  return XMLReader(std::move(converted), "UTF-8").read(error);
}

}  // namespace plist
