#include <array>
#include <deque>
#include <system_error>
#include <thread>
#include <utility>

#include "device/events/EventQueue.h"
#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

namespace {

using Lock = platform::Mutex::Lock;

/// The machine's own monotonic clock. A thread that waits releases what it held back: it may be waiting for just that.
class SystemClock final : public platform::Clock {
 public:
  Instant now() override { return std::chrono::steady_clock::now(); }

  bool waitUntil(platform::Mutex& mutex, platform::Condition& changed, Instant deadline,
                 const std::function<bool()>& satisfied) override REQUIRES(mutex) {
    EventQueue::release();
    return changed.waitUntil(mutex, deadline, satisfied);
  }
};

class ThreadedEventQueue final : public EventQueue {
 public:
  ThreadedEventQueue() {
    try {
      for (std::size_t i = 0; i < laneCount; ++i) {
        _threads[i] = std::thread([this, i] { run(static_cast<Lane>(i)); });
      }
    } catch (...) {
      ThreadedEventQueue::stop();
      throw;
    }
  }
  ~ThreadedEventQueue() override {
    stop();
    close();
  }

  void drain() override {
    release();
    Lock lock(_mutex);
    _idle.wait(_mutex, [this]() REQUIRES(_mutex) { return _unfinished == 0; });
  }

  void stop() override {
    std::array<std::deque<Event>, laneCount> dropped;  // destroyed when no lock is held: events own what they will call
    std::deque<Event> undone;
    {
      Lock lock(_mutex);
      _stopped = true;
      for (std::size_t i = 0; i < laneCount; ++i) {
        dropped[i].swap(_lanes[i].pending);
        _unfinished -= dropped[i].size();
        _lanes[i].wake.notifyOne();
      }
      undone.swap(_aside);
      _asideWake.notifyAll();
      if (_unfinished == 0) _idle.notifyAll();
    }
    if (runsLaneOf == this) return;
    Lock lock(_joinMutex);
    for (auto& thread : _threads) {
      if (thread.joinable()) thread.join();
    }
    for (auto& helper : _helpers) {
      if (helper.joinable()) helper.join();
    }
  }

  bool workAside(Event& work) override {
    Lock lock(_mutex);
    if (_stopped) return false;
    if (!_hasHelpers) {
      // With fewer, or none, everything is done all the same.
      _hasHelpers = true;
      Lock joinLock(_joinMutex);
      try {
        for (auto& helper : _helpers) {
          helper = std::thread([this] { helpAside(); });
          _canWorkAside = true;
        }
      } catch (const std::system_error&) {
      }
    }
    if (!_canWorkAside) return false;
    _aside.push_back(std::move(work));
    _asideWake.notifyOne();
    return true;
  }

  platform::Clock& clock() override { return _clock; }

 protected:
  bool enqueue(Lane lane, Event& event) override {
    Lock lock(_mutex);
    if (_stopped) return false;
    LaneState& state = _lanes[static_cast<std::size_t>(lane)];
    state.pending.push_back(std::move(event));
    ++_unfinished;
    // Whoever is woken finds the mutex free.
    lock.unlock();
    state.wake.notifyOne();
    return true;
  }

 private:
  struct LaneState {
    std::deque<Event> pending;
    platform::Condition wake;
  };

  void run(Lane lane) {
    runsLaneOf = this;
    ThreadName name(nameOfLane(lane));
    Lock lock(_mutex);
    LaneState& state = _lanes[static_cast<std::size_t>(lane)];
    while (true) {
      state.wake.wait(_mutex, [&]() REQUIRES(_mutex) { return _stopped || !state.pending.empty(); });
      if (_stopped) return;
      Event event = std::move(state.pending.front());
      state.pending.pop_front();
      lock.unlock();
      event();
      event = nullptr;
      release();
      lock.lock();
      if (--_unfinished == 0) _idle.notifyAll();
    }
  }

  void helpAside() {
    ThreadName name("unpacking");
    Lock lock(_mutex);
    while (true) {
      _asideWake.wait(_mutex, [this]() REQUIRES(_mutex) { return _stopped || !_aside.empty(); });
      if (_stopped) return;
      Event work = std::move(_aside.front());
      _aside.pop_front();
      lock.unlock();
      work();
      work = nullptr;
      lock.lock();
    }
  }

  static inline constinit thread_local const ThreadedEventQueue* runsLaneOf = nullptr;

  SystemClock _clock;
  platform::Mutex _joinMutex;
  platform::Mutex _mutex;
  platform::Condition _idle;
  std::array<LaneState, laneCount> _lanes GUARDED_BY(_mutex);
  std::size_t _unfinished GUARDED_BY(_mutex) = 0;  // pending or running, over all lanes
  bool _stopped GUARDED_BY(_mutex) = false;
  std::deque<Event> _aside GUARDED_BY(_mutex);
  platform::Condition _asideWake;
  bool _hasHelpers GUARDED_BY(_mutex) = false;    // or has tried to
  bool _canWorkAside GUARDED_BY(_mutex) = false;  // there is one at least
  // Made last, as they touch all of these; the constructor starts them and `stop` joins them.
  std::array<std::thread, laneCount> _threads GUARDED_BY(_joinMutex);
  std::array<std::thread, 2> _helpers GUARDED_BY(_joinMutex);
};

}  // namespace

std::unique_ptr<EventQueue> makeThreadedEventQueue() { return std::make_unique<ThreadedEventQueue>(); }

}  // namespace device
