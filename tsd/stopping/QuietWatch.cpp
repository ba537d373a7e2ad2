#include "tsd/stopping/QuietWatch.h"

#include "tsd/StartThread.h"

namespace tsd {

using Lock = platform::Mutex::Lock;

QuietWatch::QuietWatch(device::EventQueue& events, StopSignal& stop)
    : _events(events),
      _stop(stop),
      _stopped(stop,
               [this] {
                 Lock lock(_mutex);
                 _changed.notifyAll();
               }),
      _drain(startThread([this] {
        _events.drain();
        Lock lock(_mutex);
        _quiet = true;
        _changed.notifyAll();
      })) {
  // Events that this thread holds back would never run while it waits here.
  device::EventQueue::release();
}

QuietWatch::~QuietWatch() { _drain.join(); }

bool QuietWatch::waitUntil(platform::Clock::Instant deadline) {
  Lock lock(_mutex);
  _events.clock().waitUntil(_mutex, _changed, deadline,
                            [this]() REQUIRES(_mutex) { return _quiet || _stop.requested(); });
  return _quiet;
}

}  // namespace tsd
