#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <exception>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <thread>
#include <typeindex>
#include <unordered_map>
#include <vector>

#include "platform/Mutex.h"
#include "platform/NotificationCenter.h"
#include "platform/ThreadSafety.h"
#include "record/Operation.h"
#include "record/Sink.h"
#include "record/stream/EventWriter.h"
#include "record/stream/Names.h"

namespace record {

/// Writes down what crosses between one plug-in and its platform. Kept alive by whatever crosses.
///
/// One thread is inside the plug-in at a time: it takes the baton on entering (a call into the plug-in begins, or a
/// service returns) and gives it back on leaving (the plug-in calls a service, or returns). So the events of all
/// threads have one order, and who replays them can let threads take turns in it.
class Recorder : public Names, public std::enable_shared_from_this<Recorder> {
 public:
  using ThreadName = std::function<std::string()>;
  Recorder(std::shared_ptr<Sink> sink, ThreadName threadName);

  std::uint64_t newNumber(ObjectKind kind) override;
  /// Whether the calling thread is inside the plug-in.
  bool holdsBaton() const { return _holder.load(std::memory_order_relaxed) == std::this_thread::get_id(); }
  /// The notification center that the plug-in sees; said once, before the plug-in's object is made.
  void setNotifications(platform::NotificationCenter& center) { _notifications = &center; }
  platform::NotificationCenter& notifications() const { return *_notifications; }

  class Outward;
  struct Thread {
    std::uint32_t number;
    Outward* innermost = nullptr;  // the call to a service that the thread is inside of
  };
  /// The plug-in calls a service: from the call's arguments to its answer. Made and used with the baton in hand, which
  /// it gives back while the service works.
  class Outward {
   public:
    Outward(Recorder& recorder, const Operation& operation, const Numbered* receiver);
    ~Outward();
    Outward(const Outward&) = delete;
    Outward& operator=(const Outward&) = delete;

    /// Writes the call; the service may work now.
    void leave();
    /// The service has returned; the answer can be put.
    void enter();
    /// Leaves again, for a service that has not finished after all.
    void giveUp();
    void answer();
    /// The service has thrown what is being handled; what it had put out can be put.
    void enterThrown();
    void threw();
    /// The plug-in throws inside of it what is being handled.
    void setThrownByPlugin() { _ofPlugin = std::current_exception(); }
    ItemWriter& items() { return _recorder._items; }

   private:
    Recorder& _recorder;
    const Operation& _operation;
    bool _stray;  // nobody called the plug-in on this thread: nothing is written
    bool _inside = true;
    Thread* _thread = nullptr;
    Outward* _outer = nullptr;       // the call of the same thread that this one is inside of
    std::exception_ptr _ofPlugin{};  // what the plug-in has thrown inside of this one
  };

  /// Somebody calls the plug-in. Holds the baton, but for the services that the plug-in calls.
  class Inward {
   public:
    explicit Inward(Recorder& recorder);
    ~Inward();
    Inward(const Inward&) = delete;
    Inward& operator=(const Inward&) = delete;

    /// Writes the call with the arguments that were put.
    void begin(const Operation& operation);
    /// Writes the return; `flushed`: from here on it can be read.
    void end(bool flushed);
    /// The plug-in has thrown what is being handled; what it had put out can be put before the end.
    void beginThrown();
    void endThrown(bool flushed);
    ItemWriter& items() { return _recorder._items; }

   private:
    void ended(EventKind kind, bool flushed);

    Recorder& _recorder;
  };

  /// What wrappers there are of objects: found by the object while they live. With the baton in hand.
  std::shared_ptr<void> wrapperOf(const void* target) const;
  void setWrapper(const void* target, const std::shared_ptr<void>& wrapper);
  /// Keeps something until the platform goes.
  void keep(std::shared_ptr<void> object) { _kept.push_back(std::move(object)); }
  /// Wrappers of what the plug-in lets others hold weakly: they go when the plug-in's own object has gone. Null when
  /// there is none; without an owner that of the object that was last at the address.
  std::shared_ptr<void> observerWrapper(std::type_index kind, const void* target,
                                        const std::weak_ptr<const void>* owner = nullptr) const;
  void setObserverWrapper(std::type_index kind, const void* target, const std::weak_ptr<const void>& owner,
                          std::shared_ptr<void> wrapper);

  /// The number of the buffer that a service lent; null has none.
  std::uint64_t lendBuffer(const void* buffer);
  std::uint64_t takeBuffer(const void* buffer);

  /// Ends the recording in order; what happens afterwards is not in it.
  void finish();
  /// The platform goes, after the plug-in's object: lets go of what was kept, which may hold the recorder itself.
  void release();
  /// Whether the sink has refused.
  bool failed();

 private:
  Thread& thisThread();
  std::uint32_t numberOf(const Operation& operation);
  void write(EventKind kind, const Operation* operation);
  void takeBaton();
  void giveBaton();
  void forgetGone();

  platform::Mutex _baton;
  std::atomic<std::thread::id> _holder;
  // All below are touched with the baton in hand.
  EventWriter _writer;
  ItemWriter _items;
  const ThreadName _threadName;
  const std::chrono::steady_clock::time_point _begun = std::chrono::steady_clock::now();
  std::unordered_map<std::thread::id, Thread> _threads;
  std::unordered_map<const Operation*, std::uint32_t> _operations;
  std::uint64_t _lastNumber = 0;
  std::unordered_map<const void*, std::weak_ptr<void>> _wrappers;
  std::size_t _wrappersSweptAt = 256;
  struct Observed {
    std::shared_ptr<void> wrapper;
    std::weak_ptr<const void> owner;
  };
  std::map<std::pair<std::type_index, const void*>, Observed> _observers;
  std::vector<std::shared_ptr<void>> _gone;
  std::vector<std::shared_ptr<void>> _kept;
  std::unordered_map<const void*, std::uint64_t> _buffers;
  platform::NotificationCenter* _notifications = nullptr;
  bool _finished = false;

  friend class Outward;
  friend class Inward;
};

}  // namespace record
