#pragma once

#include <cstdint>
#include <deque>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "record/stream/Event.h"
#include "record/stream/HeardTexts.h"
#include "record/stream/Item.h"
#include "record/stream/KnownTexts.h"

namespace record {

class ItemReader;

/// Reads the events of a recording one after the other. Whatever the bytes are, it ends: with the last whole event, or
/// with what is wrong and where. Holds a bounded amount of memory.
class EventReader {
 public:
  /// Where large texts go that are told by what was told before: into the payload as any other, or, for who would have
  /// the same ones again and if they are no part of another item, beside it.
  enum class Large { within, apart };
  /// `bytes` is a whole recording, and outlives the reader.
  explicit EventReader(std::string_view bytes, Large large = Large::within);
  ~EventReader();
  EventReader(const EventReader&) = delete;
  EventReader& operator=(const EventReader&) = delete;

  /// False at the end: of the recording, of what is left of it, or of what can be read of it.
  bool next(Event& event);

  /// After `next` has answered false. Empty unless something is wrong with the recording.
  const std::string& problem() const { return _problem; }
  /// Whether the recording was ended in order; otherwise it was cut.
  bool isWhole() const { return _whole; }

  const std::vector<std::string>& threads() const { return _threads; }
  /// They stay where they are.
  const std::deque<OperationName>& operations() const { return _operations; }

 private:
  struct Decompression;
  /// Where a thread stands: what it is inside of, the innermost last.
  struct Frame {
    EventKind kind;  // call or enter
    std::uint32_t operation;
  };

  bool readEvent(Event& event);
  void place(Event& event);
  void enterInto(Event& event);
  void item(Event& event, std::size_t depth);
  void container(Event& event, Tag tag, std::size_t depth);
  void known(Event& event, std::size_t depth, std::uint8_t tag);
  std::size_t slot();
  LargeTextRef edited();
  void appendLarge(Event& event, std::size_t depth, std::uint8_t tag, const LargeTextRef& text);
  void bounded(const std::string& payload) const;
  void appendSized(std::string& into, std::uint8_t tag, std::string_view bytes) const;

  std::uint8_t byte();
  std::uint64_t varint();
  std::size_t count(std::uint64_t most, const char* what);
  void copy(std::string& into, std::size_t count);
  std::string shortText();
  bool refill();

  const Large _large;
  std::size_t _apart = 0;  // bytes of this event that are beside its payload
  std::unique_ptr<Decompression> _decompression;
  std::string_view _window;  // what is decompressed and not read yet
  KnownTexts _known;
  HeardTexts _heard;
  std::vector<std::string> _threads;
  std::deque<OperationName> _operations;
  std::vector<std::vector<Frame>> _frames;
  std::optional<std::uint32_t> _inside;  // the thread that is inside the plug-in
  std::uint32_t _lastThread = 0;
  std::uint64_t _events = 0;
  std::string _problem;
  bool _over = false;
  bool _whole = false;
};

}  // namespace record
