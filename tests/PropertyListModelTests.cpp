// Random values and edits, compared with a trivial model, with both written forms, and with another codec.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <limits>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "platform/Describe.h"
#include "plist/PropertyList.h"

namespace plist {
namespace {

using platform::Array;
using platform::Bytes;
using platform::Date;
using platform::Dictionary;
using platform::ErrorRef;
using platform::Value;

/// A value as plain as can be: a scalar, or children with keys (which an array's do not use).
struct Model {
  enum Kind { scalar, array, dictionary } kind = scalar;
  Value value = {};
  std::vector<std::pair<std::string, Model>> children = {};

  auto find(const std::string& key) {
    return std::find_if(children.begin(), children.end(), [&](const auto& child) { return child.first == key; });
  }
};

bool same(const Model& model, const Value& value) {
  if (model.kind == Model::scalar) return model.value == value;
  if (model.kind == Model::array) {
    const Array* array = value.array();
    return array && std::equal(model.children.begin(), model.children.end(), array->begin(), array->end(),
                               [](const auto& child, const Value& item) { return same(child.second, item); });
  }
  const Dictionary* dictionary = value.dictionary();
  return dictionary && std::equal(model.children.begin(), model.children.end(), dictionary->begin(), dictionary->end(),
                                  [&](const auto& child, const Dictionary::Entry& entry) {
                                    return child.first == entry.key && same(child.second, entry.value) &&
                                           &(*dictionary)[child.first] == &entry.value;
                                  });
}

Value valueOf(const Model& model) {
  if (model.kind == Model::scalar) return model.value;
  Value value = model.kind == Model::array ? Value::makeArray() : Value::makeDictionary();
  for (const auto& [key, child] : model.children) {
    if (model.kind == Model::array) {
      value.array()->append(valueOf(child));
    } else {
      value.dictionary()->set(key, valueOf(child));
    }
  }
  return value;
}

class Generator {
 public:
  explicit Generator(unsigned seed) : _random(seed) {}

  std::size_t below(std::size_t limit) { return std::uniform_int_distribution<std::size_t>(0, limit - 1)(_random); }

  std::string text() {
    static const std::vector<std::string> pieces = {"a", "B7", "<&>", " ", "\n", "é", "€", "\U0001F600", "longer text"};
    std::string text;
    // On both sides of what a count of bytes or an arena's block changes with.
    static constexpr std::size_t sizes[] = {14, 15, 16, 255, 256, 257, 512, 65535, 65536, 65537};
    if (below(200) == 0) return std::string(sizes[below(below(10) ? 7 : 10)], 'x');
    for (std::size_t count = below(below(8) ? 4 : 60); count > 0; --count) text += pieces[below(pieces.size())];
    return text;
  }

  Value scalar() {
    static const double reals[] = {
        0, -0.5, 1e-300, 1.7e308, std::numeric_limits<double>::infinity(), std::numeric_limits<double>::quiet_NaN()};
    std::uint64_t bits = std::uint64_t{_random()} << 32 | _random();
    switch (below(7)) {
      case 0:
        return below(2) == 0;
      case 1:
        return static_cast<std::int64_t>(bits >> below(64)) * (below(2) ? 1 : -1);
      case 2:
        return bits | std::uint64_t{1} << 63;
      case 3:
        return reals[below(std::size(reals))];
      case 4:
        return Date{static_cast<double>(static_cast<std::int64_t>(bits % 315000000000)) - 63000000000};
      case 5:
        return Value::makeData(text());
      default:
        return text();
    }
  }

  Model model(int depth) {
    if (depth == 0 || below(3) == 0) return {.value = scalar()};
    Model model{.kind = below(2) ? Model::array : Model::dictionary};
    static constexpr std::size_t widths[] = {7, 8, 9, 14, 15, 16, 63, 64, 65, 255, 256, 257, 999, 1000, 1001};
    std::size_t count = below(6) ? below(6) : widths[below(below(60) ? 6 : 15)];
    // In very many, keys would rarely differ by themselves, and nested ones would grow without an end.
    const bool many = count > 40;
    for (; count > 0; --count) {
      std::string key = many ? std::to_string(count) : text();
      if (model.kind == Model::array || model.find(key) == model.children.end()) {
        model.children.emplace_back(key, this->model(many ? 0 : depth - 1));
      }
    }
    return model;
  }

