#include <array>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <thread>
#include <utility>

#include "device/EventQueue.h"

namespace device {

namespace {

/// The machine's own monotonic clock. A thread that waits lets go what it held back: it may be waiting for just that.
class SystemClock final : public platform::Clock {
 public:
  Instant now() override { return std::chrono::steady_clock::now(); }

  bool waitUntil(std::unique_lock<std::mutex>& lock, std::condition_variable& changed, Instant deadline,
                 const std::function<bool()>& satisfied) override {
    EventQueue::release();
    return changed.wait_until(lock, deadline, satisfied);
  }
};

class ThreadedEventQueue final : public EventQueue {
 public:
  ThreadedEventQueue() {
    for (std::size_t i = 0; i < laneCount; ++i) {
      _lanes[i].thread = std::thread([this, i] { run(static_cast<Lane>(i)); });
    }
  }
  ~ThreadedEventQueue() override {
    stop();
    close();
  }

  void drain() override {
    release();
    std::unique_lock lock(_mutex);
    _idle.wait(lock, [this] { return _unfinished == 0; });
  }

  void stop() override {
    std::array<std::deque<Event>, laneCount> dropped;  // goes when no lock is held: events own what they will call
    {
      std::lock_guard lock(_mutex);
      _stopped = true;
      for (std::size_t i = 0; i < laneCount; ++i) {
        dropped[i].swap(_lanes[i].pending);
        _unfinished -= dropped[i].size();
        _lanes[i].wake.notify_one();
      }
      if (_unfinished == 0) _idle.notify_all();
    }
    for (const auto& lane : _lanes) {
      if (lane.thread.get_id() == std::this_thread::get_id()) return;
    }
    std::lock_guard lock(_joinMutex);
    for (auto& lane : _lanes) {
      if (lane.thread.joinable()) lane.thread.join();
    }
  }

  platform::Clock& clock() override { return _clock; }

 protected:
  bool enqueue(Lane lane, Event& event) override {
    std::lock_guard lock(_mutex);
    if (_stopped) return false;
    LaneState& state = _lanes[static_cast<std::size_t>(lane)];
    state.pending.push_back(std::move(event));
    ++_unfinished;
    state.wake.notify_one();
    return true;
  }

 private:
  struct LaneState {
    std::deque<Event> pending;
    std::condition_variable wake;
    std::thread thread;
  };

  void run(Lane lane) {
    ThreadName name(nameOfLane(lane));
    LaneState& state = _lanes[static_cast<std::size_t>(lane)];
    std::unique_lock lock(_mutex);
    while (true) {
      state.wake.wait(lock, [&] { return _stopped || !state.pending.empty(); });
      if (_stopped) return;
      Event event = std::move(state.pending.front());
      state.pending.pop_front();
      lock.unlock();
      event();
      event = nullptr;
      release();
      lock.lock();
      if (--_unfinished == 0) _idle.notify_all();
    }
  }

  SystemClock _clock;
  std::mutex _joinMutex;
  std::mutex _mutex;
  // Guarded by _mutex; the threads are made first and joined under _joinMutex.
  std::condition_variable _idle;
  std::array<LaneState, laneCount> _lanes;
  std::size_t _unfinished = 0;  // pending or running, over all lanes
  bool _stopped = false;
};

}  // namespace

std::unique_ptr<EventQueue> makeThreadedEventQueue() { return std::make_unique<ThreadedEventQueue>(); }

}  // namespace device
