#include <algorithm>
#include <utility>

#include "record/replaying/Replayer.h"
#include "record/stream/CallText.h"
#include "record/stream/Comparison.h"

/// How a call that is not the recorded one is taken.
namespace record {

namespace {
/// How far ahead a call is looked for that comes too early.
constexpr std::size_t farthestAhead = 2048;
constexpr std::size_t mostDifferences = 1000;

bool isCall(const Event& event) { return event.kind == EventKind::call; }
}  // namespace

const char* nameOf(Difference::Kind kind) {
  switch (kind) {
    case Difference::Kind::otherArguments:
      return "other arguments";
    case Difference::Kind::otherResult:
      return "another result";
    case Difference::Kind::missing:
      return "a missing call";
    case Difference::Kind::additional:
      return "an additional call";
    case Difference::Kind::standing:
      return "a wait without an end";
  }
  return "";
}

/// True when the recording has an answer to the call, which is then the next to come for this thread.
bool Replayer::match(Player& player, const Operation& operation, const ItemWriter& arguments) {
  const Event* next = head();
  if (!next) {
    passTurn();
    return false;
  }
  if (isCall(*next) && isOf(*next, operation) && isSame(*next, arguments)) {
    pop();
    return true;
  }
  const std::string came = callLine({operation.service, operation.name, operation.parameters}, arguments.whole());
  if (auto place = findAhead(player, &operation, arguments)) {
    skipTo(player, *place, came);
    if (isOver()) return false;
    _ahead.erase(_ahead.begin() + static_cast<std::ptrdiff_t>(*findAhead(player, &operation, arguments)));
    ++_result.events;
    return true;
  }
  dropIgnored(player);
  next = head();
  if (next && isCall(*next) && isOf(*next, operation)) {
    differ(Difference::Kind::otherArguments, player, next, came);
    if (isOver()) return false;
    pop();
    return true;
  }
  differ(Difference::Kind::additional, player, next, came).of = operation.of;
  return false;
}

/// True when the recording has that call before anything of the thread that is compared. What it says does not matter,
/// but it keeps its place: somebody else may have had the turn while it was made.
bool Replayer::matchIgnored(Player& player, const Operation& operation) {
  const auto place = findIgnored(player, &operation);
  if (!place) return false;
  skipTo(player, *place, {});
  _ahead.erase(_ahead.begin() + static_cast<std::ptrdiff_t>(*findIgnored(player, &operation)));
  ++_result.events;
  return true;
}

/// What the plug-in left out before a call that is compared.
void Replayer::dropIgnored(const Player& player) {
  while (findIgnored(player, nullptr)) {
    const auto isOfPlayer = [&](const Event& event) { return event.thread == player.number; };
    // The call and its answer.
    for (int i = 0; i < 2; ++i) {
      const auto event = std::find_if(_ahead.begin(), _ahead.end(), isOfPlayer);
      if (event != _ahead.end()) _ahead.erase(event);
    }
  }
}

/// The place of the thread's next call that is not compared: of that operation, or without one of any.
std::optional<std::size_t> Replayer::findIgnored(const Player& player, const Operation* operation) {
  for (std::size_t place = 0; place < farthestAhead; ++place) {
    const Event* event = ahead(place);
    if (!event) return std::nullopt;
    if (event->thread != player.number) continue;
    if (!isIgnored(*event)) return std::nullopt;
    if (isCall(*event) && (!operation || isOf(*event, *operation))) return place;
  }
  return std::nullopt;
}

/// The place of that call of the thread in the rest of what it is inside of; without an operation, of its return.
std::optional<std::size_t> Replayer::findAhead(const Player& player, const Operation* operation,
                                               const ItemWriter& arguments) {
  int depth = 0;
  for (std::size_t place = 0; place < farthestAhead; ++place) {
    const Event* next = ahead(place);
    if (!next) return std::nullopt;
    const Event& event = *next;
    if (event.thread != player.number) continue;
    if (depth == 0 && leaves(event.kind)) return operation ? std::nullopt : std::optional(place);
    if (depth == 0 && operation && isCall(event) && isOf(event, *operation) && isSame(event, arguments)) return place;
    depth += opens(event.kind) ? 1 : -1;
  }
  return std::nullopt;
}

/// The plug-in left out what the thread did before that place. What others did meanwhile stays.
void Replayer::skipTo(const Player& player, std::size_t place, std::string_view came) {
  int depth = 0;
  for (std::size_t at = 0; at < place;) {
    if (_ahead[at].thread != player.number) {
      ++at;
      continue;
    }
    const bool begins = opens(_ahead[at].kind);
    if (depth == 0 && begins && !isIgnored(_ahead[at])) {
      differ(Difference::Kind::missing, player, &_ahead[at], std::string(came));
      if (isOver()) return;
    }
    depth += begins ? 1 : -1;
    _ahead.erase(_ahead.begin() + static_cast<std::ptrdiff_t>(at));
    --place;
  }
}

std::vector<std::string> Replayer::standing() const {
  std::vector<std::string> lines;
  for (const auto& player : _players) {
    std::string line = player->number < _reader.threads().size() ? _reader.threads()[player->number] : "?";
    if (player->inside.empty()) line += ": outside the plug-in";
    const char* separator = ": in ";
    for (const auto& open : player->inside) {
      line.append(separator).append(open.service).append(".").append(open.name);
      separator = ", in ";
    }
    lines.push_back(std::move(line));
  }
  return lines;
}

Difference& Replayer::differ(Difference::Kind kind, const Player& player, const Event* expected, std::string came) {
  Difference difference;
  difference.kind = kind;
  difference.came = std::move(came);
  difference.standing = standing();
  difference.thread = player.number < _reader.threads().size() ? _reader.threads()[player.number] : "";
  if (!player.inside.empty())
    difference.inside.append(player.inside.back().service).append(".").append(player.inside.back().name);
  if (expected) {
    const OperationName& name = nameOfEvent(*expected);
    difference.event = expected->number;
    difference.of = expected->kind == EventKind::call ? classOf(name) : OperationClass::service;
    difference.expected = eventLine(expected->kind, name, wholePayload(*expected));
  }
  _result.differences.push_back(std::move(difference));
  if (!_options.goOn || _result.differences.size() == mostDifferences) {
    _messenger = &player;
    end();
  }
  return _result.differences.back();
}

/// The plug-in is listened to until the first message behind a difference: the one that it would have written.
std::optional<Replayer::Answer> Replayer::afterEnd(const Operation& operation, const ItemWriter& arguments) {
  const std::string_view name = operation.name;
  if (std::string_view(operation.service) != "LogHandle") return std::nullopt;
  if (name == "isEnabled") {
    ItemWriter items;
    items.boolean(true);
    Answer answer;
    answer.event.payload = items.take();
    return answer;
  }
  const std::string whole = arguments.whole();
  ItemReader reader(whole);
  reader.object();
  reader.number();
  _result.differences.back().message = reader.text();
  _messenger = nullptr;
  return std::nullopt;
}

}  // namespace record
