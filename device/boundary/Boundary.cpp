#include "device/boundary/Boundary.h"

#include <algorithm>
#include <atomic>
#include <csignal>
#include <cstdlib>
#include <map>

#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

using platform::ErrorRef;
using platform::Value;

namespace {
/// What the bystander does on this thread passes no injection point.
constinit thread_local bool bystanderActs = false;
}  // namespace

struct Boundary::State {
  struct Rule {
    InjectionRule rule;
    std::atomic<std::uint64_t> matches{0};

    explicit Rule(InjectionRule rule) : rule(std::move(rule)) {}
  };
  struct KnownObject {
    std::uint64_t number;
    std::optional<std::weak_ptr<const void>> ownership;

    bool gone() const { return ownership && ownership->expired(); }
  };

  // Set before the first call.
  std::vector<JournalListener> journals;
  Bystander bystander;
  Decliner decliner;
  std::vector<std::unique_ptr<Rule>> rules;

  platform::Clock* const clock;
  const platform::Clock::Instant start;

  platform::Mutex journalMutex;
  std::uint64_t records GUARDED_BY(journalMutex) = 0;

  platform::Mutex objectsMutex;
  // By address first, as that is how objects are forgotten.
  std::map<std::pair<const void*, std::string>, KnownObject> objects GUARDED_BY(objectsMutex);
  std::map<std::string, std::uint64_t, std::less<>> lastNumbers GUARDED_BY(objectsMutex);
  std::size_t sweepAt GUARDED_BY(objectsMutex) = 256;

  explicit State(platform::Clock* clock) : clock(clock), start(now()) {}

  platform::Clock::Instant now() const { return clock ? clock->now() : platform::Clock::Instant{}; }
  std::chrono::microseconds elapsed() const {
    return std::chrono::duration_cast<std::chrono::microseconds>(now() - start);
  }

  void sweep() REQUIRES(objectsMutex) {
    if (objects.size() < sweepAt) return;
    std::erase_if(objects, [](const auto& entry) { return entry.second.gone(); });
    sweepAt = std::max<std::size_t>(256, 2 * objects.size());
  }

  std::string nameOf(const char* kind, const void* address, std::optional<std::weak_ptr<const void>> ownership) {
    platform::Mutex::Lock lock(objectsMutex);
    auto [entry, added] = objects.try_emplace({address, kind});
    // An address alone may be that of an object just being destroyed; only its owner can tell that an object is new.
    if (added || (ownership && entry->second.gone())) entry->second.number = ++lastNumbers[kind];
    if (ownership) entry->second.ownership = std::move(ownership);
    std::string name = std::string(kind) + '#' + std::to_string(entry->second.number);
    if (added) sweep();
    return name;
  }

  /// The rules that apply to this call now, in their order.
  template <class Each>
  void forEachRule(const InjectionPoint& point, std::string_view app, Each&& each) {
    if (bystanderActs) return;
    for (auto& candidate : rules) {
      const InjectionRule& rule = candidate->rule;
      if (!rule.matches(point, app)) continue;
      std::uint64_t match = candidate->matches.fetch_add(1) + 1;
      if (rule.isDue(match)) each(rule);
    }
  }

  /// True when the rule is carried out before the body, and has been.
  bool actBefore(const InjectionRule& rule) {
    switch (rule.action) {
      case InjectionRule::Action::kill:
        die();
      case InjectionRule::Action::cancel:
      case InjectionRule::Action::prioritize:
      case InjectionRule::Action::uninstall:
      case InjectionRule::Action::store: {
        EventQueue::OutsideCall outside;
        bystanderActs = true;
        if (bystander) bystander(rule.action, rule.target);
        bystanderActs = false;
        return true;
      }
      default:
        return false;
    }
  }

  [[noreturn]] void die() const {
    for (const auto& journal : journals) {
      if (journal.handOver) journal.handOver();
    }
    kill();
  }

  void write(CallRecord record) {
    platform::Mutex::Lock lock(journalMutex);
    record.number = ++records;
    record.time = elapsed();
    for (const auto& journal : journals) journal.hear(record);
  }
};

Boundary::Boundary(platform::Clock* clock) : _state(std::make_unique<State>(clock)) {}
Boundary::~Boundary() = default;

void Boundary::addJournal(JournalListener listener) {
  _showsWhole |= listener.detail == JournalDetail::whole;
  _state->journals.push_back(std::move(listener));
  _journaled = true;
  _watched = true;
}

void Boundary::setRules(std::vector<InjectionRule> rules) {
  _state->rules.clear();
  for (auto& rule : rules) _state->rules.push_back(std::make_unique<State::Rule>(std::move(rule)));
  _watched = _journaled || !_state->rules.empty() || _state->decliner;
}

std::vector<InjectionRule> Boundary::idleRules() const {
  std::vector<InjectionRule> idle;
  for (const auto& each : _state->rules) {
    bool hasActed = each->matches >= std::max<std::uint64_t>(1, each->rule.match);
    if (!hasActed && !isAboutSteps(each->rule)) idle.push_back(each->rule);
  }
  return idle;
}

void Boundary::setBystander(Bystander bystander) { _state->bystander = std::move(bystander); }

void Boundary::setDecliner(Decliner decliner) {
  _state->decliner = std::move(decliner);
  if (_state->decliner) _watched = true;
}

