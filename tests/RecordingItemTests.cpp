// What an argument or an answer is written as, by its type, and what is read of it.

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <functional>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/Error.h"
#include "platform/OBApplicationProxy.h"
#include "platform/TSAsset.h"
#include "platform/Value.h"
#include "record/RecordingError.h"
#include "record/stream/CallText.h"
#include "record/stream/Codec.h"
#include "record/stream/Item.h"
#include "record/stream/Names.h"
#include "record/stream/SharedValue.h"

namespace {

using platform::Value;
using record::ItemReader;
using record::ItemWriter;
using record::ObjectKind;
using record::ObjectMention;

class Numbers final : public record::Names {
 public:
  std::uint64_t newNumber(ObjectKind) override { return ++_last; }

 private:
  std::uint64_t _last = 0;
};

template <class T>
std::string itemsOf(const T& value) {
  Numbers names;
  ItemWriter items;
  put(items, names, value);
  return items.take();
}

std::string shown(const std::string& item) { return record::itemText(item); }

TEST(RecordingItem, NumbersKeepEveryBit) {
  for (std::uint64_t number :
       {std::uint64_t{0}, std::uint64_t{127}, std::uint64_t{128}, std::uint64_t{1} << 63, UINT64_MAX}) {
    const auto item = itemsOf(number);
    EXPECT_EQ(ItemReader(item).number(), number);
  }
  for (std::int64_t number : {std::int64_t{0}, std::int64_t{-1}, std::int64_t{-128}, INT64_MIN, INT64_MAX}) {
    const auto item = itemsOf(number);
    EXPECT_EQ(ItemReader(item).signedNumber(), number);
  }
  using Limits = std::numeric_limits<double>;
  for (double number : {0.0, -0.0, 0.1, Limits::infinity(), -Limits::infinity(), Limits::denorm_min(), Limits::max()}) {
    const auto item = itemsOf(number);
    EXPECT_EQ(ItemReader(item).real(), number);
    EXPECT_EQ(std::signbit(ItemReader(item).real()), std::signbit(number));
  }
  const auto none = itemsOf(Limits::quiet_NaN());
  EXPECT_TRUE(std::isnan(ItemReader(none).real()));
}

TEST(RecordingItem, WhatIsPutIsShown) {
  const auto error = platform::makeError("domain", -7, "it failed", platform::makeError("inner", 2, ""));
  const std::vector<std::pair<std::string, std::string>> cases{
      {itemsOf(true), "true"},
      {itemsOf(std::string("a\tb")), "<3 bytes>"},
      {itemsOf(std::string("Größe")), "\"Größe\""},
      {itemsOf(record::BytesArgument{std::string_view("\0\1", 2)}), "<2 bytes>"},
      {itemsOf(std::optional<std::string>()), "null"},
      {itemsOf(std::optional<std::string>("")), "\"\""},
      {itemsOf(std::vector<std::string>{"one", ""}), "[\"one\", \"\"]"},
      {itemsOf(std::vector<std::string>{}), "[]"},
      {itemsOf(record::Deadline{INT64_MIN}), "-9223372036854775808"},
      {itemsOf(ObjectKind::proxy), "11"},
      {itemsOf(platform::ErrorRef()), "null"},
      {itemsOf(error), "domain -7: it failed because of inner 2"},
      {itemsOf(platform::FileAttributes{true, UINT64_MAX}), "{isDirectory: true, size: 18446744073709551615}"},
      {itemsOf(record::NewClient{0}), "null"},
      {itemsOf(record::NewClient{5}), "client#5"},
      {itemsOf(Value()), "null"},
      {itemsOf(Value(platform::Date{0})), "2001-01-01T00:00:00Z"},
  };
  for (const auto& [item, text] : cases) EXPECT_EQ(shown(item), text);
}

TEST(RecordingItem, ValuesOfEveryKindAreReadAsTheyWere) {
  Value document = Value::makeDictionary();
  auto& entries = *document.dictionary();
  entries.set("largest", UINT64_MAX);
  entries.set("smallest", INT64_MIN);
  entries.set("", "no key");
  entries.set("zero", -0.0);
  entries.set("data", Value::makeData(std::string_view("\0\xff", 2)));
  entries.set("date", platform::Date{-0.5});
  entries.set("no", false);
  entries.set("none", Value::makeArray());
  Value deep = Value::makeArray();
  for (int level = 0; level < 500; ++level) {
    Value outer = Value::makeArray();
    outer.array()->append(deep);
    deep = std::move(outer);
  }
  entries.set("deep", deep);
  Value large = Value::makeDictionary();
  for (int key = 0; key < 2000; ++key) large.dictionary()->set("key-" + std::to_string(key), key);
  for (const Value& value : {document, large, Value(), Value("text"), Value(7)}) {
    const auto item = itemsOf(value);
    ItemReader items(item);
    EXPECT_TRUE(record::sameItems(items.value(), value));
    EXPECT_TRUE(items.atEnd());
  }
}

TEST(RecordingItem, WhatIsNotWhatItShouldBeIsRefused) {
  Value twice = Value::makeDictionary();
  const std::string item = itemsOf(twice), two("\x0a\2\6\1a\1\6\1a\2", 10);
  using Reading = std::function<void(ItemReader&)>;
  const auto value = [](ItemReader& items) { items.value(); };
  const std::vector<std::tuple<std::string, Reading, const char*>> cases{
      {"", value, "it ends where an item should be"},
      {"\x0e", value, "an item has an unknown tag"},
      {two, value, "a dictionary has a key twice"},
      {"\x0c\1\1", value, "a length goes beyond the end"},
      {std::string("\x0c\1\1\0", 4), value, "what should be a value is none"},
      {std::string("\x0c\x7f\1\0", 4), [](ItemReader& items) { items.object(); }, "an object is of an unknown kind"},
      {"\x09\x7f", [](ItemReader& items) { items.list(); }, "a list is longer than what is left"},
      {"\x0a\1\6", [](ItemReader& items) { items.dictionary(); }, "a dictionary is longer than what is left"},
      {"\6\3ab", [](ItemReader& items) { items.text(); }, "a length goes beyond the end"},
      {"\7\1a", [](ItemReader& items) { items.text(); }, "an item should be a text"},
      {"\3\xff", [](ItemReader& items) { items.number(); }, "it ends in a number"},
      {itemsOf(UINT64_MAX), [](ItemReader& items) { items.signedNumber(); }, "a number is too large"},
      {"\3\1", [](ItemReader& items) { items.boolean(); }, "an item should be a boolean"},
      {std::string("\x0d\3\1\2\1", 5), value, "something follows a value"},
  };
  for (const auto& [bytes, read, words] : cases) {
    ItemReader items(bytes);
    try {
      read(items);
      ADD_FAILURE() << words;
    } catch (const record::RecordingError& error) {
      EXPECT_STREQ(error.what(), words);
    }
  }
}

// ---- The numbers of objects ----

TEST(RecordingItem, AnAssetsFactsAreWrittenWhenTheyAreNewOrOthers) {
  Numbers names;
  const auto asset = platform::TSAsset::downloadAssetWithIdentifier("com.example.one", "Applications", "One");
  const auto mention = [&] {
    ItemWriter items;
    put(items, names, asset);
    ItemReader reader(items.bytes());
    const auto mentioned = reader.object();
    EXPECT_EQ(mentioned.number, 1u);
    EXPECT_EQ(reader.atEnd(), !(mentioned.flags & ObjectMention::hasFacts));
    return mentioned.flags;
  };
  EXPECT_EQ(mention(), ObjectMention::isNew | ObjectMention::hasFacts);
  EXPECT_EQ(mention(), 0);
  asset->setPath("/var/mobile/one");
  EXPECT_EQ(mention(), ObjectMention::hasFacts);
  asset->setDownloadProgress(0.5F);
  names.setFacts(asset);
  EXPECT_EQ(mention(), 0);
}

TEST(RecordingItem, AnObjectThatGoesLosesItsNumber) {
  Numbers names;
  auto proxy = std::make_shared<platform::OBApplicationProxy>();
  proxy->bundleIdentifier = "com.example.one";
  const auto owner = std::make_shared<int>();
  const auto mention = [&] { return names.mention(ObjectKind::proxy, proxy.get(), owner); };
  EXPECT_EQ(mention().number, 1u);
  EXPECT_EQ(mention().flags, 0);
  const auto another = names.mention(ObjectKind::proxy, proxy.get(), std::make_shared<int>());
  EXPECT_EQ(another.number, 2u);
  EXPECT_EQ(another.flags, ObjectMention::isNew);
  // The same address, as another kind of object.
  EXPECT_EQ(names.mention(ObjectKind::url, proxy.get(), owner).number, 3u);
  EXPECT_EQ(names.find(ObjectKind::url, proxy.get()), 3u);
  EXPECT_EQ(names.find(ObjectKind::url, owner.get()), std::nullopt);
}

// ---- Values that share what did not change ----

Value sampleList(int count) {
  Value list = Value::makeArray();
  for (int at = 0; at < count; ++at) {
    auto& entry = list.array()->appendDictionary();
    entry.set("identifier", "com.example.app-" + std::to_string(at));
    entry.set("operation", "install");
    Value names = Value::makeArray();
    names.array()->append("first");
    names.array()->append(at);
    entry.set("names", names);
  }
  return list;
}

record::LargeTextRef textOf(const Value& list) {
  ItemWriter items;
  items.value(list);
  ItemReader reader(items.bytes()), inside{{}};
  auto text = std::make_shared<record::LargeText>(std::string(reader.unpacked(inside).rest()));
  EXPECT_TRUE(text->splitIntoElements());
  return text;
}

TEST(SharedValue, WhoChangesOneChangesNoOther) {
  const Value list = sampleList(40);
  auto text = textOf(list);
  Value mine = record::sharedValue(*text);
  ASSERT_TRUE(record::sameItems(mine, list));
  auto* entry = mine.array()->dictionary(3);
  entry->set("operation", "remove, which is longer than what was there");
  EXPECT_TRUE(entry->remove("identifier"));
  entry->array("names")->append("second");
  for (int key = 0; key < 100; ++key) entry->set("key-" + std::to_string(key), key);
  mine.array()->appendDictionary().set("identifier", "one more");
  mine.array()->dictionary(7)->dictionary("nothing");

  EXPECT_TRUE(record::sameItems(record::sharedValue(*text), list));
  EXPECT_FALSE(record::sameItems(mine, list));
  // The very values of the others, also when nobody else has them any more.
  EXPECT_EQ(record::sharedValue(*text).array()->size(), 40u);
  const Value copy = mine;
  text.reset();
  EXPECT_EQ(mine, copy);
  EXPECT_EQ((*(*mine.array())[4].dictionary())["identifier"], Value("com.example.app-4"));
  EXPECT_EQ((*mine.array())[40].dictionary()->size(), 1u);
}

TEST(SharedValue, AnEditedListSharesWhatItKeeps) {
  Value list = sampleList(30);
  auto text = textOf(list);
  record::sharedValue(*text);
  for (int round = 0; round < 200; ++round) {
    const std::string operation = "operation " + std::to_string(round);
    list.array()->dictionary(9)->set("operation", operation);
    ItemWriter element;
    element.value((*list.array())[9]);
    record::ListEditing editing(text);
    editing.edit({9, 1, 1});
    editing.element(0, 0, element.bytes());
    auto edited = editing.finish();
    const Value before = record::sharedValue(*text), now = record::sharedValue(*edited);
    ASSERT_TRUE(record::sameItems(now, list)) << round;
    EXPECT_FALSE(record::sameItems(now, before));
    text = std::move(edited);
  }
  const Value one = record::sharedValue(*text), other = record::sharedValue(*text);
  EXPECT_EQ((*one.array())[20].dictionary(), (*other.array())[20].dictionary());
  EXPECT_LT(text->store()->size, std::size_t{128} << 10) << "what is no longer used goes in the end";
}

TEST(SharedValue, TheSameMeansToTheBitAndInOrder) {
  Value one = Value::makeDictionary(), other = Value::makeDictionary();
  one.dictionary()->set("a", 1);
  one.dictionary()->set("b", 2);
  other.dictionary()->set("b", 2);
  other.dictionary()->set("a", 1);
  EXPECT_EQ(one, other);
  EXPECT_FALSE(record::sameItems(one, other));
  EXPECT_FALSE(record::sameItems(Value(0.0), Value(-0.0)));
  EXPECT_TRUE(record::sameItems(Value(std::nan("")), Value(std::nan(""))));
  EXPECT_FALSE(record::sameItems(Value(1), Value(1.0)));
  EXPECT_FALSE(record::sameItems(Value("a"), Value::makeData("a")));
}

}  // namespace
