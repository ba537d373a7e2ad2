// The bytes of a recording: what was written is read, to the bit; what is cut is read up to there; what nobody wrote is
// refused, in words.

#include <gtest/gtest.h>
#include <zstd.h>

#include <memory>
#include <random>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/Value.h"
#include "record/Sink.h"
#include "record/stream/Comparison.h"
#include "record/stream/Event.h"
#include "record/stream/EventReader.h"
#include "record/stream/EventWriter.h"
#include "record/stream/Item.h"

namespace {

using record::Event;
using record::EventKind;
using record::EventReader;
using record::EventWriter;
using record::ItemWriter;
using record::Tag;

/// A recording in memory.
class Memory final : public record::Sink {
 public:
  bool write(platform::BytesView bytes) override {
    if (content.size() + bytes.size() > room) return false;
    content.append(bytes);
    return true;
  }
  std::string content;
  std::size_t room = SIZE_MAX;
};

/// Calls of one thread into the plug-in, each with these items.
std::string recordingOf(const std::vector<std::string>& payloads, bool flushesEach = false) {
  const auto sink = std::make_shared<Memory>();
  EventWriter writer(sink);
  const auto thread = writer.addThread("main");
  const auto operation = writer.addOperation({"Service", "operation", "what"});
  for (const auto& payload : payloads) {
    writer.write(EventKind::enter, thread, operation, 7, payload);
    writer.write(EventKind::leave, thread, operation, 0, {});
    if (flushesEach) writer.flush();
  }
  writer.finish();
  return sink->content;
}

struct Read {
  std::vector<Event> events;
  std::string problem;
  bool isWhole = false;
};

Read readAll(std::string_view recording, EventReader::Large large = EventReader::Large::within) {
  Read read;
  EventReader reader(recording, large);
  for (Event event; reader.next(event);) read.events.push_back(event);
  read.problem = reader.problem();
  read.isWhole = reader.isWhole();
  return read;
}

std::vector<std::string> entered(const Read& read) {
  std::vector<std::string> payloads;
  for (const auto& event : read.events) {
    if (event.kind == EventKind::enter) payloads.push_back(record::wholePayload(event));
  }
  return payloads;
}

std::string textItem(std::string_view text) {
  ItemWriter items;
  items.text(text);
  return items.take();
}

std::string noise(std::size_t size, unsigned seed) {
  std::mt19937 chance(seed);
  std::string bytes(size, '\0');
  for (char& byte : bytes) byte = static_cast<char>(chance());
  return bytes;
}

/// A list as a recording is told it again and again, with a few changes.
class ChangingList {
 public:
  explicit ChangingList(std::size_t count) {
    for (std::size_t at = 0; at < count; ++at) _elements.push_back(element());
  }

  void change() {
    for (auto left = 1 + _chance() % 4; left > 0; --left) {
      const auto at = _elements.begin() + static_cast<std::ptrdiff_t>(_chance() % (_elements.size() + 1));
      switch (_chance() % 3) {
        case 0:
          _elements.insert(at, element());
          break;
        case 1:
          if (at != _elements.end() && _elements.size() > 4) _elements.erase(at);
          break;
        default:
          if (at != _elements.end()) at->back() = static_cast<char>(at->back() ^ 1);
      }
    }
  }

  std::string bytes() const {
    ItemWriter items;
    items.list(_elements.size());
    for (const auto& element : _elements) items.items(element);
    return items.take();
  }

 private:
  std::string element() { return textItem("app-" + std::to_string(_chance()) + noise(_chance() % 40, 1)); }

