#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "platform/Clock.h"

namespace device {

/// The threads on which the device's services call back. The journal names them "coordination", "registry",
/// "notification".
enum class Lane : std::uint8_t { coordination, registry, notification };
constexpr std::size_t laneCount = 3;
const char* nameOfLane(Lane lane);

/// Everything that happens later on the device: callbacks, completions, installs. Events of one lane run one
/// at a time in the order in which they were posted.
///
/// An event that a call across the boundary caused is held back until the thread that caused it makes its
/// next call across the boundary, waits, or returns from the plug-in, so that a caller has time to register for what
/// it started. `Boundary` tells when that is.
class EventQueue {
 public:
  using Event = std::function<void()>;

  virtual ~EventQueue() = default;

  /// From any thread; never runs the event inside.
  void post(Lane lane, Event event);

  /// The thread is inside a call to a service: what it posts is held back until released.
  static void holdBack();
  /// Lets go what this thread held back.
  void release();

  /// Returns when every event posted so far, and whatever they posted, has run (and nothing is held back by this
  /// thread). Never called from an event.
  virtual void drain() = 0;
  /// No event runs afterwards; what is pending is dropped. Idempotent.
  virtual void stop() = 0;

  virtual platform::Clock& clock() = 0;

 protected:
  virtual void enqueue(Lane lane, Event event) = 0;
};

/// One thread per lane and the real clock.
std::unique_ptr<EventQueue> makeThreadedEventQueue();

/// Driven by hand, with a virtual clock: nothing runs until it is told to, or until somebody waits on the clock.
/// A wait delivers pending events until its condition holds; with none left the clock jumps to the deadline.
/// `deliver…` runs the event on the calling thread, which is the lane's thread meanwhile.
class ManualEventQueue : public EventQueue {
 public:
  /// Chooses which of `count` lanes that have something pending goes next; answers an index below `count`.
  using Chooser = std::function<std::size_t(std::size_t count)>;

  /// The default order is first come first served over all lanes.
  virtual void setChooser(Chooser chooser) = 0;
  virtual std::size_t pending() const = 0;
  /// False when nothing is pending.
  virtual bool deliverNext() = 0;
  /// False when the lane has nothing pending.
  virtual bool deliverNext(Lane lane) = 0;
  /// Also what the events post; the count of events run.
  virtual std::size_t deliverAll() = 0;
};
std::unique_ptr<ManualEventQueue> makeManualEventQueue();

/// The journal's name of the calling thread: "daemon" unless it is a lane's or was named.
const char* currentThreadName();
/// Names the calling thread for the journal for the life of the object ("transfer-1").
class ThreadName {
 public:
  explicit ThreadName(const std::string& name);
  ~ThreadName();
  ThreadName(const ThreadName&) = delete;
  ThreadName& operator=(const ThreadName&) = delete;

 private:
  std::string _name;
  const char* _previous;
};

}  // namespace device
