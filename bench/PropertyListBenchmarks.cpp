#include <benchmark/benchmark.h>
#include <expat.h>
#include <stdio.h>

#include <fstream>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

#include "bench/Benchmarks.h"
#include "bench/TodoList.h"
#include "plist/PropertyList.h"

// The property-list codec against the Python standard library's module and the XML library.

namespace bench {

namespace {

using platform::Bytes;
using platform::Dictionary;
using platform::Value;

void readList(benchmark::State& state, const Bytes& document) {
  for (auto _ : state) {
    state.PauseTiming();
    Bytes input = document;  // whoever reads a file hands its bytes over
    state.ResumeTiming();
    Value list = plist::read(std::move(input));
    if (!list.array()) state.SkipWithError("not read");
    benchmark::DoNotOptimize(list);
  }
}

/// Many documents, each read and gone before the next.
void readEach(benchmark::State& state, const std::vector<Bytes>& documents) {
  for (auto _ : state) {
    state.PauseTiming();
    std::vector<Bytes> inputs = documents;
    state.ResumeTiming();
    for (Bytes& input : inputs) {
      Value manifest = plist::read(std::move(input));
      if (!manifest.dictionary()) state.SkipWithError("not read");
      benchmark::DoNotOptimize(manifest);
    }
  }
}

void writeList(benchmark::State& state, const Value& list, bool binary) {
  for (auto _ : state) {
    auto bytes = binary ? plist::writeBinary(list) : plist::writeXML(list);
    if (!bytes) state.SkipWithError("not written");
    benchmark::DoNotOptimize(bytes);
  }
}

/// What the XML library alone takes, all handlers set and empty.
void parseXML(benchmark::State& state, const Bytes& document) {
  for (auto _ : state) {
    XML_Parser parser = XML_ParserCreate(nullptr);
    XML_SetElementHandler(
        parser, [](void*, const char*, const char**) {}, [](void*, const char*) {});
    XML_SetCharacterDataHandler(parser, [](void*, const char*, int) {});
    auto status = XML_Parse(parser, document.data(), static_cast<int>(document.size()), 1);
    XML_ParserFree(parser);
    if (status != XML_STATUS_OK) state.SkipWithError("not parsed");
  }
}

/// What an app may say of itself: 40 keys in a bit less than half a KiB.
Bytes makeManifest(unsigned number) {
  std::mt19937 random(number);
  const std::string version = std::to_string(number);
  const Value values[] = {version, "phone", random() % 2 == 0, version, "phone", version, random() % 100, "phone"};
  Value manifest = Value::makeDictionary();
  Dictionary& keys = *manifest.dictionary();
  for (const char* of : {"app", "bar", "icon", "ink", "key", "map", "pen", "tag"}) {
    for (const char* what : {"", "Is", "In", "Max", "On"}) {
      keys.set(std::string(of) + what, values[keys.size() % std::size(values)]);
    }
  }
  keys.set("iconIn", Value::makeArray());
  keys.set("keyIn", Value::makeDictionary());
  for (const char* text : {"phone", "tablet"}) {
    keys.array("iconIn")->append(text);
    keys.dictionary("keyIn")->set(text, "plain");
  }
  return plist::writeBinary(manifest).value();
}

/// 6.4 MB of data in a hundred entries.
Value makeListWithData() {
  std::mt19937 random(20260101);
  Value list = Value::makeArray();
  for (int number = 0; number < 100; ++number) {
    Bytes content(isShort ? 100 : 64000, '\0');
    for (char& byte : content) byte = static_cast<char>(random());
    auto& entry = list.array()->appendDictionary();
    entry.set("name", "part " + std::to_string(number));
    entry.set("content", Value::makeData(content));
  }
  return list;
}

/// The Python module, in a process of its own that takes its own time.
void runPython(benchmark::State& state, const std::string& operation, const std::string& file) {
  for (auto _ : state) {
    std::string command = "python3 '" BENCH_DIRECTORY "/python_property_list.py' " + operation + " '" + file + "'";
    FILE* output = popen(command.c_str(), "r");
    double seconds = 0;
    bool answered = output && fscanf(output, "%lf", &seconds) == 1;
    if (!output || pclose(output) != 0 || !answered) state.SkipWithError("no answer from Python");
    state.SetIterationTime(seconds);
  }
}

}  // namespace

void PropertyListBenchmarks::add() {
  Value list = makeTodoList(listSize()), large = makeTodoList(largeListSize());
  Bytes binary = plist::writeBinary(list).value(), xml = plist::writeXML(list).value();
  Bytes withData = plist::writeXML(makeListWithData()).value();
  std::vector<Bytes> manifests;
  Value manifestsAsData = Value::makeArray();
  for (unsigned number = 0; number < (isShort ? 10 : 1000); ++number) {
    manifests.push_back(makeManifest(number));
    manifestsAsData.array()->append(Value::makeData(manifests.back()));
  }
  auto file = [&](const char* name, const Bytes& content) {
    std::string path = _folder.path() + "/" + name;
    if (!(std::ofstream(path, std::ios::binary) << content)) throw std::runtime_error("cannot write " + path);
    return path;
  };
  std::string binaryFile = file("binary", binary), withDataFile = file("data", withData);
  std::string manifestsFile = file("manifests", plist::writeBinary(manifestsAsData).value());
  auto add = [](const char* name, auto function) { return benchmark::RegisterBenchmark(name, function); };
  add("read binary", [=](auto& state) { readList(state, binary); });
  add("read XML", [=](auto& state) { readList(state, xml); });
  add("read manifests", [=](auto& state) { readEach(state, manifests); });
  add("read XML with data", [=](auto& state) { readList(state, withData); });
  add("write binary", [=](auto& state) { writeList(state, list, true); });
  add("write large binary", [=](auto& state) { writeList(state, large, true); });
  add("write XML", [=](auto& state) { writeList(state, list, false); });
  add("parse XML", [=](auto& state) { parseXML(state, xml); });
  auto addPython = [&](const char* name, const char* operation, const std::string& of) {
    std::string what = operation;
    add(name, [=](auto& state) { runPython(state, what, of); })->UseManualTime();
  };
  addPython("Python: read binary", "read", binaryFile);
  addPython("Python: read manifests", "read-each", manifestsFile);
  addPython("Python: read XML with data", "read", withDataFile);
  addPython("Python: write binary", "write-binary", binaryFile);
  addPython("Python: write XML", "write-xml", binaryFile);
}

void PropertyListBenchmarks::printRows(const Measurements& taken) const {
  auto timesAsFast = [&](const char* work, const char* operation, double goal) {
    double figure = taken[std::string("Python: ") + operation] / taken[operation];
    printRow(work, decimal(figure, 1) + " times as fast as Python's module", "at least " + decimal(goal, 0),
             figure >= goal);
  };
  timesAsFast("read a binary list of 10,000 entries", "read binary", 40);
  timesAsFast("write it in binary form", "write binary", 40);
  double growth = taken["write large binary"] / static_cast<double>(largeListSize()) /
                  (taken["write binary"] / static_cast<double>(listSize()));
  printRow("... an entry at 100,000 against one at 10,000", decimal(growth) + " times its time", "at most 2",
           growth <= 2);
  double overhead = taken["read XML"] / taken["parse XML"];
  printRow("read it as XML", decimal(overhead) + " times the XML library alone", "at most 1.4", overhead <= 1.4);
  timesAsFast("write it as XML", "write XML", 30);
  timesAsFast("read 1,000 manifests of 40 keys", "read manifests", 40);
  timesAsFast("read XML with data (base64), 8.6 MB", "read XML with data", 8);
}

}  // namespace bench