  std::mt19937 _chance{42};
  std::vector<std::string> _elements;
};

TEST(RecordingStream, TextsOfEverySizeAreToldOnceAndReadAgain) {
  std::vector<std::string> payloads;
  for (int round = 0; round < 3; ++round) {
    for (std::size_t size : {0u, 1u, 47u, 48u, 127u, 128u, 2047u, 2048u, 5000u, 70000u}) {
      for (auto put : {&ItemWriter::text, &ItemWriter::data, &ItemWriter::packed}) {
        ItemWriter items;
        (items.*put)(noise(size, static_cast<unsigned>(size)));
        items.number(size);
        payloads.push_back(items.take());
      }
    }
  }
  const auto recording = recordingOf(payloads);
  EXPECT_EQ(entered(readAll(recording)), payloads);
  EXPECT_TRUE(readAll(recording).isWhole);
  EXPECT_EQ(entered(readAll(recording, EventReader::Large::apart)), payloads);
  // The content itself once, and the nine times that it is named.
  EXPECT_LT(recording.size(), 84000u);
}

TEST(RecordingStream, BytesWithAChangeInTheMiddleAreToldByIt) {
  std::vector<std::string> payloads;
  std::string bytes = noise(100000, 3);
  for (unsigned round = 0; round < 200; ++round) {
    bytes.replace(round * 400, round % 5, noise(round % 7, round));
    payloads.push_back(textItem(bytes));
  }
  const auto recording = recordingOf(payloads);
  EXPECT_LT(recording.size(), 110000u);
  EXPECT_EQ(entered(readAll(recording)), payloads);
  EXPECT_EQ(entered(readAll(recording, EventReader::Large::apart)), payloads);
}

/// Packed, within the items, and two of them in turns.
TEST(RecordingStream, AListIsToldByWhatChangedInIt) {
  ChangingList one(400), other(90);
  std::vector<std::string> payloads;
  for (int round = 0; round < 300; ++round) {
    one.change();
    other.change();
    ItemWriter items;
    items.packed(one.bytes());
    items.items(other.bytes());
    items.boolean(true);
    payloads.push_back(items.take());
  }
  const auto recording = recordingOf(payloads);
  EXPECT_LT(recording.size(), 100000u) << "300 times some 16 KB";
  EXPECT_EQ(entered(readAll(recording)), payloads);
  const auto apart = readAll(recording, EventReader::Large::apart);
  EXPECT_EQ(entered(apart), payloads);
  EXPECT_EQ(apart.events.front().large.size(), 2u);
  EXPECT_LT(apart.events.front().payload.size(), 10u);
}

TEST(RecordingStream, WhatCameIsComparedWhereItIs) {
  ChangingList list(60);
  const std::string text = noise(3000, 9);
  std::vector<std::string> payloads;
  for (int round = 0; round < 3; ++round) {
    ItemWriter items;
    items.number(1);
    items.text(text);
    items.items(list.bytes());
    items.boolean(false);
    payloads.push_back(items.take());
  }
  const auto read = readAll(recordingOf(payloads), EventReader::Large::apart);
  const Event& event = read.events[2];
  ASSERT_EQ(event.large.size(), 2u);
  const auto came = [&](std::uint64_t number, std::string_view given, const std::string& items, bool isLent,
                        bool last) {
    ItemWriter writer;
    writer.number(number);
    isLent ? writer.lendText(Tag::text, given) : writer.text(given);
    writer.items(items);
    writer.boolean(last);
    return record::isSame(event, writer);
  };
  std::string otherText = text;
  otherText.back() = static_cast<char>(otherText.back() ^ 1);
  for (bool isLent : {false, true}) {
    EXPECT_TRUE(came(1, text, list.bytes(), isLent, false));
    EXPECT_FALSE(came(2, text, list.bytes(), isLent, false));
    EXPECT_FALSE(came(1, otherText, list.bytes(), isLent, false));
    EXPECT_FALSE(came(1, text + "more", list.bytes(), isLent, false));
    EXPECT_FALSE(came(1, text, ChangingList(59).bytes(), isLent, false));
    EXPECT_FALSE(came(1, text, list.bytes(), isLent, true));
  }
}

TEST(RecordingStream, WhatIsPartOfAnotherItemIsReadWithIt) {
  platform::Value entries = platform::Value::makeDictionary();
  entries.dictionary()->set("large", noise(3000, 1));
  ItemWriter items;
  items.value(entries);
  const auto read = readAll(recordingOf({items.take(), items.take()}), EventReader::Large::apart);
  for (const auto& event : {read.events.at(0), read.events.at(2)}) {
    record::ItemReader reader(event.payload, &event.large);
    EXPECT_EQ(reader.value(), entries);
    EXPECT_TRUE(reader.atEnd());
  }
}

TEST(RecordingStream, CutAtAnyByteItIsReadUpToThere) {
  ChangingList list(40);
  std::vector<std::string> payloads;
  for (int round = 0; round < 20; ++round) {
    list.change();
    payloads.push_back(list.bytes() + textItem("some text that is long enough to be kept and called by its place"));
  }
  const auto recording = recordingOf(payloads, true);
  const auto whole = entered(readAll(recording));
  ASSERT_EQ(whole, payloads);
  std::size_t last = 0;
  for (std::size_t size = 0; size < recording.size(); ++size) {
    const auto read = readAll(std::string_view(recording).substr(0, size));
    EXPECT_EQ(read.problem, "") << size;
    const auto some = entered(read);
    ASSERT_GE(some.size(), last) << "bytes that say less: " << size;
    ASSERT_TRUE(std::equal(some.begin(), some.end(), whole.begin())) << size;
    last = some.size();
    // The last bytes only say that nothing follows.
    EXPECT_FALSE(read.isWhole && size + 8 < recording.size()) << size;
  }
  EXPECT_EQ(last, whole.size());
}

TEST(RecordingStream, ASinkThatRefusesEndsTheRecordingWhereItDoes) {
  const auto sink = std::make_shared<Memory>();
  sink->room = 3000;
  EventWriter writer(sink);
  const auto thread = writer.addThread("main");
  const auto operation = writer.addOperation({"Service", "operation", ""});
  for (unsigned round = 0; round < 20; ++round) {
    writer.write(EventKind::enter, thread, operation, round, textItem(noise(500, round)));
    writer.write(EventKind::leave, thread, operation, 0, {});
    writer.flush();
  }
  writer.finish();
  EXPECT_TRUE(writer.failed());
  const auto read = readAll(sink->content);
  EXPECT_GE(read.events.size(), 4u);
  EXPECT_FALSE(read.isWhole);
  EXPECT_EQ(read.problem, "");
}

TEST(RecordingStream, WhatIsNoRecordingOrALaterOneIsRefusedByName) {
  const auto recording = recordingOf({textItem("what")});
  EXPECT_EQ(readAll("hello, world").problem, "this is no recording");
  EXPECT_EQ(readAll("").problem, "");
  for (char version : {'\0', static_cast<char>(record::recordingVersion + 1), '\x7f', '\xff'}) {
    auto other = recording;
    other[record::recordingMagic.size()] = version;
    const auto read = readAll(other);
    EXPECT_TRUE(read.events.empty());
    EXPECT_EQ(read.problem, "the recording has version " + std::to_string(static_cast<unsigned char>(version)) +
                                ", this program reads versions up to " + std::to_string(record::recordingVersion));
  }
  for (char version = 1; version < static_cast<char>(record::recordingVersion); ++version) {
    auto earlier = recording;
    earlier[record::recordingMagic.size()] = version;
    EXPECT_EQ(readAll(earlier).events.size(), 2u);
  }
}

// ---- Streams that nobody wrote ----

std::string compressed(const std::string& stream) {
  std::string room(ZSTD_compressBound(stream.size()), '\0');
  room.resize(ZSTD_compress(room.data(), room.size(), stream.data(), stream.size(), 1));
  std::string recording(record::recordingMagic);
  recording.push_back(static_cast<char>(record::recordingVersion));
  return recording + room;
}

std::string number(std::uint64_t value) {
  std::string bytes;
  record::appendVarint(bytes, value);
  return bytes;
}

std::string sized(std::string_view text) { return number(text.size()) + std::string(text); }

constexpr std::string_view names("\6\4main\7\1S\1o\0", 12);
const std::string enter("\x13\0\0", 3);
const std::string leave("\x14\0", 2);
const std::string call("\x10\0\0", 3);

/// A call into the plug-in with one item, which stands here as in the stream.
std::string with(const std::string& item) { return std::string(names) + std::string("\x13\0\0\1", 4) + item; }

std::string nested(std::size_t depth) {
  std::string item;
  for (std::size_t at = 0; at < depth; ++at) item += "\x09\1";
  return item + std::string(1, '\0');
}

/// A list that edits can be made of, and the beginning of one.
std::string listAndEdits() {
  return with("\x49\3" + sized("\x09\2\3\1\3\2")) + leave + std::string("\x13\0\0\1", 4) + "\x49\5" + number(0);
}

struct Hostile {
  const char* what;
  std::string stream;
  const char* words;
};

std::vector<Hostile> hostileEvents() {
  const std::string text(names);
  return {
      {"no thread", enter, "event 1: it is of a thread that is not known"},
      {"no operation", std::string("\6\4main", 6) + enter, "event 1: it is of an operation that is not known"},
      {"another thread", text + "\3" + number(77), "event 1: it is of a thread that is not known"},
      {"a throw of nothing", text + "\x18" + std::string(1, '\0'),
       "event 1: the plug-in has one thread inside it at a time"},
      {"no such entry", text + "\x0e", "event 1: there is no event of this sort"},
      {"a call from nowhere", text + call + std::string(1, '\0'),
       "event 1: the plug-in has one thread inside it at a time"},
      {"an end of nothing", text + std::string("\x11\0", 2), "event 1: something ends that has not begun"},
      {"two inside", text + "\6\5other" + enter + std::string(1, '\0') + "\3" + number(1) + std::string(3, '\0'),
       "event 2: the plug-in has one thread inside it at a time"},
      {"many items", text + enter + number(std::uint64_t{1} << 40), "event 1: a number of items is too large"},
      {"a long number", with("\3" + std::string(10, '\xff')), "event 1: a number is too large"},
      {"a tag", with("\x2a"), "event 1: an item has an unknown tag"},
      {"a known tag", with("\x43"), "event 1: an item has an unknown tag"},
      {"a long text", with("\6" + number(std::uint64_t{1} << 33)), "event 1: a length is too large: 8589934592"},
      {"a long list", with("\x09" + number(std::uint64_t{1} << 33)), "event 1: a number of items is too large"},
      {"a deep item", with(nested(1200)), "event 1: an item is nested too deeply"},
  };
}

std::vector<Hostile> hostileTexts() {
  return {
      {"a text that nobody told", with(std::string("\x46\0\5", 3)), "event 1: a text is not known"},
      {"bytes that nobody told", with("\x47\2" + number(3)), "event 1: bytes are not known"},
      {"a change of nothing", with("\x47\4" + number(0)), "event 1: bytes are not known"},
      {"edits of nothing", with("\x49\5" + number(0)), "event 1: bytes are not known"},
      {"known in no way", with("\x46\6"), "event 1: a text is known in no way there is"},
      {"a list as a text", with(std::string("\x49\0\0", 3)), "event 1: a list is known as a text"},
      {"a list that is none", with("\x49\3" + sized("\3\5")), "event 1: a list is none"},
      {"a longer change",
       with("\x46\3" + sized("abcd")) + leave + std::string("\x13\0\0\1", 4) + "\x46\4" + number(0) + number(3) +
           number(2),
       "event 3: bytes are longer than those they are made of"},
      {"edits of a text", with("\x46\3" + sized("abcd")) + leave + std::string("\x13\0\0\1", 4) + "\x49\5" + number(0),
       "event 3: what is edited is no list"},
      {"more elements than were", listAndEdits() + number(1) + number(3) + number(0) + number(0),
       "event 3: an edited list is longer than it was"},
      {"more go than were", listAndEdits() + number(1) + number(1) + number(2) + number(0),
       "event 3: an edited list is longer than it was"},
      {"many edits", listAndEdits() + number(std::uint64_t{1} << 30), "event 3: a number of edits is too large"},
      {"an element of an element",
       listAndEdits() + number(1) + number(0) + number(1) + number(1) + number(2) + number(1) + sized(""),
       "event 3: an element is longer than what it is made of"},
      {"two in one element", listAndEdits() + number(1) + number(0) + number(0) + number(1) + sized("\3\1\3\1"),
       "event 3: an element of a list is more than one item"},
      {"half an element", listAndEdits() + number(1) + number(0) + number(0) + number(1) + sized("\6\5ab"),
       "event 3: a length goes beyond the end"},
  };
}

TEST(RecordingStream, WhatCannotHaveBeenRecordedIsRefused) {
  auto streams = hostileEvents();
  for (auto& hostile : hostileTexts()) streams.push_back(std::move(hostile));
  for (const auto& hostile : streams) {
    for (auto large : {EventReader::Large::within, EventReader::Large::apart}) {
      const auto recording = compressed(hostile.stream);
      const auto read = readAll(recording, large);
      EXPECT_TRUE(read.problem.starts_with(hostile.words)) << hostile.what << ": " << read.problem;
      EXPECT_FALSE(read.isWhole) << hostile.what;
    }
  }
}

TEST(RecordingStream, OneEventHoldsNoMoreThanTheLargest) {
  // A megabyte that is named again and again.
  std::string stream = std::string(names) + std::string("\x13\0\0", 3) + number(200);
  stream += "\x47\3" + sized(std::string(std::size_t{1} << 20, 'a'));
  for (int again = 0; again < 199; ++again) stream += "\x47\2" + number(0);
  for (auto large : {EventReader::Large::within, EventReader::Large::apart})
    EXPECT_EQ(readAll(compressed(stream), large).problem, "event 1: an event is too large");
}

TEST(RecordingStream, AnyByteMayBeAnother) {
  std::string list("\x09\x1e");
  for (char each = 0; each < 30; ++each) list += {'\3', each};
  std::string stream(names);
  stream += enter + number(3) + "\x47\3" + sized(list) + "\x49\3" + sized(list) + "\x49\5";
  stream +=
      number(0) + number(1) + number(3) + number(1) + number(1) + number(1) + number(0) + sized("\5") + leave + "\5";
  ASSERT_TRUE(readAll(compressed(stream)).isWhole);
  for (std::size_t at = 0; at < stream.size(); ++at) {
    for (int flip : {1, 0x40, 0x80, 0xff}) {
      auto other = stream;
      other[at] = static_cast<char>(other[at] ^ flip);
      const auto within = readAll(compressed(other)), apart = readAll(compressed(other), EventReader::Large::apart);
      EXPECT_EQ(entered(within), entered(apart)) << at;
      EXPECT_EQ(within.problem, apart.problem) << at;
    }
  }
}

}  // namespace
