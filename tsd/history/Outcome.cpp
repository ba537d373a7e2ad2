#include "tsd/history/Outcome.h"

#include <iterator>
#include <utility>

#include "tsd/terminal/Console.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

constexpr const char* names[] = {"INSTALLED",  "REMOVED",   "ABSENT",      "PLACED",     "UNRECORDED",    "SENT",
                                 "DOWNLOADED", "WAITING",   "NOT_ALLOWED", "SKIPPED",    "NOT_REQUESTED", "REFUSED",
                                 "UNCHANGED",  "CANCELLED", "FAILED",      "NOT_REACHED"};
static_assert(std::size(names) == static_cast<std::size_t>(Outcome::notReached) + 1);

}  // namespace

const char* nameOf(Outcome outcome) { return names[static_cast<std::size_t>(outcome)]; }

std::string wordsOf(Outcome outcome) {
  std::string words = nameOf(outcome);
  for (char& c : words) c = c == '_' ? ' ' : static_cast<char>(c - 'A' + 'a');
  return words;
}

std::optional<Outcome> outcomeNamed(std::string_view name) {
  for (std::size_t place = 0; place < std::size(names); ++place) {
    if (names[place] == name) return static_cast<Outcome>(place);
  }
  return std::nullopt;
}

bool isInOrder(Outcome outcome) { return outcome <= Outcome::placed; }

OutcomeCounts::OutcomeCounts(const std::vector<AppOutcome>& apps) {
  for (const auto& app : apps) add(app.outcome);
}

std::size_t OutcomeCounts::total() const {
  std::size_t total = 0;
  for (const auto& [outcome, count] : _counts) total += count;
  return total;
}

std::size_t OutcomeCounts::inOrder() const {
  std::size_t good = 0;
  for (const auto& [outcome, count] : _counts) good += isInOrder(outcome) ? count : 0;
  return good;
}

std::string OutcomeCounts::text() const {
  if (total() == 0) return {};
  std::string text = std::to_string(inOrder()) + " of " + std::to_string(total()) +
                     (total() == 1 ? " app in order" : " apps in order");
  for (const auto& [outcome, count] : _counts) {
    if (!isInOrder(outcome)) text += ", " + std::to_string(count) + ' ' + wordsOf(outcome);
  }
  return text;
}

Value OutcomeCounts::document() const {
  Value document = Value::makeDictionary();
  for (const auto& [outcome, count] : _counts) document.dictionary()->set(nameOf(outcome), count);
  return document;
}

OutcomeCounts OutcomeCounts::ofDocument(const Value& document) {
  OutcomeCounts counts;
  if (!document.dictionary()) return counts;
  for (const auto& entry : *document.dictionary()) {
    auto outcome = outcomeNamed(entry.key);
    auto count = entry.value.unsignedInteger();
    if (outcome && count) counts.add(*outcome, static_cast<std::size_t>(*count));
  }
  return counts;
}

std::string reasonsText(const std::vector<AppOutcome>& apps) {
  std::map<std::pair<Outcome, std::string>, std::size_t> counts;
  for (const auto& app : apps) ++counts[{app.outcome, app.reason}];
  std::string text;
  for (const auto& app : apps) {
    auto& count = counts[{app.outcome, app.reason}];
    if (app.reason.empty() || count == 0) continue;
    std::string whose = count == 1 ? printable(app.id) : std::to_string(count) + " apps " + wordsOf(app.outcome);
    text += noteLine(whose + ": ", app.reason);
    count = 0;
  }
  return text;
}

Value documentOf(const std::vector<AppOutcome>& apps) {
  Value array = Value::makeArray();
  for (const auto& app : apps) {
    auto& item = array.array()->appendDictionary();
    item.set("id", app.id);
    item.set("name", app.name);
    item.set("version", app.version);
    item.set("outcome", nameOf(app.outcome));
    item.set("reason", app.reason);
  }
  return array;
}

}  // namespace tsd