ErrorRef Boundary::declinedError(const std::string& reason) { return platform::makeError("Declined", 1, reason); }
bool Boundary::isDeclined(const ErrorRef& error) { return error && error->domain() == "Declined"; }

void Boundary::die() const { _state->die(); }
void Boundary::kill() {
  std::raise(SIGKILL);
  std::abort();
}

ErrorRef Boundary::injectedError(const Crossing& crossing) {
  return platform::makeError("Injection", 1,
                             std::string("injected at ") + crossing.point.service() + "." + crossing.point.operation());
}

CallRecord Boundary::makeRecord(const Visit& visit) {
  const Crossing& crossing = visit.crossing;
  CallRecord record;
  record.began = visit.began;
  record.thread = currentThreadName();
  record.service = crossing.point.service();
  record.operation = crossing.point.operation();
  record.app = crossing.app;
  return record;
}

void Boundary::begin(Visit& visit, CallArguments arguments) {
  using Action = InjectionRule::Action;
  const Crossing& crossing = visit.crossing;
  if (_journaled) {
    visit.began = _state->elapsed();
    visit.arguments = Value::makeDictionary();
    for (const auto& argument : arguments) {
      visit.arguments.dictionary()->set(argument.name, argument.journalValue(*this));
      visit.argumentNames.push_back(argument.name);
    }
  }
  _state->forEachRule(crossing.point, crossing.app, [&](const InjectionRule& rule) {
    if (_state->actBefore(rule)) return;
    if (rule.action == Action::error) visit.addsError = true;
    if (rule.action == Action::killAfter) visit.dies = true;
    if (visit.order != Order::run) return;
    if (rule.action == Action::fail) visit.order = Order::fail;
    if (rule.action == Action::none) visit.order = Order::none;
    if (rule.action == Action::value) {
      visit.order = Order::value;
      visit.number = rule.number;
    }
  });
  if (_state->decliner && visit.direction == Direction::out && !crossing.isMessage) {
    visit.declined = _state->decliner(crossing.point.service(), crossing.point.operation());
    if (visit.declined) visit.order = Order::fail;
  }
  if (!_journaled || visit.direction == Direction::out || visit.order != Order::run) return;
  CallRecord record = makeRecord(visit);
  record.arguments = std::move(visit.arguments);
  record.argumentNames = std::move(visit.argumentNames);
  _state->write(std::move(record));
}

void Boundary::settleError(const Visit& visit, ErrorRef* error) const {
  if (!error) return;
  if (visit.declined)
    *error = visit.declined;
  else if (visit.order == Order::fail || visit.addsError)
    *error = injectedError(visit.crossing);
  else if (visit.order != Order::run)
    *error = nullptr;
}

void Boundary::finish(Visit& visit, Value result, const ErrorRef* error) {
  bool inward = visit.direction == Direction::in;
  if (_journaled && !(inward && visit.order != Order::run)) {
    CallRecord record = makeRecord(visit);
    // The arguments of a call into the plug-in are in its first record.
    record.arguments = inward ? Value::makeDictionary() : std::move(visit.arguments);
    record.argumentNames = std::move(visit.argumentNames);
    record.result = std::move(result);
    if (error) record.error = *error;
    record.end = inward;
    _state->write(std::move(record));
  }
  if (visit.dies) die();
}

std::optional<InjectionRule> Boundary::atTransfer(std::string_view app) {
  std::optional<InjectionRule> ordered;
  if (!_watched) return ordered;
  _state->forEachRule({"", "transfer"}, app, [&](const InjectionRule& rule) {
    if (!_state->actBefore(rule) && !ordered) ordered = rule;
  });
  return ordered;
}

std::string Boundary::nameOfObject(const char* kind, const void* address) {
  return _state->nameOf(kind, address, std::nullopt);
}

std::string Boundary::nameOfObject(const char* kind, const void* address, const std::weak_ptr<const void>& ownership) {
  return _state->nameOf(kind, address, ownership);
}

void Boundary::forgetObject(const void* address) {
  if (!_journaled) return;
  platform::Mutex::Lock lock(_state->objectsMutex);
  auto first = _state->objects.lower_bound({address, std::string()});
  auto last = first;
  while (last != _state->objects.end() && last->first.first == address) ++last;
  _state->objects.erase(first, last);
}

Value CallArgument::journalValue(Boundary& boundary) const {
  switch (kind) {
    case Kind::absent:
      return {};
    case Kind::boolean:
      return integer != 0;
    case Kind::integer:
      return isUnsigned ? Value(static_cast<std::uint64_t>(integer)) : Value(integer);
    case Kind::real:
      return real;
    case Kind::text:
      return shownText(boundary, text);
    case Kind::bytes:
      return integer;
    case Kind::value:
      return shownValue(boundary, *static_cast<const Value*>(pointer));
    case Kind::object:
      return boundary.nameOfObject(text.data(), pointer);
    case Kind::error:
      return journalValueOfError(*static_cast<const ErrorRef*>(pointer));
    case Kind::shown:
      return show(boundary, pointer);
  }
  return {};
}

Value journalValueOfError(const ErrorRef& error) {
  if (!error) return {};
  auto value = Value::makeDictionary();
  auto& entries = *value.dictionary();
  entries.set("domain", error->domain());
  entries.set("code", error->code());
  if (!error->description().empty()) entries.set("description", error->description());
  if (error->underlying()) entries.set("underlying", journalValueOfError(error->underlying()));
  return value;
}

}  // namespace device
