// Writes the seeds: fuzz_seeds FOLDER, where each target's come to lie in a folder of its name.

#include <filesystem>
#include <fstream>
#include <iostream>
#include <limits>
#include <string>
#include <utility>
#include <vector>

#include "plist/PropertyList.h"

namespace {

using platform::Bytes;
using platform::Date;
using platform::Value;

struct Seed {
  std::string target;
  std::string name;
  Bytes bytes;
};
using Seeds = std::vector<Seed>;

Value arrayOf(const std::vector<Value>& items) {
  Value value = Value::makeArray();
  for (const auto& item : items) value.array()->append(item);
  return value;
}

Value dictionaryOf(const std::vector<std::pair<std::string, Value>>& entries) {
  Value value = Value::makeDictionary();
  for (const auto& [key, entry] : entries) value.dictionary()->set(key, entry);
  return value;
}

Value nested(int depth) {
  Value value = Value::makeArray();
  for (int level = 1; level < depth; ++level) {
    Value outer = level % 2 ? dictionaryOf({{"in", value}}) : arrayOf({value});
    value = std::move(outer);
  }
  return value;
}

std::vector<std::pair<std::string, Value>> sampleLists() {
  Value many = Value::makeDictionary();
  for (int key = 0; key < 12; ++key) many.dictionary()->set("key " + std::to_string(key), key);
  return {
      {"scalars", arrayOf({true, false, 0, 255, 65536, -1, std::numeric_limits<std::int64_t>::min(), ~0ull, 0.5,
                           std::numeric_limits<double>::infinity(), Date{0}, Date{-1.5}})},
      {"texts", arrayOf({"", "plain", "größer €", "\U0001F600", "<&>\r\n", std::string(20, 'x'), "plain",
                         Value::makeData(""), Value::makeData("\1\2\3")})},
      {"index", many},
      {"records", arrayOf({dictionaryOf({{"identifier", "a"}, {"operation", "install"}}),
                           dictionaryOf({{"identifier", "b"}, {"operation", "remove"}}),
                           dictionaryOf({{"identifier", "c"}, {"more", arrayOf({1, Value::makeDictionary()})}})})},
      {"nested", nested(24)},
  };
}

Bytes inUTF16(const Bytes& text) {
  Bytes bytes = "\xff\xfe";
  for (char character : text) {
    bytes += character;
    bytes += '\0';
  }
  return bytes;
}

void addLists(Seeds& seeds) {
  for (const auto& [name, value] : sampleLists()) {
    Bytes binary = *plist::writeBinary(value), xml = *plist::writeXML(value);
    seeds.push_back({"binary_list", name, binary});
    seeds.push_back({"xml_list", name, xml});
    seeds.push_back({"round_trip", name + "-binary", binary});
    seeds.push_back({"round_trip", name + "-xml", xml});
  }
  auto xml = [&](const std::string& name, const Bytes& bytes) { seeds.push_back({"xml_list", name, bytes}); };
  xml("utf-16", inUTF16(*plist::writeXML(arrayOf({"wide", 1}))));
  xml("latin-1", "<?xml version='1.0' encoding='ISO-8859-1'?><plist><string>\xe9</string></plist>");
  xml("sections", "<!DOCTYPE plist><plist><!-- a --><string><![CDATA[<b>]]>&#x1F600;</string></plist>");
  xml("entities", "<!DOCTYPE plist [<!ENTITY a 'aa'>]><plist><string>&a;</string></plist>");
}

bool write(const std::filesystem::path& folder, const Seed& seed) {
  std::filesystem::create_directories(folder / seed.target);
  std::ofstream file(folder / seed.target / seed.name, std::ios::binary);
  return (file << seed.bytes).good();
}

}  // namespace

int main(int count, char** arguments) {
  if (count != 2) {
    std::cerr << "usage: fuzz_seeds FOLDER\n";
    return 2;
  }
  Seeds seeds;
  addLists(seeds);
  for (const auto& seed : seeds) {
    if (!write(arguments[1], seed)) {
      std::cerr << arguments[1] << ": cannot write " << seed.target << '/' << seed.name << '\n';
      return 1;
    }
  }
  std::cout << seeds.size() << " seeds\n";
  return 0;
}
