#include "tsd/QuietWatch.h"

namespace tsd {

QuietWatch::QuietWatch(device::EventQueue& events, StopSignal& stop)
    : _events(events),
      _stop(stop),
      _drain([this] {
        _events.drain();
        std::lock_guard lock(_mutex);
        _quiet = true;
        _changed.notify_all();
      }),
      _stopped(stop, [this] {
        std::lock_guard lock(_mutex);
        _changed.notify_all();
      }) {
  // What this thread holds back would never run while it waits here.
  device::EventQueue::release();
}

QuietWatch::~QuietWatch() { _drain.join(); }

bool QuietWatch::waitUntil(platform::Clock::Instant deadline) {
  std::unique_lock lock(_mutex);
  _events.clock().waitUntil(lock, _changed, deadline, [this] { return _quiet || _stop.requested(); });
  return _quiet;
}

}  // namespace tsd
