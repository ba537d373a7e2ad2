#pragma once

#include <atomic>
#include <cstdint>
#include <deque>
#include <exception>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <thread>
#include <typeindex>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "platform/Condition.h"
#include "platform/InstallCoordination.h"
#include "platform/Mutex.h"
#include "platform/NotificationCenter.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/SystemLog.h"
#include "platform/ThreadSafety.h"
#include "record/Replay.h"
#include "record/stream/EventReader.h"
#include "record/stream/Item.h"
#include "record/stream/Names.h"

namespace record {

/// One replay. The plug-in's threads come here with every call that they make: it is compared with the recording, and
/// answered from it when its turn has come.
///
/// A thread has its turn from an event that lets it into the plug-in until it leaves it again; then the thread of the
/// next event has it. When the recording is at its end, or something differed, all are let go: every call fails at
/// once, and the plug-in comes to an end by itself.
class Replayer : public Names {
 public:
  /// Held by whoever looks at anything here; never while the plug-in runs.
  platform::Mutex mutex;

  Replayer(std::string_view recording, MakeClient makeClient, ReplayOptions options);
  ~Replayer() override;

  /// Runs until everything is over. `self` is this; a thread that waits for ever keeps it.
  ReplayResult run(const std::shared_ptr<Replayer>& self);

  std::uint64_t newNumber(ObjectKind kind) override NO_THREAD_SAFETY_ANALYSIS;
  void named(std::uint64_t number, const platform::TSAssetRef& asset) override NO_THREAD_SAFETY_ANALYSIS;

  bool isOver() const { return _over.load(std::memory_order_relaxed); }
  bool ignores(const Operation& operation) const { return _options.ignored.contains(operation.of); }

  /// What a service answers, or throws.
  struct Answer {
    Event event{};
    std::exception_ptr ofPlugin{};  // what the plug-in has thrown inside of the call

    /// What the service threw, read from the answer's items; null when it did not.
    std::exception_ptr thrown(ItemReader& items) const;
  };
  /// A call of the plug-in with these arguments: the recorded answer; nothing when there is none.
  std::optional<Answer> exchange(const Operation& operation, const ItemWriter& arguments) REQUIRES(mutex);
  /// The same for a call that answers nothing.
  void tell(const Operation& operation, const ItemWriter& arguments) REQUIRES(mutex);
  /// The plug-in goes on waiting where it had not to.
  void stands(const Operation& operation) REQUIRES(mutex);
  /// The recording holds what no recording holds.
  void refuse(const std::string& problem) REQUIRES(mutex);

  // What there is of objects, by their numbers. With the mutex in hand, which their callers get by another name.
  struct Known {
    std::type_index type = typeid(void);
    std::shared_ptr<void> object{};
  };
  Known& known(std::uint64_t number) NO_THREAD_SAFETY_ANALYSIS {
    if (number >= mostBeside) return _knownFar[number];
    // Lists name thousands of them again and again.
    if (number >= _known.size()) _known.resize(number + 1);
    return _known[number];
  }
  /// What the plug-in lets services hold. Of an observer its address is where the protocol's part begins.
  struct Observed {
    std::weak_ptr<platform::RVAppInstallObserverDelegate> delegate{};
    std::weak_ptr<platform::OBApplicationWorkspaceObserverProtocol> workspace{};
    std::weak_ptr<void> notified{};
    platform::KBNotificationCallback callback = nullptr;
  };
  Observed& observed(std::uint64_t number) NO_THREAD_SAFETY_ANALYSIS { return _observed[number]; }
  using Completion = std::function<void(platform::ErrorRef)>;
  using Block = std::function<void(const platform::OBBundleProxyRef&, bool&)>;
  std::unordered_map<std::uint64_t, Completion>& completions() NO_THREAD_SAFETY_ANALYSIS { return _completions; }
  std::unordered_map<std::uint64_t, const Block*>& blocks() NO_THREAD_SAFETY_ANALYSIS { return _blocks; }
  std::unordered_map<std::uint64_t, std::shared_ptr<platform::TSClient>>& clients() NO_THREAD_SAFETY_ANALYSIS {
    return _clients;
  }
  std::unordered_map<std::uint64_t, std::unique_ptr<std::string>>& buffers() NO_THREAD_SAFETY_ANALYSIS {
    return _buffers;
  }

  std::shared_ptr<platform::TSClient> makeClient();
  const platform::Platform& platform() const;
  /// The handle of the log that nobody recorded.
  platform::LogHandle& spareLog();

