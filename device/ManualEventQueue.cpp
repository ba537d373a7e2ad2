#include <algorithm>
#include <array>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <optional>
#include <utility>

#include "device/EventQueue.h"

namespace device {

namespace {

/// Several threads may deliver and wait at once. A lane that one of them runs is busy for the others, and for itself
/// when its event waits: as with real threads, nothing overtakes an event on its own lane.
class HandDrivenQueue final : public ManualEventQueue {
 public:
  HandDrivenQueue() : _clock(*this) {}
  ~HandDrivenQueue() override {
    stop();
    close();
  }

  void setChooser(Chooser chooser) override {
    std::lock_guard lock(_mutex);
    _chooser = std::move(chooser);
  }

  std::size_t pending() const override {
    std::lock_guard lock(_mutex);
    std::size_t count = 0;
    for (const auto& lane : _lanes) count += lane.pending.size();
    return count;
  }

  bool deliverNext() override {
    release();
    auto taken = takeNext();
    if (taken) run(*taken);
    return taken.has_value();
  }

  bool deliverNext(Lane lane) override {
    release();
    std::optional<Taken> taken;
    {
      std::lock_guard lock(_mutex);
      if (_lanes[static_cast<std::size_t>(lane)].isReady()) taken = take(static_cast<std::size_t>(lane));
    }
    if (taken) run(*taken);
    return taken.has_value();
  }

  std::size_t deliverAll() override {
    std::size_t count = 0;
    while (deliverNext()) ++count;
    return count;
  }

  void drain() override {
    while (true) {
      deliverAll();
      std::unique_lock lock(_mutex);
      _changed.wait(lock, [this] { return isAnyReady() || !isAnyBusy(); });
      if (!isAnyReady()) return;
    }
  }

  void stop() override {
    std::array<std::deque<Posted>, laneCount> dropped;  // goes when no lock is held: events own what they will call
    std::unique_lock lock(_mutex);
    _stopped = true;
    for (std::size_t i = 0; i < laneCount; ++i) dropped[i].swap(_lanes[i].pending);
    _changed.notify_all();
    if (eventDepth == 0) _changed.wait(lock, [this] { return !isAnyBusy(); });
    lock.unlock();
  }

  platform::Clock& clock() override { return _clock; }

 protected:
  bool enqueue(Lane lane, Event& event) override {
    std::lock_guard lock(_mutex);
    if (_stopped) return false;
    _lanes[static_cast<std::size_t>(lane)].pending.push_back({++_lastPosted, std::move(event)});
    _changed.notify_all();
    return true;
  }

 private:
  struct Posted {
    std::uint64_t number;
    Event event;
  };
  struct LaneState {
    std::deque<Posted> pending;
    bool busy = false;

    bool isReady() const { return !busy && !pending.empty(); }
  };
  struct Taken {
    std::size_t lane;
    Event event;
  };

  class VirtualClock final : public platform::Clock {
   public:
    explicit VirtualClock(HandDrivenQueue& queue) : _queue(queue) {}

    Instant now() override {
      std::lock_guard lock(_queue._mutex);
      return _queue._now;
    }

    bool waitUntil(std::unique_lock<std::mutex>& lock, std::condition_variable&, Instant deadline,
                   const std::function<bool()>& satisfied) override {
      release();
      Waiting waiting(_queue);
      while (!satisfied()) {
        if (now() >= deadline) return false;
        lock.unlock();
        _queue.proceed(deadline);
        lock.lock();
      }
      return true;
    }

   private:
    HandDrivenQueue& _queue;
  };

  /// A thread that waits inside an event is none that will make anything happen by itself.
  class Waiting {
   public:
    explicit Waiting(HandDrivenQueue& queue) : _queue(queue), _counted(countedOn == &queue) {
      if (_counted) _queue.countRunning(-1);
      countedOn = nullptr;
    }
    ~Waiting() {
      if (!_counted) return;
      _queue.countRunning(1);
      countedOn = &_queue;
    }
    Waiting(const Waiting&) = delete;
    Waiting& operator=(const Waiting&) = delete;

   private:
    HandDrivenQueue& _queue;
    bool _counted;
  };

  // The next three are called with _mutex held.
  bool isAnyReady() const {
    return std::any_of(_lanes.begin(), _lanes.end(), [](const LaneState& lane) { return lane.isReady(); });
  }
  bool isAnyBusy() const {
    return std::any_of(_lanes.begin(), _lanes.end(), [](const LaneState& lane) { return lane.busy; });
  }
  Taken take(std::size_t lane) {
    LaneState& state = _lanes[lane];
    Taken taken{lane, std::move(state.pending.front().event)};
    state.pending.pop_front();
    state.busy = true;
    ++_running;
    return taken;
  }

  std::optional<Taken> takeNext() {
    std::lock_guard lock(_mutex);
    std::array<std::size_t, laneCount> ready;
    std::size_t count = 0;
    for (std::size_t i = 0; i < laneCount; ++i) {
      if (_lanes[i].isReady()) ready[count++] = i;
    }
    if (count == 0) return std::nullopt;
    if (_chooser) return take(ready[std::min(_chooser(count), count - 1)]);
    return take(*std::min_element(ready.begin(), ready.begin() + count, [this](std::size_t one, std::size_t other) {
      return _lanes[one].pending.front().number < _lanes[other].pending.front().number;
    }));
  }

  void run(Taken& taken) {
    {
      OutsideCall outside;
      ThreadName name(nameOfLane(static_cast<Lane>(taken.lane)));
      auto* outer = std::exchange(countedOn, this);
      ++eventDepth;
      taken.event();
      taken.event = nullptr;
      release();
      --eventDepth;
      countedOn = outer;
    }
    std::lock_guard lock(_mutex);
    _lanes[taken.lane].busy = false;
    --_running;
    _changed.notify_all();
  }

  /// One step of a wait: runs an event; or waits for one that another thread runs; or lets the time pass.
  void proceed(platform::Clock::Instant deadline) {
    if (auto taken = takeNext()) return run(*taken);
    std::unique_lock lock(_mutex);
    if (_running == 0 && !isAnyReady()) {
      _now = std::max(_now, deadline);
      return;
    }
    _changed.wait(lock, [this] { return _running == 0 || isAnyReady(); });
  }

  void countRunning(int difference) {
    std::lock_guard lock(_mutex);
    _running += difference;
    _changed.notify_all();
  }

  static inline constinit thread_local const HandDrivenQueue* countedOn =
      nullptr;                                              // this thread counts in its _running
  static inline constinit thread_local int eventDepth = 0;  // of this thread, over all queues

  VirtualClock _clock;
  mutable std::mutex _mutex;
  // All guarded by _mutex.
  std::condition_variable _changed;
  std::array<LaneState, laneCount> _lanes;
  std::uint64_t _lastPosted = 0;
  int _running = 0;  // events that run and do not wait
  platform::Clock::Instant _now{};
  Chooser _chooser;
  bool _stopped = false;
};

}  // namespace

std::unique_ptr<ManualEventQueue> makeManualEventQueue() { return std::make_unique<HandDrivenQueue>(); }

}  // namespace device
