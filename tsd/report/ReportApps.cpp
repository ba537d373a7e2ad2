#include "tsd/report/ReportApps.h"

#include <optional>

#include "tsd/history/Verdicts.h"

namespace tsd {

using platform::Value;
using Kind = AppEvent::Kind;

namespace {

const char* toneOf(Outcome outcome) {
  if (isInOrder(outcome)) return "good";
  switch (outcome) {
    case Outcome::failed:
    case Outcome::refused:
    case Outcome::unrecorded:
      return "bad";
    case Outcome::waiting:
    case Outcome::cancelled:
    case Outcome::sent:
    case Outcome::downloaded:
    case Outcome::notReached:
      return "wait";
    default:
      return "still";
  }
}

/// The outcome that the event decides, as far as the run's journal tells; provisional for what is still running.
std::optional<Outcome> outcomeFor(Kind kind) {
  switch (kind) {
    case Kind::installed:
      return Outcome::installed;
    case Kind::restored:
    case Kind::leftToStore:
      return Outcome::placed;
    case Kind::failed:
    case Kind::transferFailed:
      return Outcome::failed;
    case Kind::cancelled:
      return Outcome::cancelled;
    case Kind::deleted:
      return Outcome::removed;
    case Kind::preparing:
    case Kind::prepared:
    case Kind::restoring:
    case Kind::transferring:
    case Kind::arrived:
    case Kind::installing:
      return Outcome::waiting;
    default:
      return outcomeOf(kind);
  }
}

/// Whether the event names the rule that decided about the app.
bool isVerdict(Kind kind) {
  auto outcome = outcomeFor(kind);
  bool isWay = !outcome || *outcome == Outcome::waiting || *outcome == Outcome::installed || kind == Kind::restored;
  return kind == Kind::chosen || kind == Kind::prepared || !isWay;
}

}  // namespace

ReportApps::ReportApps() : _story([this](const AppEvent& event) { take(event); }) {}

void ReportApps::take(const AppEvent& event) {
  if (event.app.empty()) return;
  App& app = _apps[event.app];
  if (event.kind == Kind::considered) return;
  if (auto outcome = outcomeFor(event.kind)) app.outcome = *outcome;
  if (isVerdict(event.kind)) app.rule = event.line();
  app.events.push_back(event);
}

void ReportApps::know(const AppOutcome& told) {
  App& app = _apps[told.id];
  if (app.outcome != told.outcome && !told.reason.empty()) app.rule = told.reason;
  app.outcome = told.outcome;
}

OutcomeCounts ReportApps::counts() const {
  OutcomeCounts counts;
  for (const auto& [id, app] : _apps) counts.add(app.outcome);
  return counts;
}

Value ReportApps::document(const std::function<std::string(const std::string&)>& nameOf) const {
  Value apps = Value::makeArray();
  for (const auto& [id, app] : _apps) {
    auto& item = apps.array()->appendDictionary();
    item.set("id", id);
    item.set("name", nameOf(id));
    item.set("outcome", wordsOf(app.outcome));
    item.set("rule", app.rule);
    Value events = Value::makeArray();
    for (const auto& event : app.events) {
      Value each = Value::makeArray();
      each.array()->append(event.time.count());
      each.array()->append(nameOfKind(event.kind));
      each.array()->append(event.line());
      events.array()->append(each);
    }
    item.set("events", events);
  }
  return apps;
}

Value pairOf(std::string_view one, const Value& other) {
  Value item = Value::makeArray();
  item.array()->append(one);
  item.array()->append(other);
  return item;
}

Value toneOfOutcomes() {
  Value words = Value::makeArray();
  for (int i = 0; i <= static_cast<int>(Outcome::notReached); ++i) {
    auto outcome = static_cast<Outcome>(i);
    words.array()->append(pairOf(wordsOf(outcome), Value(toneOf(outcome))));
  }
  return words;
}

}  // namespace tsd
