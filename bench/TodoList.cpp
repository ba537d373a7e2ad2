#include "bench/TodoList.h"

#include <random>
#include <string>

#include "bench/Measurements.h"

namespace bench {

using platform::Value;

Value makeTodoList(std::size_t entries) {
  constexpr const char* words[] = {"maps", "notes", "chess", "radio", "weather", "ledger", "atlas", "piano"};
  std::mt19937 random(20260101);
  auto upTo = [&](unsigned limit) { return std::to_string(random() % limit); };
  Value list = Value::makeArray();
  list.array()->reserve(entries);
  for (std::size_t number = 0; number < entries; ++number) {
    std::string word = words[random() % std::size(words)];
    auto& entry = list.array()->appendDictionary();
    entry.set("identifier", "com.example." + word + "." + std::to_string(number));
    entry.set("operation", "install");
    entry.set("version", upTo(12) + "." + upTo(10) + "." + upTo(30));
    entry.set("name", word + " number " + std::to_string(number));
  }
  return list;
}

std::size_t listSize() { return isShort ? 100 : 10000; }
std::size_t largeListSize() { return isShort ? 200 : 100000; }

}  // namespace bench
