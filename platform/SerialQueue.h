#pragma once

#include <atomic>
#include <string>
#include <thread>

#include "platform/Clock.h"
#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace platform {

/// A serial queue that is only ever used synchronously: one block at a time runs on it, on the caller's own
/// thread, and the caller waits for its turn on the device's clock, as for everything else. Turns come in the order in
/// which callers came; what a clock delivers on a thread that waits here goes before that thread's own turn. A block
/// is a scope:
///
///     SerialQueue::Block block(_accessQueue, _platform.clock);
///
/// Entering a queue from a block that already runs on it would wait for itself for ever; it ends the process
/// with a message that names the queue instead.
class CAPABILITY("queue") SerialQueue {
 public:
  explicit SerialQueue(std::string label) : _label(std::move(label)) {}
  SerialQueue(const SerialQueue&) = delete;
  SerialQueue& operator=(const SerialQueue&) = delete;

  const std::string& label() const { return _label; }

  /// The scope that runs on the queue. Keep it short: nothing in it may wait for another block of this queue.
  class SCOPED_CAPABILITY Block {
   public:
    Block(SerialQueue& queue, Clock& clock) ACQUIRE(queue) : _queue(queue) { _queue.enter(clock); }
    ~Block() RELEASE() { _queue.leave(); }
    Block(const Block&) = delete;
    Block& operator=(const Block&) = delete;

   private:
    SerialQueue& _queue;
  };

 private:
  /// One caller in the line.
  struct Place {
    std::thread::id thread;
    Condition turn;
    Place* next = nullptr;
  };
  class Waiting;

  void enter(Clock& clock) ACQUIRE();
  void leave() RELEASE();
  void callNext() REQUIRES(_mutex);

  const std::string _label;
  Mutex _mutex;
  bool _busy GUARDED_BY(_mutex) = false;
  Place* _first GUARDED_BY(_mutex) = nullptr;  // of the line; each place lives on its caller's stack
  std::atomic<std::thread::id> _running;
};

}  // namespace platform
