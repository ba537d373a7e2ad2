#include "record/replaying/Replayer.h"

#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <chrono>
#include <exception>
#include <system_error>
#include <utility>

#include "record/RecordingError.h"
#include "record/calls/Services.h"
#include "record/replaying/ReplayCrossing.h"
#include "record/replaying/Story.h"
#include "record/stream/CallText.h"
#include "record/stream/Comparison.h"
#include "record/stream/Thrown.h"

namespace record {

using Lock = platform::Mutex::Lock;

namespace {

/// How often it is looked whether the plug-in works or waits.
constexpr auto lookInterval = std::chrono::milliseconds(50);
/// So many looks at a thread that sleeps without having done anything in between.
constexpr int looksUntilStuck = 20;

bool isSleeping(long thread) {
  const std::string name = "/proc/self/task/" + std::to_string(thread) + "/stat";
  const int file = ::open(name.c_str(), O_RDONLY | O_CLOEXEC);
  if (file < 0) return false;
  char text[256];
  const ssize_t size = ::read(file, text, sizeof text);
  ::close(file);
  const std::string_view facts(text, size > 0 ? static_cast<std::size_t>(size) : 0);
  const auto behindName = facts.rfind(") ");
  return behindName != std::string_view::npos && facts.substr(behindName + 2, 1) == "S";
}

}  // namespace

namespace {
thread_local void* currentPlayer = nullptr;
}

struct Replayer::Services {
  explicit Services(Replayer& replayer)
      : all([&]<class T>() { return ReplayCrossing<T>(replayer); }),
        spareLog(ObjectKind::log, 0, false, ReplayCrossing<platform::LogHandle>(replayer)) {}
  ServicesOf<ReplayCrossing> all;
  ReplayedObject<platform::LogHandle> spareLog;
};

Replayer::Replayer(std::string_view recording, MakeClient makeClient, ReplayOptions options)
    : _makeClient(std::move(makeClient)),
      _options(std::move(options)),
      _reader(recording, EventReader::Large::apart),
      _services(std::make_unique<Services>(*this)) {}

Replayer::~Replayer() = default;

std::shared_ptr<platform::TSClient> Replayer::makeClient() { return _makeClient(platform()); }
const platform::Platform& Replayer::platform() const { return _services->all.platform; }
platform::LogHandle& Replayer::spareLog() { return _services->spareLog; }

bool Replayer::isOf(const Event& event, const Operation& operation) const {
  const auto& name = _reader.operations()[event.operation];
  return name.name == operation.name && name.service == operation.service;
}

bool Replayer::isIgnored(const Event& event) const {
  if (_options.ignored.empty() || event.kind == EventKind::enter || event.kind == EventKind::leave) return false;
  return _options.ignored.contains(classOf(_reader.operations()[event.operation]));
}

const Event* Replayer::ahead(std::size_t place) {
  while (_ahead.size() <= place) {
    Event event;
    if (!_reader.next(event)) return nullptr;
    _ahead.push_back(std::move(event));
  }
  return &_ahead[place];
}

Event Replayer::pop() {
  Event event = std::move(_ahead.front());
  _ahead.pop_front();
  ++_result.events;
  return event;
}

const OperationName& Replayer::nameOfEvent(const Event& event) const { return _reader.operations()[event.operation]; }

/// The plug-in's new objects get the numbers that they had, which the next event tells.
std::uint64_t Replayer::newNumber(ObjectKind kind) {
  const Event* next = head();
  if (next && _expectedOf != next->number) {
    _expectedOf = next->number;
    _expected = newObjectsOf(*next);
  }
  (void)kind;
  if (_expected.empty()) return ++_ownNumber;
  const std::uint64_t number = _expected.front();
  _expected.pop_front();
  if (_given.insert(number).second) return number;
  // Who had it would go in the midst of this.
  refuse("event " + std::to_string(next->number) + ": an object gets the number of another one");
  return ++_ownNumber;
}

void Replayer::named(std::uint64_t number, const platform::TSAssetRef& asset) {
  known(number) = {typeid(platform::TSAsset), asset};
}

void Replayer::end() {
  _over = true;
  for (auto& player : _players) player->turn.notifyAll();
  _changed.notifyAll();
}

void Replayer::refuse(const std::string& problem) {
  if (_result.problem.empty()) _result.problem = problem;
  end();
}

/// Hands the turn to the thread of the next event, which begins when it is seen for the first time.
void Replayer::passTurn() {
  if (isOver()) return;
  const Event* next = head();
  if (!next) {
    _result.problem = _reader.problem();
    _result.isWhole = _reader.isWhole();
    return end();
  }
  _turn = next->thread;
  while (_players.size() <= next->thread) {
    auto player = std::make_unique<Player>();
    player->number = static_cast<std::uint32_t>(_players.size());
    _players.push_back(std::move(player));
  }
  Player& player = *_players[next->thread];
  if (!player.thread.joinable()) {
    try {
      player.thread = std::thread([self = _self.lock(), &player] { self->playAll(player); });
      ++_playing;
    } catch (const std::system_error&) {
      refuse("event " + std::to_string(next->number) + ": there is no thread left to replay it");
    }
  } else {
    player.turn.notifyOne();
  }
}

bool Replayer::awaitTurn(Player& player) {
  player.turn.wait(mutex, [&]() REQUIRES(mutex) { return isOver() || _turn == player.number; });
  return !isOver();
}

void Replayer::playAll(Player& player) {
  currentPlayer = &player;
  player.systemNumber = ::syscall(SYS_gettid);
  Lock lock(mutex);
  while (awaitTurn(player)) play(player, pop());
  --_playing;
  _changed.notifyAll();
}

/// One call into the plug-in, to its return.
void Replayer::play(Player& player, const Event& event) {
  const OperationName& operation = nameOfEvent(event);
  const PlayCall call = event.kind == EventKind::enter ? playerOf(operation) : nullptr;
  if (!call)
    return refuse("event " + std::to_string(event.number) + ": " + operation.service + "." + operation.name +
                  " is no call into a plug-in");
  player.inside.push_back({operation.service, operation.name});
  ItemReader arguments(event.payload, &event.large);
  ItemWriter result;
  std::string problem;
  std::exception_ptr thrown;
  mutex.unlock();
  try {
    call(*this, arguments, result);
  } catch (const RecordingError& error) {
    problem = "event " + std::to_string(event.number) + ": " + error.what();
  } catch (...) {
    thrown = std::current_exception();
    ItemWriter items;
    putThrown(items);
    items.items(result.bytes());
    result = std::move(items);
  }
  mutex.lock();
  if (!problem.empty() && !isOver()) refuse(problem);
  if (!isOver()) leave(player, event, thrown != nullptr, result);
  player.inside.pop_back();
  if (!player.inside.empty()) player.inside.back().thrown = std::move(thrown);
  passTurn();
}

void Replayer::leave(Player& player, const Event& entered, bool threw, const ItemWriter& result) {
  const Event* next = head();
  if (threw && next && (next->kind != EventKind::thrown || !isSame(*next, result))) {
    // Whatever the caller made of it is not known.
    differ(Difference::Kind::otherResult, player, next, throwLine(nameOfEvent(entered), result.whole()));
    if (!isOver()) end();
    return;
  }
  if (next && !leaves(next->kind)) {
    auto place = findAhead(player, nullptr, result);
    if (!place && !_options.goOn) return void(differ(Difference::Kind::missing, player, next, {}));
    if (!place) return end();
    skipTo(player, *place, {});
    if (isOver()) return;
    // What was skipped is not before it any more.
    place = findAhead(player, nullptr, result);
    if (!place) return end();
    next = &_ahead[*place];
  }
  if (!next) return;
  if ((next->kind == EventKind::thrown) != threw || !isSame(*next, result))
    differ(Difference::Kind::otherResult, player, next, resultLine(nameOfEvent(entered), result.whole()));
  if (isOver()) return;
  auto at = std::find_if(_ahead.begin(), _ahead.end(), [&](const Event& event) { return &event == next; });
  _ahead.erase(at);
  ++_result.events;
}

std::optional<Replayer::Answer> Replayer::exchange(const Operation& operation, const ItemWriter& arguments) {
  auto* player = static_cast<Player*>(currentPlayer);
  if (isOver() && player && player == _messenger) return afterEnd(operation, arguments);
  if (isOver() || !player) return std::nullopt;
  const bool isRecorded = ignores(operation) ? matchIgnored(*player, operation) : match(*player, operation, arguments);
  if (!isRecorded) return std::nullopt;
  player->inside.push_back({operation.service, operation.name});
  passTurn();
  auto event = awaitAnswer(*player);
  const Open ended = std::move(player->inside.back());
  player->inside.pop_back();
  return event ? std::optional(Answer{std::move(*event), ended.thrown}) : std::nullopt;
}

void Replayer::tell(const Operation& operation, const ItemWriter& arguments) {
  const auto answer = exchange(operation, arguments);
  if (!answer) return;
  std::exception_ptr thrown;
  try {
    ItemReader items(answer->event.payload, &answer->event.large);
    thrown = answer->thrown(items);
  } catch (const RecordingError& error) {
    refuse(error.what());
  }
  if (thrown) std::rethrow_exception(thrown);
}

std::optional<Event> Replayer::awaitAnswer(Player& player) {
  while (awaitTurn(player)) {
    Event event = pop();
    if (event.kind == EventKind::enter) {
      play(player, event);
      continue;
    }
    if (event.kind != EventKind::answer && event.kind != EventKind::threw) break;
    return event;
  }
  return std::nullopt;
}

std::exception_ptr Replayer::Answer::thrown(ItemReader& items) const {
  return event.kind == EventKind::threw ? takeThrown(items, ofPlugin) : nullptr;
}

void Replayer::stands(const Operation& operation) {
  auto* player = static_cast<Player*>(currentPlayer);
  if (isOver() || !player) return;
  differ(Difference::Kind::standing, *player, head(),
         std::string(operation.service) + "." + operation.name + ", which went on, and would go on waiting");
  end();
}

bool Replayer::looksStuck() {
  if (!_turn || *_turn >= _players.size()) return false;
  const long thread = _players[*_turn]->systemNumber;
  return thread != 0 && isSleeping(thread);
}

/// True when every thread has come to its end; false when some wait for what never comes.
bool Replayer::awaitEnd() {
  Lock lock(mutex);
  std::uint64_t seen = 0;
  int looks = 0;
  while (_playing > 0 || !isOver()) {
    _changed.waitFor(mutex, lookInterval);
    if (seen != _result.events || !looksStuck()) {
      seen = _result.events;
      looks = 0;
      continue;
    }
    if (++looks < looksUntilStuck) continue;
    if (isOver()) return false;
    // Others are let go: what it waits for may be theirs.
    looks = 0;
    differ(Difference::Kind::standing, *_players[*_turn], head(), "nothing: it waits inside the plug-in");
    end();
  }
  return true;
}

ReplayResult Replayer::run(const std::shared_ptr<Replayer>& self) {
  _self = self;
  {
    Lock lock(mutex);
    passTurn();
  }
  const bool allEnded = awaitEnd();
  Lock lock(mutex);
  std::vector<std::thread> threads;
  for (auto& player : _players) {
    if (player->thread.joinable()) threads.push_back(std::move(player->thread));
  }
  ReplayResult result = _result;
  result.isStuck = !allEnded;
  // The plug-in's objects go when nobody is compared any more.
  auto clients = std::exchange(_clients, {});
  auto completions = std::exchange(_completions, {});
  lock.unlock();
  for (auto& thread : threads) {
    if (allEnded)
      thread.join();
    else
      thread.detach();
  }
  clients.clear();
  completions.clear();
  lock.lock();
  return result;
}

ReplayResult replay(std::string_view recording, const MakeClient& makeClient, const ReplayOptions& options) {
  auto replayer = std::make_shared<Replayer>(recording, makeClient, options);
  ReplayResult result = replayer->run(replayer);
  explain(recording, result.differences);
  return result;
}

}  // namespace record
