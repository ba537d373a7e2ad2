#include "record/stream/EventReader.h"

#include <zstd.h>

#include <algorithm>
#include <new>
#include <utility>

#include "record/RecordingError.h"
#include "record/stream/Item.h"
#include "record/stream/StreamFormat.h"

namespace record {

using stream::Entry;
using stream::Known;

namespace {

constexpr int largestWindowLog = 23;
constexpr std::size_t mostParts = std::size_t{1} << 24;

/// The recording ends in the middle of an event.
struct Cut {};

[[noreturn]] void refuse(const std::string& what) { throw RecordingError(what); }

}  // namespace

struct EventReader::Decompression {
  struct Free {
    void operator()(ZSTD_DCtx* freed) const { ZSTD_freeDCtx(freed); }
  };
  std::unique_ptr<ZSTD_DCtx, Free> context{ZSTD_createDCtx()};
  std::string room = std::string(ZSTD_DStreamOutSize(), '\0');
  ZSTD_inBuffer in{};
  bool ended = false;
};

EventReader::EventReader(std::string_view bytes, Large large)
    : _large(large), _decompression(std::make_unique<Decompression>()) {
  if (!_decompression->context) throw std::bad_alloc();
  ZSTD_DCtx_setParameter(_decompression->context.get(), ZSTD_d_windowLogMax, largestWindowLog);
  _over = true;
  if (!bytes.starts_with(recordingMagic)) {
    if (!recordingMagic.starts_with(bytes)) _problem = "this is no recording";
    return;
  }
  bytes.remove_prefix(recordingMagic.size());
  if (bytes.empty()) return;
  const auto version = static_cast<unsigned char>(bytes.front());
  if (version == 0 || version > recordingVersion) {
    _problem = "the recording has version " + std::to_string(version) + ", this program reads versions up to " +
               std::to_string(recordingVersion);
    return;
  }
  bytes.remove_prefix(1);
  _decompression->in = {bytes.data(), bytes.size(), 0};
  _over = false;
}

EventReader::~EventReader() = default;

bool EventReader::next(Event& event) {
  if (_over) return false;
  try {
    if (readEvent(event)) return true;
  } catch (const Cut&) {
    // What is left of an event that was being written.
  } catch (const RecordingError& error) {
    _problem = "event " + std::to_string(_events + 1) + ": " + error.what();
  }
  _over = true;
  return false;
}

bool EventReader::readEvent(Event& event) {
  while (true) {
    if (_window.empty() && !refill()) return false;
    const std::uint8_t head = byte();
    const auto entry = static_cast<Entry>(head & stream::entryMask);
    if (entry == Entry::thread) {
      if (_threads.size() == mostThreads) refuse("there are too many threads");
      _threads.push_back(shortText());
      _frames.emplace_back();
    } else if (entry == Entry::operation) {
      if (_operations.size() == mostOperations) refuse("there are too many operations");
      OperationName operation;
      for (auto* text : {&operation.service, &operation.name, &operation.parameters}) *text = shortText();
      _operations.push_back(std::move(operation));
    } else if (entry == Entry::end) {
      _whole = true;
      return false;
    } else if (entry > Entry::end && entry != Entry::thrown) {
      refuse("there is no event of this sort");
    } else {
      event.kind = static_cast<EventKind>(entry);
      event.thread = head & stream::sameThread ? _lastThread : static_cast<std::uint32_t>(count(UINT32_MAX, "thread"));
      enterInto(event);
      return true;
    }
  }
}

void EventReader::enterInto(Event& event) {
  if (event.thread >= _threads.size()) refuse("it is of a thread that is not known");
  event.operation = 0;
  event.time = 0;
  if (opens(event.kind)) {
    event.operation = static_cast<std::uint32_t>(count(UINT32_MAX, "operation"));
    if (event.operation >= _operations.size()) refuse("it is of an operation that is not known");
  }
  if (event.kind == EventKind::enter) event.time = varint();
  event.payload.clear();
  event.large.clear();
  _apart = 0;
  for (std::uint64_t items = count(mostParts, "number of items"); items > 0; --items) item(event, 0);
  place(event);
  _lastThread = event.thread;
  event.number = ++_events;
}

/// Follows which thread is inside the plug-in and where each one stands.
void EventReader::place(Event& event) {
  auto& frames = _frames[event.thread];
  const bool fromInside = event.kind == EventKind::call || leaves(event.kind);
  if (fromInside ? _inside != event.thread : _inside.has_value())
    refuse("the plug-in has one thread inside it at a time");
  if (opens(event.kind)) {
    if (frames.size() > deepestItem) refuse("calls are nested too deeply");
    frames.push_back({event.kind, event.operation});
  } else {
    const auto opened = leaves(event.kind) ? EventKind::enter : EventKind::call;
    if (frames.empty() || frames.back().kind != opened) refuse("something ends that has not begun");
    event.operation = frames.back().operation;
    frames.pop_back();
  }
  _inside = fromInside ? std::nullopt : std::optional(event.thread);
}

void EventReader::bounded(const std::string& payload) const {
  if (payload.size() > largestPayload) refuse("an event is too large");
}

void EventReader::appendSized(std::string& into, std::uint8_t tag, std::string_view bytes) const {
  into.push_back(static_cast<char>(tag));
  appendVarint(into, bytes.size());
  into.append(bytes);
  bounded(into);
}

/// Reads one item, and puts in what stands for known texts.
void EventReader::item(Event& event, std::size_t depth) {
  std::string& into = event.payload;
  if (depth > deepestItem) refuse("an item is nested too deeply");
  const std::uint8_t tag = byte();
  if (tag & stream::knownBit) return known(event, depth, tag & static_cast<std::uint8_t>(~stream::knownBit));
  if (tag > static_cast<std::uint8_t>(Tag::packed)) refuse("an item has an unknown tag");
  into.push_back(static_cast<char>(tag));
  bounded(into);
  switch (static_cast<Tag>(tag)) {
    case Tag::absent:
    case Tag::no:
    case Tag::yes:
      return;
    case Tag::number:
    case Tag::negative:
      return appendVarint(into, varint());
    case Tag::real:
    case Tag::date:
      return copy(into, 8);
    case Tag::text:
    case Tag::data:
    case Tag::packed: {
      const std::size_t size = count(largestPayload, "length");
      appendVarint(into, size);
      return copy(into, size);
    }
    case Tag::list:
    case Tag::dictionary:
    case Tag::error:
      return container(event, static_cast<Tag>(tag), depth);
    case Tag::object: {
      into.push_back(static_cast<char>(byte()));
      appendVarint(into, varint());
      const std::uint8_t flags = byte();
      into.push_back(static_cast<char>(flags));
      if (flags & ObjectMention::hasFacts) item(event, depth + 1);
      return;
    }
  }
}

void EventReader::container(Event& event, Tag tag, std::size_t depth) {
  std::size_t parts = 4;
  if (tag != Tag::error) {
    parts = count(mostParts, "number of items");
    appendVarint(event.payload, parts);
  }
  if (tag == Tag::dictionary) parts *= 2;
  while (parts-- > 0) item(event, depth + 1);
}

void EventReader::known(Event& event, std::size_t depth, std::uint8_t tag) {
  const auto of = static_cast<Tag>(tag);
  const bool isSized = of == Tag::text || of == Tag::data || of == Tag::packed;
  if (!isSized && of != Tag::list) refuse("an item has an unknown tag");
  const auto how = static_cast<Known>(byte());
  if (!isSized && (how == Known::medium || how == Known::newMedium)) refuse("a list is known as a text");
  std::string bytes;
  switch (how) {
    case Known::medium: {
      const std::uint64_t place = varint();
      if (place >= _known.count()) refuse("a text is not known");
      return appendSized(event.payload, tag, _known[place]);
    }
    case Known::newMedium: {
      copy(bytes, count(KnownTexts::end, "length"));
      _known.add(bytes, false);
      return appendSized(event.payload, tag, bytes);
    }
    case Known::large:
      return appendLarge(event, depth, tag, _heard.use(slot()));
    case Known::newLarge:
      copy(bytes, count(LargeTexts::largestKept, "length"));
      return appendLarge(event, depth, tag, _heard.keep(std::make_shared<LargeText>(std::move(bytes))));
    case Known::changed: {
      const std::size_t base = slot();
      const std::size_t size = _heard.at(base)->size();
      const std::uint64_t begin = varint();
      const std::uint64_t end = varint();
      if (begin > size || end > size - begin) refuse("bytes are longer than those they are made of");
      copy(bytes, count(LargeTexts::largestKept - begin - end, "length"));
      return appendLarge(event, depth, tag, _heard.keep(_heard.changed(base, begin, end, std::move(bytes))));
    }
    case Known::edited:
      return appendLarge(event, depth, tag, _heard.keep(edited()));
  }
  refuse("a text is known in no way there is");
}

std::size_t EventReader::slot() {
  const std::uint64_t slot = varint();
  if (slot >= _heard.count()) refuse("bytes are not known");
  return slot;
}

LargeTextRef EventReader::edited() {
  ListEditing list(_heard.at(slot()));
  for (std::size_t edits = count(LargeTexts::mostElements, "number of edits"); edits > 0; --edits) {
    LargeText::Edit edit{};
    for (auto* number : {&edit.keep, &edit.drop, &edit.insert})
      *number = count(LargeTexts::mostElements, "number of elements");
    list.edit(edit);
    for (std::size_t left = edit.insert; left > 0; --left) {
      std::size_t begin = 0, end = 0;
      if (list.comesForAnother()) {
        begin = count(LargeTexts::largestKept, "length");
        end = count(LargeTexts::largestKept, "length");
      }
      std::string between;
      copy(between, count(LargeTexts::largestKept, "length"));
      list.element(begin, end, between);
    }
  }
  return list.finish();
}

void EventReader::appendLarge(Event& event, std::size_t depth, std::uint8_t tag, const LargeTextRef& text) {
  std::string& into = event.payload;
  const bool isList = static_cast<Tag>(tag) == Tag::list;
  if (isList && !text->splitIntoElements()) refuse("a list is none");
  if (text->size() > largestPayload - std::min(largestPayload, into.size() + _apart)) refuse("an event is too large");
  // What is part of another item is read with it.
  if (_large == Large::apart && depth == 0) {
    // Many small ones take room, too.
    _apart += std::max(text->size(), KnownTexts::end);
    const std::size_t begin = into.size();
    into.push_back(static_cast<char>(tag | stream::knownBit));
    appendVarint(into, event.large.size());
    event.large.push_back({begin, into.size(), text});
    return;
  }
  if (!isList) {
    into.push_back(static_cast<char>(tag));
    appendVarint(into, text->size());
  }
  text->appendTo(into);
}

bool EventReader::refill() {
  auto& each = *_decompression;
  while (!each.ended) {
    ZSTD_outBuffer out{each.room.data(), each.room.size(), 0};
    const std::size_t before = each.in.pos;
    const std::size_t left = ZSTD_decompressStream(each.context.get(), &out, &each.in);
    if (ZSTD_isError(left)) {
      each.ended = true;
      refuse(std::string("it is not compressed as it should be: ") + ZSTD_getErrorName(left));
    }
    if (left == 0) each.ended = true;
    if (out.pos > 0) {
      _window = {each.room.data(), out.pos};
      return true;
    }
    if (each.in.pos == each.in.size && before == each.in.pos) return false;
  }
  return false;
}

std::uint8_t EventReader::byte() {
  if (_window.empty() && !refill()) throw Cut();
  const auto byte = static_cast<std::uint8_t>(_window.front());
  _window.remove_prefix(1);
  return byte;
}

std::uint64_t EventReader::varint() {
  std::uint64_t value = 0;
  for (int shift = 0; shift < 64; shift += 7) {
    const std::uint8_t next = byte();
    value |= std::uint64_t{next & 0x7fu} << shift;
    if (next < 0x80) return value;
  }
  refuse("a number is too large");
}

std::size_t EventReader::count(std::uint64_t most, const char* what) {
  const std::uint64_t value = varint();
  if (value > most) refuse(std::string("a ") + what + " is too large: " + std::to_string(value));
  return value;
}

void EventReader::copy(std::string& into, std::size_t count) {
  while (count > 0) {
    if (_window.empty() && !refill()) throw Cut();
    const std::size_t part = std::min(count, _window.size());
    into.append(_window.substr(0, part));
    _window.remove_prefix(part);
    count -= part;
    bounded(into);
  }
}

std::string EventReader::shortText() {
  std::string text;
  copy(text, count(1024, "name"));
  return text;
}

}  // namespace record
