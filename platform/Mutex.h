#pragma once

#include <mutex>

#include "platform/ThreadAttributes.h"

namespace platform {

class Condition;

/// A mutex that clang's analysis knows. For short blocks; never held while another component is called back.
class APPSYNC_CAPABILITY("mutex") Mutex {
 public:
  void lock() APPSYNC_ACQUIRE() { _mutex.lock(); }
  void unlock() APPSYNC_RELEASE() { _mutex.unlock(); }

  /// Holds the mutex for a scope, which may let it go for a while.
  class APPSYNC_SCOPED_CAPABILITY Lock {
   public:
    explicit Lock(Mutex& mutex) APPSYNC_ACQUIRE(mutex) : _mutex(mutex) { _mutex.lock(); }
    ~Lock() APPSYNC_RELEASE() {
      if (_held) _mutex.unlock();
    }
    Lock(const Lock&) = delete;
    Lock& operator=(const Lock&) = delete;

    void unlock() APPSYNC_RELEASE() {
      _held = false;
      _mutex.unlock();
    }
    void lock() APPSYNC_ACQUIRE() {
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
