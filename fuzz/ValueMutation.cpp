#include "fuzz/ValueMutation.h"

#include <cstring>
#include <limits>
#include <random>
#include <string>

#include "fuzz/ValueFacts.h"
#include "plist/PropertyList.h"

/// The fuzzer's own way of changing bytes; not there in a program that only replays.
extern "C" __attribute__((weak)) std::size_t LLVMFuzzerMutate(std::uint8_t* data, std::size_t size,
                                                              std::size_t maximumSize);

namespace fuzz {
namespace {

using platform::Value;

class Mutation {
 public:
  explicit Mutation(unsigned seed) : _random(seed) {}

  bool oneIn(unsigned count) { return _random() % count == 0; }

  /// A copy in which about one value is another one.
  Value of(const Value& value) {
    if (oneIn(4)) return scalar(value);
    if (const auto* array = value.array()) {
      Value copy = Value::makeArray();
      std::size_t chosen = below(array->size() + 1);
      for (std::size_t at = 0; at < array->size(); ++at) {
        if (at == chosen && oneIn(6)) continue;
        copy.array()->append(at == chosen ? of((*array)[at]) : (*array)[at]);
        if (at == chosen && oneIn(6)) copy.array()->append((*array)[at]);
      }
      if (chosen == array->size()) copy.array()->append(scalar({}));
      return copy;
    }
    if (const auto* dictionary = value.dictionary()) {
      Value copy = Value::makeDictionary();
      std::size_t chosen = below(dictionary->size() + 1);
      for (const auto& entry : *dictionary) {
        bool isChosen = static_cast<std::size_t>(&entry - dictionary->begin()) == chosen;
        if (isChosen && oneIn(6)) continue;
        std::string key = isChosen && oneIn(8) ? changed(entry.key) : std::string(entry.key);
        copy.dictionary()->set(key, isChosen ? of(entry.value) : entry.value);
      }
      // Now and then so many that the dictionary is searched in another way.
      std::size_t added = chosen != dictionary->size() ? 0 : oneIn(4) ? 1 + below(12) : 1;
      for (; added > 0; --added) copy.dictionary()->set("added " + std::to_string(added), scalar({}));
      return copy;
    }
    return scalar(value);
  }

 private:
  std::size_t below(std::size_t count) { return _random() % count; }

  std::string changed(std::string_view text) {
    std::string bytes(text);
    bytes.resize(bytes.size() + 8);
    bytes.resize(LLVMFuzzerMutate(reinterpret_cast<std::uint8_t*>(bytes.data()), text.size(), bytes.size()));
    return bytes;
  }

  Value scalar(const Value& before) {
    if (auto text = before.string(); text && !oneIn(8)) return changed(*text);
    if (auto data = before.data(); data && !oneIn(8)) return Value::makeData(changed(*data));
    std::uint64_t bits = std::uint64_t{_random()} << 32 | _random();
    switch (below(8)) {
      case 0:
        return oneIn(2);
      case 1:
        return static_cast<std::int64_t>(bits) >> below(64);
      case 2:
        return bits;
      case 3:
        return oneIn(4) ? std::numeric_limits<double>::quiet_NaN() : static_cast<double>(bits) / 1024;
      case 4:
        return platform::Date{static_cast<double>(bits >> below(64)) / 4};
      case 5:
        return Value::makeData(changed("data"));
      case 6:
        return oneIn(2) ? Value::makeArray() : Value::makeDictionary();
      default:
        return changed("text");
    }
  }

  std::minstd_rand _random;
};

}  // namespace

std::size_t mutateList(std::uint8_t* data, std::size_t size, std::size_t maximumSize, unsigned seed) {
  Mutation mutation(seed);
  if (mutation.oneIn(4)) return LLVMFuzzerMutate(data, size, maximumSize);
  Value value = plist::read({reinterpret_cast<const char*>(data), size});
  if (value.isAbsent() || factsOf(value).nodes > largeTree(size)) return LLVMFuzzerMutate(data, size, maximumSize);
  value = mutation.of(value);
  auto bytes = mutation.oneIn(2) ? plist::writeBinary(value) : plist::writeXML(value);
  // A string of any bytes has no form; then the bytes of the list change.
  if (!bytes || bytes->size() > maximumSize) return LLVMFuzzerMutate(data, size, maximumSize);
  std::memcpy(data, bytes->data(), bytes->size());
  return bytes->size();
}

}  // namespace fuzz
