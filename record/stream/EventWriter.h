#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "record/Sink.h"
#include "record/stream/Event.h"
#include "record/stream/Item.h"
#include "record/stream/KnownTexts.h"
#include "record/stream/LargeTexts.h"

namespace record {

/// Writes events into a sink, compressed. Not synchronised. Throws nothing but `std::bad_alloc`; a sink that refuses
/// ends the recording, which `failed` tells.
class EventWriter {
 public:
  explicit EventWriter(std::shared_ptr<Sink> sink);
  ~EventWriter();
  EventWriter(const EventWriter&) = delete;
  EventWriter& operator=(const EventWriter&) = delete;

  /// The number by which events name the thread, the operation.
  std::uint32_t addThread(std::string_view name);
  std::uint32_t addOperation(const OperationName& operation);

  void write(EventKind kind, std::uint32_t thread, std::uint32_t operation, std::uint64_t time,
             std::string_view payload);
  /// What was written so far can be read from now on, whatever becomes of this process.
  void flush();
  /// Marks the recording as whole. Nothing may follow.
  void finish();
  bool failed() const { return _failed; }

 private:
  struct Compression;

  void item(ItemReader& from);
  void parts(ItemReader& from);
  void sized(Tag tag, std::string_view bytes);
  void large(Tag tag, std::string_view bytes);
  void same(std::size_t slot);
  void edited(LargeTexts::ListLikeness&& likeness, std::string_view list);
  void compress(bool flushed, bool ended);

  std::shared_ptr<Sink> _sink;
  std::unique_ptr<Compression> _compression;
  KnownTexts _known;
  LargeTexts _large;
  std::string _pending;
  std::uint32_t _threads = 0;
  std::uint32_t _operations = 0;
  std::uint32_t _lastThread = 0;
  bool _failed = false;
};

}  // namespace record
