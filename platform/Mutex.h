#pragma once

#include <mutex>

#include "platform/ThreadSafety.h"

namespace platform {

/// A mutex that clang's analysis knows. For short blocks; never held while another component is called back.
class CAPABILITY("mutex") Mutex {
 public:
  void lock() ACQUIRE() { _mutex.lock(); }
  void unlock() RELEASE() { _mutex.unlock(); }

  /// Holds the mutex for a scope.
  class SCOPED_CAPABILITY Lock {
   public:
    explicit Lock(Mutex& mutex) ACQUIRE(mutex) : _mutex(mutex) { _mutex.lock(); }
    ~Lock() RELEASE() { _mutex.unlock(); }
    Lock(const Lock&) = delete;
    Lock& operator=(const Lock&) = delete;

   private:
    Mutex& _mutex;
  };

 private:
  std::mutex _mutex;
};

}  // namespace platform
