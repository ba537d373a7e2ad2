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

  /// While it lives the calling thread is inside a call to a service: what it posts is held back until released. Nests.
  class InsideCall {
   public:
    InsideCall() noexcept { ++_thread.callDepth; }
    ~InsideCall() { --_thread.callDepth; }
    InsideCall(const InsideCall&) = delete;
    InsideCall& operator=(const InsideCall&) = delete;
  };
  /// While it lives the calling thread acts for somebody else, whatever call it is inside: it posts directly.
  class OutsideCall {
   public:
    OutsideCall() noexcept : _depth(_thread.callDepth) { _thread.callDepth = 0; }
    ~OutsideCall() { _thread.callDepth = _depth; }
    OutsideCall(const OutsideCall&) = delete;
    OutsideCall& operator=(const OutsideCall&) = delete;

   private:
    std::uint32_t _depth;
  };

  EventQueue();
  virtual ~EventQueue();
  EventQueue(const EventQueue&) = delete;
  EventQueue& operator=(const EventQueue&) = delete;

  /// From any thread; never runs the event itself.
  void post(Lane lane, Event event);

  /// Releases what the calling thread held back.
  static void release() {
    if (_thread.holds) releaseHeld();
  }
  /// The same, unless the thread is still inside the call that caused it.
  static void releaseOutsideCall() {
    if (_thread.holds && _thread.callDepth == 0) releaseHeld();
  }

  /// Does work that nobody is told of on a thread beside the lanes', as soon as one is free. False, with the work
  /// untouched, when there is none: whoever needs it does it then. What has not begun when the queue stops never runs,
  /// and `drain` does not wait for it.
  virtual bool workAside(Event& /*work*/) { return false; }

  /// Returns when every event posted so far, and whatever they posted, has run (and nothing is held back by this
  /// thread). Never called from an event.
  virtual void drain() = 0;
  /// No event runs afterwards; what is pending is dropped. Idempotent. Waits for running events, unless it is called
  /// from one.
  virtual void stop() = 0;

  virtual platform::Clock& clock() = 0;

 protected:
  /// False, with the event untouched, once the queue has stopped.
  virtual bool enqueue(Lane lane, Event& event) = 0;
  /// The last thing a queue does before its parts are destroyed: threads that still hold events drop them from here on.
  void close();

 private:
  struct ThreadState {
    std::uint32_t callDepth;
    bool holds;
  };
  struct Door;
  struct HeldEvents;

  static void releaseHeld();
  static HeldEvents& heldEvents();

  static inline constinit thread_local ThreadState _thread{};
  std::shared_ptr<Door> _door;  // what held events reach this queue through, as they may outlive it
};

/// One thread per lane, two beside them once there is work for them, and the real clock. Throws `std::system_error`
/// when the system has no thread left.
std::unique_ptr<EventQueue> makeThreadedEventQueue();

/// Driven by hand, with a virtual clock: nothing runs until it is told to or somebody waits on the clock.
/// A wait delivers pending events until its condition holds; with none left the clock jumps to the deadline.
/// `deliver…` runs the event on the calling thread, which is the lane's thread meanwhile.
class ManualEventQueue : public EventQueue {
 public:
  /// Chooses which of `count` lanes that have something pending goes next; answers an index below `count`.
  using Chooser = std::function<std::size_t(std::size_t count)>;

  /// By default the event posted first is delivered first, over all lanes.
  virtual void setChooser(Chooser chooser) = 0;
  virtual std::size_t pending() const = 0;
  /// False when nothing is pending.
  virtual bool deliverNext() = 0;
  /// False when the lane has nothing pending.
  virtual bool deliverNext(Lane lane) = 0;
  /// With everything that the events post; answers how many events ran.
  virtual std::size_t deliverAll() = 0;
};
std::unique_ptr<ManualEventQueue> makeManualEventQueue();

/// The calling thread's name in the journal: "daemon" unless it is a lane's or was named.
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