 private:
  std::mt19937 _random;
};

/// One random edit of the container and of its model. Values come from outside or from the container itself.
void edit(Generator& random, Value& value, Model& model) {
  std::size_t count = model.children.size(), at = count ? random.below(count) : 0;
  if (Array* array = value.array()) {
    if (count && array->dictionary(at) && random.below(2)) {
      array->dictionary(at)->set("edited", (*array)[0]);
      Model first = model.children[0].second;
      Model& child = model.children[at].second;
      auto known = child.find("edited");
      (known == child.children.end() ? child.children.emplace_back("edited", Model()) : *known).second = first;
      return;
    }
    Model added = count && random.below(2) ? model.children[at].second : random.model(1);
    if (count && same(added, (*array)[at])) {
      array->append((*array)[at]);
    } else {
      array->append(valueOf(added));
    }
    model.children.emplace_back("", added);
    return;
  }
  Dictionary& dictionary = *value.dictionary();
  std::string key = count && random.below(2) ? model.children[at].first : random.text();
  auto known = model.find(key);
  if (random.below(3) == 0) {
    // The key itself may lie in the dictionary.
    bool there = known != model.children.end();
    std::string_view stored = there ? dictionary.begin()[known - model.children.begin()].key : key;
    EXPECT_EQ(dictionary.remove(stored), there);
    if (there) model.children.erase(known);
    return;
  }
  bool own = count && random.below(3) == 0;
  Model set = own ? model.children[at].second : random.model(2);
  dictionary.set(key, own ? dictionary[model.children[at].first] : valueOf(set));
  (known == model.children.end() ? model.children.emplace_back(key, Model()) : *known).second = std::move(set);
}

/// The whole is replaced with a part of itself, or with a copy.
void assign(Generator& random, Value& value, Model& model) {
  if (random.below(2) || model.children.empty()) {
    Value copy = value;
    value = std::move(copy);
    return;
  }
  std::size_t at = random.below(model.children.size());
  value = value.array() ? (*value.array())[at] : value.dictionary()->begin()[at].value;
  Model part = std::move(model.children[at].second);
  model = std::move(part);
}

class RandomPropertyLists : public testing::TestWithParam<unsigned> {};

TEST_P(RandomPropertyLists, KeepTheirContentThroughEditsAndBothForms) {
  Generator random(GetParam());
  for (int round = 0; round < 20; ++round) {
    Model model = random.model(4);
    Value value = valueOf(model);
    for (int step = 0; step < 60; ++step) {
      if (model.kind != Model::scalar && random.below(20)) {
        edit(random, value, model);
      } else {
        assign(random, value, model);
      }
      ASSERT_TRUE(same(model, value)) << "step " << step << ": " << platform::describe(value);
      if (step % 20) continue;
      // Edits go on in a value that was read.
      ErrorRef error;
      Bytes bytes = (step % 40 ? writeBinary : writeXML)(value, &error).value_or("");
      value = read(std::move(bytes), &error);
      ASSERT_TRUE(same(model, value)) << (error ? error->describe() : platform::describe(value));
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Seeds, RandomPropertyLists, testing::Range(0u, 20u));

TEST(PropertyListValue, FindsAndRemovesAmongManyKeys) {
  Value value = Value::makeDictionary();
  Dictionary& dictionary = *value.dictionary();
  constexpr int count = 5000;
  for (int key = 0; key < count; ++key) dictionary.set(std::to_string(key), key);
  // From both ends and out of the middle, then in again.
  for (int key = 0; key < count; ++key) {
    bool goes = key < 1000 || key >= 4000 || key % 7 == 0;
    EXPECT_TRUE(!goes || dictionary.remove(std::to_string(key)));
  }
  for (int key = 0; key < 2000; ++key) dictionary.set(std::to_string(key), -key);
  for (int key = 0; key < count; ++key) {
    bool removed = key >= 4000 || (key >= 2000 && key % 7 == 0);
    Value expected = removed ? Value() : key < 2000 ? Value(-key) : Value(key);
    ASSERT_EQ(dictionary[std::to_string(key)], expected) << key;
  }
  dictionary.set("1994", Value());
  EXPECT_FALSE(dictionary.contains("1994"));
  EXPECT_EQ(dictionary.begin()->key, "1000");
  EXPECT_EQ((dictionary.end() - 1)->key, "1995");
}

TEST(PropertyListValue, ConvertsNothing) {
  struct Row {
    Value value;
    bool flag;
    std::string text;
  };
  for (const Row& row : std::vector<Row>{{Value(), false, "(null)"},
                                         {true, true, "1"},
                                         {"true", false, "true"},
                                         {0, false, "0"},
                                         {-1, true, "-1"},
                                         {0.0, false, "0"},
                                         {std::numeric_limits<double>::quiet_NaN(), true, "nan"},
                                         {Value::makeData("ab"), false, "<2 bytes>"},
                                         {Date{1.5}, false, "2001-01-01T00:00:01Z"},
                                         {Date{1e20}, false, "1e+20 s from 2001-01-01T00:00:00Z"}}) {
    EXPECT_EQ(row.value.boolValue(), row.flag) << row.text;
    EXPECT_EQ(platform::describe(row.value), row.text);
  }
  EXPECT_FALSE(Value(~0ull).integer());
  EXPECT_FALSE(Value(-1).unsignedInteger());
  EXPECT_FALSE(Value(true).integer());
  EXPECT_FALSE(Value(1).boolean());
  EXPECT_NE(Value(1), Value(1.0));
  EXPECT_NE(Value(-1), Value(~0ull));
  EXPECT_NE(Value("a"), Value::makeData("a"));
}

Bytes contents(const std::filesystem::path& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

TEST(PropertyListsOfPython, GoBothWays) {
  if (std::system("python3 -c pass") != 0) GTEST_SKIP() << "there is no python3";
  std::string pattern = testing::TempDir() + "plistXXXXXX";
  ASSERT_TRUE(mkdtemp(pattern.data()));
  std::filesystem::path directory = pattern;

  std::vector<Value> values;
  for (unsigned seed = 0; seed < 40; ++seed) values.push_back(valueOf(Generator(seed).model(5)));
  for (std::size_t number = 0; number < values.size() * 2; ++number) {
    Bytes bytes = (number % 2 ? writeBinary : writeXML)(values[number / 2], nullptr).value();
    std::ofstream(directory / (std::to_string(number) + ".in"), std::ios::binary) << bytes;
  }
  ASSERT_EQ(std::system(("python3 '" PROPERTY_LIST_SCRIPT "' '" + directory.string() + "'").c_str()), 0);
  for (std::size_t number = 0; number < values.size() * 2; ++number) {
    for (const char* form : {".binary", ".xml"}) {
      EXPECT_EQ(read(contents(directory / (std::to_string(number) + form))), values[number / 2]) << number << form;
    }
  }

  ErrorRef error;
  Value sample = read(contents(directory / "sample.binary"), &error);
  ASSERT_TRUE(sample.dictionary()) << error->describe();
  EXPECT_EQ(sample, read(contents(directory / "sample.xml")));
  const Dictionary& fields = *sample.dictionary();
  EXPECT_EQ(platform::describe(fields["limits"]),
            "(0, 255, 256, 65535, 65536, 4294967295, 4294967296, 9223372036854775807, 9223372036854775808, "
            "18446744073709551615, -1, -2147483648, -9223372036854775808)");
  EXPECT_EQ(platform::describe(fields["reals"]), "(0.1, -0, 1e+300, 5e-324, inf, -inf, nan)");
  EXPECT_EQ(platform::describe(fields["dates"]), "(0001-01-01T00:00:00Z, 2001-01-01T00:00:00Z, 9999-12-31T23:59:59Z)");
  EXPECT_EQ(platform::describe(fields["shared"]), "((same, {key = same}), (same, {key = same}))");
  EXPECT_EQ((*fields["keys"].dictionary())["299"], Value(299));
  EXPECT_TRUE(read(contents(directory / "uid.binary"), &error).isAbsent());
  EXPECT_EQ(error->code(), static_cast<std::int64_t>(ErrorCode::unsupported));
  std::filesystem::remove_all(directory);
}

}  // namespace
}  // namespace plist
