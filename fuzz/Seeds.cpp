// Writes the seeds: fuzz_seeds FOLDER, where each target's come to lie in a folder of its name. fuzz_seeds FOLDER SIZE
// writes the hostile ones alone, that large.

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <limits>
#include <string>
#include <utility>
#include <vector>

#include "device/LocalDevice.h"
#include "fuzz/HostileShapes.h"
#include "fuzz/RecordingStream.h"
#include "fuzz/SampleApp.h"
#include "plist/PropertyList.h"
#include "record/RecordingPlatform.h"
#include "record/stream/EventReader.h"
#include "record/stream/EventWriter.h"
#include "tests/SampleContent.h"
#include "tests/ZipArchive.h"
#include "tsd/daemon/PluginLoader.h"

namespace {

using platform::Bytes;
using platform::Date;
using platform::Value;
using tests::dictionaryOf;

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

/// Up to so many keys, short enough for what a fuzzer reads.
Value wide(Value value, std::size_t keys) {
  for (auto& entries = *value.dictionary(); entries.size() < keys;) {
    entries.set("key " + std::to_string(entries.size()), entries.size());
  }
  return value;
}

void addTodoLists(Seeds& seeds) {
  auto entry = [](const char* identifier, const char* operation) {
    return dictionaryOf({{"identifier", identifier}, {"operation", operation}, {"version", "2.1"}, {"name", "Maps"}});
  };
  const Value lists[] = {
      arrayOf({entry("com.example.maps", "install"), entry("com.example.notes", "install")}),
      arrayOf({entry("com.example.maps", "remove"), entry("com.example.maps", "install")}),
      arrayOf({entry("com.example.maps", "install"), entry("com.example.maps", "install"), "text", 5}),
      arrayOf({entry("../../x", "install"), entry("a/b", "install"), entry("..", "remove"), entry("", "install")}),
      arrayOf({wide(entry("com.example.maps", "install"), 9), wide(entry("com.example.notes", "remove"), 17)}),
  };
  const char* names[] = {"two", "remove-and-install", "twice", "ways-out", "wide"};
  for (std::size_t at = 0; at < std::size(lists); ++at) {
    seeds.push_back({"todo_list", names[at], at % 2 ? *plist::writeXML(lists[at]) : *plist::writeBinary(lists[at])});
  }
}

void addRestoreLists(Seeds& seeds) {
  const fuzz::SampleApp app;
  const Value metadata = wide(dictionaryOf({{"title", "Maps"}, {"bundleVersion", "2.1"}}), 9);
  const Value entry = dictionaryOf({{"HarluneMetadata", Value::makeData(*plist::writeXML(metadata))},
                                    {"ApplicationSINF", Value::makeData("rights")},
                                    {"PlaceholderIcon", Value::makeData(app.icon)}});
  const Value bare = dictionaryOf({{"HarluneMetadata", Value::makeData(*plist::writeBinary(dictionaryOf({})))}});
  const Value full = wide(dictionaryOf({{"HarluneMetadata", Value::makeData(*plist::writeBinary(metadata))}}), 9);
  const Value good =
      dictionaryOf({{"com.example.maps", entry}, {"com.example.notes", bare}, {"com.example.mail", bare}});
  const Value odd = dictionaryOf({{"../../x", bare}, {"a/b", bare}, {"", bare}, {"text", "text"}});
  seeds.push_back({"restore_list", "good", *plist::writeBinary(good)});
  seeds.push_back({"restore_list", "wide", *plist::writeBinary(wide(dictionaryOf({{"com.example.maps", full}}), 9))});
  seeds.push_back({"restore_list", "ways-out", *plist::writeXML(odd)});
}

void addPackages(Seeds& seeds) {
  const Value facts = wide(dictionaryOf({{"KBBundleIdentifier", "com.example.maps"}, {"KBBundleVersion", "2.1"}}), 9);
  const tests::ZipArchive::Entry manifest{"Maps.app/Info.plist", *plist::writeBinary(facts)};
  const tests::ContentShape small{.manifestKeys = 9, .files = 2, .fileSize = 10};
  seeds.push_back({"package", "good", tests::packageOf("com.example.maps", "2.1", small)});
  seeds.push_back(
      {"package", "folders", tests::ZipArchive::of({{"Maps.app/", "", 040755}, manifest, {"Maps.app/a/b"}})});
  seeds.push_back(
      {"package", "ways-out",
       tests::ZipArchive::of({manifest, {"Maps.app/../../x", "x"}, {"/canary", "x"}, {"..\\canary", "x"}})});
  std::vector<tests::ZipArchive::Entry> deep{manifest};
  for (char name = 'a'; name < 'h'; ++name) deep.push_back({"Maps.app/" + std::string(1, name) + "/b/c/d/e"});
  seeds.push_back({"package", "folders-not-listed", tests::ZipArchive::of(deep)});
  seeds.push_back({"package", "link", tests::ZipArchive::of({manifest, {"Maps.app/link", "/canary", 0120777}})});
  seeds.push_back({"package", "lies", tests::ZipArchive::of({manifest, {"Maps.app/x", "xx", 0100644, 8, 70000}})});
}

void addIcons(Seeds& seeds) {
  seeds.push_back({"icon", "small", tests::pngOf(1, 1)});
  seeds.push_back({"icon", "wide", tests::pngOf(40, 8)});
  Bytes huge = tests::pngOf(8, 8);
  huge.replace(16, 8, Bytes("\0\0\x10\0\0\0\x10\1", 8));
  seeds.push_back({"icon", "larger-than-drawn", huge});
}

class Memory final : public record::Sink {
 public:
  bool write(platform::BytesView bytes) override {
    content += bytes;
    return true;
  }
  std::string content;
};

/// The same every time that the seeds are written.
std::string withoutTimes(const std::string& recording) {
  const auto sink = std::make_shared<Memory>();
  record::EventReader reader(recording);
  record::EventWriter writer(sink);
  std::size_t threads = 0, operations = 0;
  for (record::Event event; reader.next(event);) {
    while (threads < reader.threads().size()) writer.addThread(reader.threads()[threads++]);
    while (operations < reader.operations().size()) writer.addOperation(reader.operations()[operations++]);
    writer.write(event.kind, event.thread, event.operation, 0, event.payload);
  }
  writer.finish();
  return sink->content;
}

/// What the plug-in answers on an empty device.
void addRecordedCalls(Seeds& seeds) {
  const auto device = device::makeMemoryDevice(device::makeManualEventQueue(), {});
  const tsd::PluginLoader plugin{SHIPPED_PLUGIN};
  const auto record = [&](const char* name, const auto& work) {
    const auto sink = std::make_shared<Memory>();
    const auto recording = record::recordingPlatform(device->platform(), sink, {.threadName = [] { return "daemon"; }});
    auto client = recording->makeClient([&](const platform::Platform& platform) { return plugin.create(platform); });
    work(*client);
    client = nullptr;
    recording->finish();
    seeds.push_back({"recording", name, fuzz::streamOf(withoutTimes(sink->content))});
  };
  record("questions", [](platform::TSClient& client) {
    client.supportedDataclasses();
    client.disabledAssetTypes();
    client.vantorIDsForAssets();
  });
  record("sync", [](platform::TSClient& client) {
    client.prepareForSyncWithHostAnchor("1", nullptr, nullptr);
    client.installedAssets();
    client.reconcileSync(0, "2", nullptr, nullptr);
    client.syncEndedWithSuccess(true);
  });
}

/// A list that is told again with changes.
void addRecordedLists(Seeds& seeds) {
  const auto sink = std::make_shared<Memory>();
  record::EventWriter writer(sink);
  const auto thread = writer.addThread("registry");
  const auto operation = writer.addOperation({"TSClient", "assetTransferSucceeded", "client asset succeeded error"});
  std::vector<Value> elements;
  for (int app = 0; app < 40; ++app) elements.emplace_back("com.example.app-" + std::to_string(app));
  for (int round = 0; round < 3; ++round) {
    elements[7] = round;
    record::ItemWriter items;
    items.value(arrayOf(elements));
    items.text(std::string(60, 'x'));
    items.data(std::string(2100, static_cast<char>('a' + round)) + std::string(2100, 'z'));
    writer.write(record::EventKind::enter, thread, operation, 1, items.bytes());
    writer.write(record::EventKind::leave, thread, operation, 0, {});
    elements.erase(elements.begin() + 20);
  }
  writer.finish();
  seeds.push_back({"recording", "lists", fuzz::streamOf(sink->content)});
}

void addShapes(Seeds& seeds, std::size_t size) {
  auto add = [&](const char* target, const std::vector<fuzz::Shape>& shapes) {
    for (const auto& [name, bytes] : shapes) seeds.push_back({target, name, bytes});
  };
  add("binary_list", fuzz::binaryShapes(fuzz::Place::bare, size));
  add("round_trip", fuzz::binaryShapes(fuzz::Place::bare, size));
  add("xml_list", fuzz::xmlShapes(size));
  add("todo_list", fuzz::binaryShapes(fuzz::Place::todoList, size));
  add("restore_list", fuzz::binaryShapes(fuzz::Place::restoreList, size));
  const Value facts = dictionaryOf({{"KBBundleIdentifier", "com.example.maps"}});
  add("package",
      {fuzz::longTable(
          tests::ZipArchive::of({{"Maps.app/Info.plist", *plist::writeBinary(facts)}, {"Maps.app/x", "x"}}), size)});
}

bool write(const std::filesystem::path& folder, const Seed& seed) {
  std::filesystem::create_directories(folder / seed.target);
  std::ofstream file(folder / seed.target / seed.name, std::ios::binary);
  return (file << seed.bytes).good();
}

}  // namespace

int main(int count, char** arguments) {
  constexpr std::size_t smallSize = 1500;
  const std::size_t size = count == 3 ? std::strtoul(arguments[2], nullptr, 10) : smallSize;
  if (count < 2 || count > 3 || size == 0) {
    std::cerr << "usage: fuzz_seeds FOLDER [SIZE]\n";
    return 2;
  }
  Seeds seeds;
  addShapes(seeds, size);
  if (count == 2) {
    addLists(seeds);
    addTodoLists(seeds);
    addRestoreLists(seeds);
    addPackages(seeds);
    addIcons(seeds);
    addRecordedCalls(seeds);
    addRecordedLists(seeds);
  }
  for (const auto& seed : seeds) {
    if (!write(arguments[1], seed)) {
      std::cerr << arguments[1] << ": cannot write " << seed.target << '/' << seed.name << '\n';
      return 1;
    }
  }
  std::cout << seeds.size() << " seeds\n";
  return 0;
}
