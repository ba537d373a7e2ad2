#include <gtest/gtest.h>

#include <atomic>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "plist/BigEndian.h"
#include "plist/ListMemory.h"
#include "plist/PropertyList.h"

namespace plist {
namespace {

using platform::Bytes;
using platform::Dictionary;
using platform::Value;

Value listOf(std::size_t count) {
  Value list = Value::makeArray();
  for (std::size_t i = 0; i < count; ++i) {
    Dictionary& entry = list.array()->appendDictionary();
    entry.set("identifier", "com.example.app" + std::to_string(i));
    entry.set("operation", "install");
    entry.set("size", 1000 + i);
    entry.set("name", i % 3 ? "Grünspecht" : "Ferrystead");
    entry.set("enabled", i % 2 == 0);
    Value kinds = Value::makeArray();
    kinds.array()->append("software " + std::to_string(i % 7));
    entry.set("kinds", kinds);
  }
  return list;
}

/// Reads what was written last.
Value again(ListMemory& memory, const Bytes& bytes) {
  platform::ErrorRef error = platform::makeError("test", 1, "stale");
  Value list = memory.read(bytes, &error);
  EXPECT_FALSE(error);
  return list;
}

/// One change of some entry, of the kinds that are put into the bytes and of those that are not.
void changeSomething(Value& list, std::mt19937_64& numbers) {
  static const char* const texts[] = {"DOWNLOADED", "INSTALLED", "FAILED", "install", "", "a text of more than fifteen",
                                      "Thistlefold"};
  const std::size_t entry = numbers() % list.array()->size();
  switch (numbers() % 40) {
    case 0:
      list.array()->dictionary(entry)->set("name", "Übergröße");
      break;
    case 1:
      list.array()->dictionary(entry)->set("size", numbers());
      break;
    case 2:
      list.array()->dictionary(entry)->set("reason " + std::to_string(numbers() % 3), "new");
      break;
    case 3:
      list.array()->dictionary(entry)->remove("enabled");
      break;
    case 4:
      list.array()->append((*list.array())[entry]);
      break;
    case 5:
      list.array()->dictionary(entry)->set("name", std::string(65 + numbers() % 300, 'x'));
      break;
    case 6:
      list.array()->dictionary(entry)->array("kinds")->append("another");
      break;
    case 7:
      list.array()->dictionary(entry)->set("name", "text " + std::to_string(numbers() % 100));
      break;
    default:
      list.array()->dictionary(entry)->set("operation", texts[numbers() % std::size(texts)]);
  }
}

TEST(ListMemory, WhatGoesRoundStaysWhatItIs) {
  std::mt19937_64 numbers(7);
  for (int round = 0; round < 20; ++round) {
    ListMemory memory;
    // Around the sizes at which references and offsets take more bytes, too.
    Value model = listOf(round % 2 ? 300 + numbers() % 700 : 250);
    Bytes bytes = *memory.writeBinary(model);
    std::vector<std::pair<Value, Value>> older;  // read before, with what they have to be still
    for (int step = 0; step < 60; ++step) {
      Value list = again(memory, bytes);
      ASSERT_EQ(list, model) << "round " << round << ", step " << step;
      for (std::size_t change = numbers() % 3; change > 0; --change) changeSomething(list, numbers);
      bytes = *memory.writeBinary(list);
      model = Value(list);
      platform::ErrorRef error;
      const Value plain = plist::read(bytes, &error);
      ASSERT_EQ(plain, model) << "round " << round << ", step " << step << (error ? ": " + error->description() : "");
      if (step % 10 == 0) older.emplace_back(std::move(list), model);
    }
    for (const auto& [list, was] : older) EXPECT_EQ(list, was);
  }
}

TEST(ListMemory, ChangesArePutIntoTheBytesOfBefore) {
  ListMemory memory;
  const Bytes first = *memory.writeBinary(listOf(400));
  Value list = again(memory, first);
  for (std::size_t i = 0; i < 3; ++i) list.array()->dictionary(100 * i)->set("operation", "DOWNLOADED");
  const Bytes second = *memory.writeBinary(list);
  // One text more, with its offset of two bytes.
  EXPECT_EQ(second.size(), first.size() + 1 + 10 + 2);
  list = again(memory, second);
  list.array()->dictionary(1)->set("operation", "DOWNLOADED");
  EXPECT_EQ(memory.writeBinary(list)->size(), second.size());
}

TEST(ListMemory, AListThatOutgrowsItsOffsetsIsWrittenAnew) {
  // Objects and the table of their offsets, whose place the last bytes tell, lie below byte 65,536 while an offset has
  // two bytes.
  auto table = [](const Bytes& bytes) { return readBigEndian(bytes.data() + bytes.size() - 8, 8); };
  Value list = listOf(600);
  list.array()->dictionary(0)->set("pad", std::string(1000, 'x'));
  const std::size_t padding = 1000 + 65530 - table(*plist::writeBinary(list));
  list.array()->dictionary(0)->set("pad", std::string(padding, 'x'));
  ListMemory memory;
  const Bytes first = *memory.writeBinary(list);
  ASSERT_EQ(table(first), 65530);
  list = again(memory, first);
  list.array()->dictionary(1)->set("operation", "DOWNLOADED");
  list.array()->dictionary(2)->set("operation", "INSTALLED");
  EXPECT_EQ(plist::read(*memory.writeBinary(list)), list);
}

TEST(ListMemory, AListThatIsReadOutlivesTheMemory) {
  Value list;
  {
    ListMemory memory;
    list = again(memory, *memory.writeBinary(listOf(400)));
    list.array()->dictionary(7)->set("operation", "DOWNLOADED");
    memory.writeBinary(list);
    memory.writeBinary(listOf(500));
  }
  Value expected = listOf(400);
  expected.array()->dictionary(7)->set("operation", "DOWNLOADED");
  EXPECT_EQ(list, expected);
}

TEST(ListMemory, AnythingElseIsReadAndWrittenAsEver) {
  ListMemory memory;
  platform::ErrorRef error;
  Value renamed = again(memory, *memory.writeBinary(listOf(400)));
  renamed.array()->dictionary(9)->remove("kinds");
  renamed.array()->dictionary(9)->set("sorts", (*(*renamed.array())[16].dictionary())["kinds"]);
  EXPECT_EQ(plist::read(*memory.writeBinary(renamed)), renamed);
  EXPECT_TRUE(memory.read("bplist00 but no more", &error).isAbsent());
  EXPECT_TRUE(error);
  Value list = again(memory, *memory.writeBinary(listOf(400)));
  list.array()->dictionary(7)->set("operation", "\xff");
  EXPECT_FALSE(memory.writeBinary(list, &error));
  EXPECT_NE(error->description().find("not valid UTF-8"), std::string::npos);
  EXPECT_EQ(memory.writeBinary(Value("text")), plist::writeBinary(Value("text")));
  EXPECT_EQ(memory.writeBinary(listOf(401)), plist::writeBinary(listOf(401)));
}

TEST(ListMemory, ManyThreadsReadWhileOneWrites) {
  ListMemory memory;
  Bytes bytes = *memory.writeBinary(listOf(400));
  std::atomic<bool> over{false};
  std::vector<std::thread> readers;
  for (int i = 0; i < 3; ++i) {
    readers.emplace_back([&, first = bytes] {
      while (!over) {
        Value list = memory.read(first);
        list.array()->dictionary(3)->set("operation", "mine");
        EXPECT_EQ((*(*list.array())[2].dictionary())["operation"], Value("install"));
        std::this_thread::yield();
      }
    });
  }
  for (int i = 0; i < 200; ++i) {
    Value list = again(memory, bytes);
    list.array()->dictionary(2)->set("operation", i % 2 ? "install" : "INSTALLED");
    bytes = *memory.writeBinary(list);
  }
  over = true;
  for (auto& reader : readers) reader.join();
  EXPECT_EQ((*(*again(memory, bytes).array())[2].dictionary())["operation"], Value("install"));
}

}  // namespace
}  // namespace plist
