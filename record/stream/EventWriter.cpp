#include "record/stream/EventWriter.h"

#include <zstd.h>

#include <new>
#include <utility>

#include "record/stream/StreamFormat.h"

namespace record {

using stream::Entry;
using stream::Known;

namespace {
constexpr int compressionLevel = 1;
constexpr int windowLog = 21;
constexpr std::size_t batch = std::size_t{64} << 10;
}  // namespace

struct EventWriter::Compression {
  struct Free {
    void operator()(ZSTD_CCtx* freed) const { ZSTD_freeCCtx(freed); }
  };
  std::unique_ptr<ZSTD_CCtx, Free> context{ZSTD_createCCtx()};
  std::string room = std::string(ZSTD_CStreamOutSize(), '\0');
};

EventWriter::EventWriter(std::shared_ptr<Sink> sink)
    : _sink(std::move(sink)), _compression(std::make_unique<Compression>()) {
  auto* context = _compression->context.get();
  if (!context) throw std::bad_alloc();
  ZSTD_CCtx_setParameter(context, ZSTD_c_compressionLevel, compressionLevel);
  ZSTD_CCtx_setParameter(context, ZSTD_c_windowLog, windowLog);
  std::string head(recordingMagic);
  appendVarint(head, recordingVersion);
  _failed = !_sink->write(head);
}

EventWriter::~EventWriter() = default;

std::uint32_t EventWriter::addThread(std::string_view name) {
  _pending.push_back(static_cast<char>(Entry::thread));
  appendVarint(_pending, name.size());
  _pending.append(name);
  return _threads++;
}

std::uint32_t EventWriter::addOperation(const OperationName& operation) {
  _pending.push_back(static_cast<char>(Entry::operation));
  for (const auto* text : {&operation.service, &operation.name, &operation.parameters}) {
    appendVarint(_pending, text->size());
    _pending.append(*text);
  }
  return _operations++;
}

void EventWriter::write(EventKind kind, std::uint32_t thread, std::uint32_t operation, std::uint64_t time,
                        std::string_view payload) {
  if (_failed) return;
  if (payload.size() > largestPayload) {
    _failed = true;
    return flush();
  }
  const bool same = thread == _lastThread;
  _lastThread = thread;
  _pending.push_back(static_cast<char>(static_cast<std::uint8_t>(kind) | (same ? stream::sameThread : 0)));
  if (!same) appendVarint(_pending, thread);
  if (opens(kind)) appendVarint(_pending, operation);
  if (kind == EventKind::enter) appendVarint(_pending, time);
  std::size_t count = 0;
  for (ItemReader counted(payload); !counted.atEnd(); ++count) counted.skip();
  appendVarint(_pending, count);
  for (ItemReader from(payload); !from.atEnd();) item(from);
  if (_pending.size() >= batch) compress(true, false);
}

/// Copies one item, with what is known replaced.
void EventWriter::item(ItemReader& from) {
  const Tag tag = from.peek();
  switch (tag) {
    case Tag::text:
    case Tag::data:
    case Tag::packed:
      from.tag();
      return sized(tag, from.bytes(from.varint()));
    case Tag::list: {
      ItemReader again(from);
      const std::string_view list = again.skip();
      if (list.size() < LargeTexts::listFrom || list.size() > LargeTexts::largestKept) return parts(from);
      from = again;
      return large(tag, list);
    }
    case Tag::dictionary:
    case Tag::error:
      return parts(from);
    case Tag::object: {
      const std::string_view before = from.rest();
      const bool hasFacts = from.object().flags & ObjectMention::hasFacts;
      _pending.append(before.substr(0, before.size() - from.rest().size()));
      if (hasFacts) item(from);
      return;
    }
    default:
      _pending.append(from.skip());
  }
}

void EventWriter::parts(ItemReader& from) {
  const Tag tag = from.peek();
  _pending.push_back(static_cast<char>(from.tag()));
  std::uint64_t count = 4;
  if (tag != Tag::error) {
    count = from.varint();
    appendVarint(_pending, count);
  }
  if (tag == Tag::dictionary) count *= 2;
  while (count-- > 0) item(from);
}

void EventWriter::sized(Tag tag, std::string_view bytes) {
  if (LargeTexts::isKept(bytes.size())) return large(tag, bytes);
  const auto known = static_cast<char>(static_cast<std::uint8_t>(tag) | stream::knownBit);
  if (!KnownTexts::isKept(bytes.size())) {
    _pending.push_back(static_cast<char>(tag));
  } else if (auto place = _known.find(bytes)) {
    _pending.push_back(known);
    _pending.push_back(static_cast<char>(Known::medium));
    return appendVarint(_pending, *place);
  } else {
    _known.add(bytes, true);
    _pending.push_back(known);
    _pending.push_back(static_cast<char>(Known::newMedium));
  }
  appendVarint(_pending, bytes.size());
  _pending.append(bytes);
}

void EventWriter::large(Tag tag, std::string_view bytes) {
  _pending.push_back(static_cast<char>(static_cast<std::uint8_t>(tag) | stream::knownBit));
  const bool mayBeList = tag == Tag::packed || tag == Tag::list;
  if (mayBeList) {
    if (auto likeness = _large.likeList(bytes)) return edited(std::move(*likeness), bytes);
  }
  const auto like = _large.like(bytes);
  if (!like) {
    _pending.push_back(static_cast<char>(Known::newLarge));
    appendVarint(_pending, bytes.size());
    _pending.append(bytes);
  } else if (like->begin == bytes.size() && _large.sizeOf(like->slot) == bytes.size()) {
    return same(like->slot);
  } else {
    const std::size_t changed = bytes.size() - like->begin - like->end;
    _pending.push_back(static_cast<char>(Known::changed));
    for (std::size_t number : {like->slot, like->begin, like->end, changed}) appendVarint(_pending, number);
    _pending.append(bytes.substr(like->begin, changed));
  }
  _large.keep(bytes, mayBeList ? elementPlaces(bytes) : std::vector<std::uint32_t>());
}

void EventWriter::same(std::size_t slot) {
  _pending.push_back(static_cast<char>(Known::large));
  appendVarint(_pending, slot);
  _large.use(slot);
}

void EventWriter::edited(LargeTexts::ListLikeness&& likeness, std::string_view list) {
  if (likeness.edits.empty() && _large.sizeOf(likeness.slot) == list.size()) return same(likeness.slot);
  _pending.push_back(static_cast<char>(Known::edited));
  appendVarint(_pending, likeness.slot);
  appendVarint(_pending, likeness.edits.size());
  for (const auto& edit : likeness.edits) {
    for (std::size_t number : {edit.keep, edit.drop, edit.insert.size()}) appendVarint(_pending, number);
    std::size_t left = edit.drop;
    for (const auto& element : edit.insert) {
      if (left > 0) {
        --left;
        appendVarint(_pending, element.begin);
        appendVarint(_pending, element.end);
      }
      appendVarint(_pending, element.between.size());
      _pending.append(element.between);
    }
  }
  _large.keep(list, std::move(likeness.places));
}

void EventWriter::flush() { compress(true, false); }

void EventWriter::finish() {
  write(EventKind::end, _lastThread, 0, 0, {});
  compress(true, true);
}

void EventWriter::compress(bool flushed, bool ended) {
  if (_failed) return;
  ZSTD_inBuffer in{_pending.data(), _pending.size(), 0};
  const auto order = ended ? ZSTD_e_end : flushed ? ZSTD_e_flush : ZSTD_e_continue;
  std::size_t left = 0;
  do {
    ZSTD_outBuffer out{_compression->room.data(), _compression->room.size(), 0};
    left = ZSTD_compressStream2(_compression->context.get(), &out, &in, order);
    if (ZSTD_isError(left) || !_sink->write({_compression->room.data(), out.pos})) {
      _failed = true;
      return;
    }
  } while (left > 0 || in.pos < in.size);
  _pending.clear();
}

}  // namespace record
