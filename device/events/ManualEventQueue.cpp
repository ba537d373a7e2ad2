#include <algorithm>
#include <array>
#include <deque>
#include <optional>
#include <utility>

#include "device/events/EventQueue.h"
#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

namespace {

using Lock = platform::Mutex::Lock;

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
    Lock lock(_mutex);
    _chooser = std::move(chooser);
  }

  std::size_t pending() const override {
    Lock lock(_mutex);
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
      Lock lock(_mutex);
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
      Lock lock(_mutex);
      _changed.wait(_mutex, [this]() REQUIRES(_mutex) { return isAnyReady() || !isAnyBusy(); });
      if (!isAnyReady()) return;
    }
  }

  void stop() override {
    std::array<std::deque<Posted>, laneCount>
        dropped;  // destroyed when no lock is held: events own what they will call
    Lock lock(_mutex);
    _stopped = true;
    for (std::size_t i = 0; i < laneCount; ++i) dropped[i].swap(_lanes[i].pending);
    _changed.notifyAll();
    if (eventDepth == 0) _changed.wait(_mutex, [this]() REQUIRES(_mutex) { return !isAnyBusy(); });
  }

  platform::Clock& clock() override { return _clock; }

 protected:
  bool enqueue(Lane lane, Event& event) override {
    Lock lock(_mutex);
    if (_stopped) return false;
    _lanes[static_cast<std::size_t>(lane)].pending.push_back({++_lastPosted, std::move(event)});
    _changed.notifyAll();
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
      Lock lock(_queue._mutex);
      return _queue._now;
    }

    bool waitUntil(platform::Mutex& mutex, platform::Condition& changed, Instant deadline,
                   const std::function<bool()>& satisfied) override REQUIRES(mutex) {
      release();
      if (deadline == noDeadline) {
        changed.wait(mutex, satisfied);
        return true;
      }
      Waiting waiting(_queue);
      while (!satisfied()) {
        if (now() >= deadline) return false;
        mutex.unlock();
        _queue.proceed(deadline);
        mutex.lock();
      }
      return true;
    }

   private:
    HandDrivenQueue& _queue;
  };

  /// A thread that waits inside an event cannot be counted on to make anything happen.
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

  bool isAnyReady() const REQUIRES(_mutex) {
    return std::any_of(_lanes.begin(), _lanes.end(), [](const LaneState& lane) { return lane.isReady(); });
  }
  bool isAnyBusy() const REQUIRES(_mutex) {
    return std::any_of(_lanes.begin(), _lanes.end(), [](const LaneState& lane) { return lane.busy; });
  }
  Taken take(std::size_t lane) REQUIRES(_mutex) {
    LaneState& state = _lanes[lane];
    Taken taken{lane, std::move(state.pending.front().event)};
    state.pending.pop_front();
    state.busy = true;
    ++_running;
    return taken;
  }

  std::optional<Taken> takeNext() {
    Lock lock(_mutex);
    std::array<std::size_t, laneCount> ready;
    std::size_t count = 0;
    for (std::size_t i = 0; i < laneCount; ++i) {
      if (_lanes[i].isReady()) ready[count++] = i;
    }
    if (count == 0) return std::nullopt;
    if (_chooser) return take(ready[std::min(_chooser(count), count - 1)]);
    return take(*std::min_element(ready.begin(), ready.begin() + count,
                                  [this](std::size_t one, std::size_t other) REQUIRES(_mutex) {
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
    Lock lock(_mutex);
    _lanes[taken.lane].busy = false;
    --_running;
    _changed.notifyAll();
  }

  /// One step of a wait: runs an event; or waits for one that another thread runs; or lets the time pass.
  void proceed(platform::Clock::Instant deadline) {
    if (auto taken = takeNext()) return run(*taken);
    Lock lock(_mutex);
    if (_running == 0 && !isAnyReady()) {
      _now = std::max(_now, deadline);
      return;
    }
    _changed.wait(_mutex, [this]() REQUIRES(_mutex) { return _running == 0 || isAnyReady(); });
  }

  void countRunning(int difference) {
    Lock lock(_mutex);
    _running += difference;
    _changed.notifyAll();
  }

  static inline constinit thread_local const HandDrivenQueue* countedOn =
      nullptr;                                              // this thread counts in its _running
  static inline constinit thread_local int eventDepth = 0;  // of this thread, over all queues

  VirtualClock _clock;
  mutable platform::Mutex _mutex;
  platform::Condition _changed;
  std::array<LaneState, laneCount> _lanes GUARDED_BY(_mutex);
  std::uint64_t _lastPosted GUARDED_BY(_mutex) = 0;
  int _running GUARDED_BY(_mutex) = 0;  // events that run and do not wait
  platform::Clock::Instant _now GUARDED_BY(_mutex){};
  Chooser _chooser GUARDED_BY(_mutex);
  bool _stopped GUARDED_BY(_mutex) = false;
};

}  // namespace

std::unique_ptr<ManualEventQueue> makeManualEventQueue() { return std::make_unique<HandDrivenQueue>(); }

}  // namespace device