 private:
  /// A call that has begun and not ended.
  struct Open {
    std::string_view service;
    std::string_view name;
    std::exception_ptr thrown{};  // what the plug-in threw last inside of it
  };
  /// One recorded thread.
  struct Player {
    std::uint32_t number = 0;
    std::thread thread{};
    std::atomic<long> systemNumber{0};
    platform::Condition turn{};
    std::vector<Open> inside{};  // in either direction, the innermost last
  };
  struct Services;

  /// The event so many places behind the one that is next; null behind the last.
  const Event* ahead(std::size_t place) REQUIRES(mutex);
  const Event* head() REQUIRES(mutex) { return ahead(0); }
  Event pop() REQUIRES(mutex);
  bool isIgnored(const Event& event) const REQUIRES(mutex);
  bool isOf(const Event& event, const Operation& operation) const REQUIRES(mutex);

  void playAll(Player& player);
  void play(Player& player, const Event& event) REQUIRES(mutex);
  void leave(Player& player, const Event& entered, bool threw, const ItemWriter& result) REQUIRES(mutex);
  void passTurn() REQUIRES(mutex);
  bool awaitTurn(Player& player) REQUIRES(mutex);
  std::optional<Event> awaitAnswer(Player& player) REQUIRES(mutex);
  void end() REQUIRES(mutex);

  bool match(Player& player, const Operation& operation, const ItemWriter& arguments) REQUIRES(mutex);
  bool matchIgnored(Player& player, const Operation& operation) REQUIRES(mutex);
  void dropIgnored(const Player& player) REQUIRES(mutex);
  std::optional<std::size_t> findIgnored(const Player& player, const Operation* operation) REQUIRES(mutex);
  std::optional<std::size_t> findAhead(const Player& player, const Operation* operation, const ItemWriter& arguments)
      REQUIRES(mutex);
  void skipTo(const Player& player, std::size_t place, std::string_view came) REQUIRES(mutex);
  Difference& differ(Difference::Kind kind, const Player& player, const Event* expected, std::string came)
      REQUIRES(mutex);
  std::optional<Answer> afterEnd(const Operation& operation, const ItemWriter& arguments) REQUIRES(mutex);
  std::vector<std::string> standing() const REQUIRES(mutex);
  const OperationName& nameOfEvent(const Event& event) const REQUIRES(mutex);

  bool looksStuck() REQUIRES(mutex);
  bool awaitEnd();

  const MakeClient _makeClient;
  const ReplayOptions _options;
  EventReader _reader GUARDED_BY(mutex);
  std::deque<Event> _ahead GUARDED_BY(mutex);
  std::vector<std::unique_ptr<Player>> _players GUARDED_BY(mutex);
  std::weak_ptr<Replayer> _self;
  std::optional<std::uint32_t> _turn GUARDED_BY(mutex);
  std::atomic<bool> _over{false};
  platform::Condition _changed;
  std::size_t _playing GUARDED_BY(mutex) = 0;  // threads that have not ended
  ReplayResult _result GUARDED_BY(mutex);
  const Player* _messenger GUARDED_BY(mutex) = nullptr;

  std::deque<std::uint64_t> _expected GUARDED_BY(mutex);
  std::uint64_t _expectedOf GUARDED_BY(mutex) = 0;
  std::unordered_set<std::uint64_t> _given GUARDED_BY(mutex);
  std::uint64_t _ownNumber GUARDED_BY(mutex) = std::uint64_t{1} << 40;
  static constexpr std::size_t mostBeside = std::size_t{1} << 19;
  std::deque<Known> _known GUARDED_BY(mutex);  // by number
  std::unordered_map<std::uint64_t, Known> _knownFar GUARDED_BY(mutex);
  std::unordered_map<std::uint64_t, Observed> _observed GUARDED_BY(mutex);
  std::unordered_map<std::uint64_t, Completion> _completions GUARDED_BY(mutex);
  std::unordered_map<std::uint64_t, const Block*> _blocks GUARDED_BY(mutex);
  std::unordered_map<std::uint64_t, std::shared_ptr<platform::TSClient>> _clients GUARDED_BY(mutex);
  std::unordered_map<std::uint64_t, std::unique_ptr<std::string>> _buffers GUARDED_BY(mutex);
  std::unique_ptr<Services> _services;
};

/// A call into the plug-in, as the recording has it: takes the arguments from `arguments`, calls, puts the result. When
/// the plug-in throws, that is what is put, before what was put out, and thrown on.
using PlayCall = void (*)(Replayer& replayer, ItemReader& arguments, ItemWriter& result);
/// Null when no such call is known.
PlayCall playerOf(const OperationName& operation);

}  // namespace record
