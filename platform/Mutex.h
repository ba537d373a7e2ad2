#pragma once

#include <mutex>

#include "platform/ThreadSafety.h"

namespace platform {

class Condition;

/// A mutex that clang's analysis knows. For short blocks; never held while another component is called back.
class CAPABILITY("mutex") Mutex {
 public:
  void lock() ACQUIRE() { _mutex.lock(); }
  void unlock() RELEASE() { _mutex.unlock(); }

  /// Holds the mutex for a scope, which may let it go for a while.
  class SCOPED_CAPABILITY Lock {
   public:
    explicit Lock(Mutex& mutex) ACQUIRE(mutex) : _mutex(mutex) { _mutex.lock(); }
    ~Lock() RELEASE() {
      if (_held) _mutex.unlock();
    }
    Lock(const Lock&) = delete;
    Lock& operator=(const Lock&) = delete;

    void unlock() RELEASE() {
      _held = false;
      _mutex.unlock();
    }
    void lock() ACQUIRE() {
      _mutex.lock();
      _held = true;
    }

   private:
    Mutex& _mutex;
    bool _held = true;
  };

 private:
  friend Condition;

  std::mutex _mutex;
};

}  // namespace platform
