#pragma once

#include <algorithm>
#include <memory>
#include <thread>
#include <type_traits>
#include <utility>
#include <variant>
#include <vector>

#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

/// The observers of a service that promises this: an observer is held weakly and known by its address, and
/// once its removal has returned, no callback to it runs or starts. A removal by the very thread that is delivering to
/// it does not wait for itself.
///
/// `Info` is what a service keeps beside each registration. An observer may be registered more than once; callbacks
/// run without any lock of the list. Callable from any thread.
template <class Observer, class Info = std::monostate>
class ObserverList {
 public:
  ObserverList() = default;
  ObserverList(const ObserverList&) = delete;
  ObserverList& operator=(const ObserverList&) = delete;

  /// An observer that no longer exists is not kept.
  void add(const std::weak_ptr<Observer>& observer, Info info = {}) {
    auto alive = observer.lock();
    if (!alive) return;
    platform::Mutex::Lock lock(_mutex);
    dropDead();
    _entries.push_back(std::make_shared<Entry>(alive.get(), observer, std::move(info)));
  }

  /// Ends every registration of the observer whose info `matches`, and waits for callbacks through it that run on other
  /// threads.
  template <class Matches>
  void removeIf(const Observer* observer, Matches&& matches) {
    platform::Mutex::Lock lock(_mutex);
    std::vector<std::shared_ptr<Entry>> removed;
    for (auto at = _entries.begin(); at != _entries.end();) {
      if ((*at)->address != observer || !matches(std::as_const((*at)->info))) {
        ++at;
        continue;
      }
      (*at)->removed = true;
      removed.push_back(std::move(*at));
      at = _entries.erase(at);
    }
    for (const auto& entry : removed) _ended.wait(_mutex, [&]() REQUIRES(_mutex) { return !entry->runsElsewhere(); });
  }
  void remove(const Observer* observer) {
    removeIf(observer, [](const Info&) { return true; });
  }

  /// Calls `callback(observer, info)` (a pointer where observers have no type) with each observer alive whose info is
  /// `wanted`, kept alive meanwhile; one that is removed before its turn is not called. Answers how many were.
  template <class Wanted, class Callback>
  std::size_t deliverIf(Wanted&& wanted, Callback&& callback) {
    std::vector<std::shared_ptr<Entry>> entries;
    {
      platform::Mutex::Lock lock(_mutex);
      dropDead();
      for (const auto& entry : _entries) {
        if (wanted(std::as_const(entry->info))) entries.push_back(entry);
      }
    }
    std::size_t count = 0;
    for (const auto& entry : entries) count += deliverTo(*entry, callback);
    return count;
  }
  template <class Callback>
  std::size_t deliver(Callback&& callback) {
    return deliverIf([](const Info&) { return true; }, std::forward<Callback>(callback));
  }

  /// The same for one observer, if it is still registered.
  template <class Callback>
  std::size_t deliverTo(const Observer* observer, Callback&& callback) {
    std::shared_ptr<Entry> found;
    {
      platform::Mutex::Lock lock(_mutex);
      for (const auto& entry : _entries) {
        if (entry->address == observer) found = entry;
      }
    }
    return found ? deliverTo(*found, callback) : 0;
  }

  bool empty() {
    platform::Mutex::Lock lock(_mutex);
    dropDead();
    return _entries.empty();
  }

 private:
  struct Entry {
    Entry(const Observer* address, std::weak_ptr<Observer> observer, Info info)
        : address(address), observer(std::move(observer)), info(std::move(info)) {}

    bool runsElsewhere() const {
      return std::any_of(running.begin(), running.end(),
                         [](auto thread) { return thread != std::this_thread::get_id(); });
    }

    const Observer* const address;
    const std::weak_ptr<Observer> observer;
    const Info info;
    // These belong to whoever holds the list's mutex.
    bool removed = false;
    std::vector<std::thread::id> running;
  };

  void dropDead() REQUIRES(_mutex) {
    _entries.erase(
        std::remove_if(_entries.begin(), _entries.end(), [](const auto& entry) { return entry->observer.expired(); }),
        _entries.end());
  }

  template <class Callback>
  std::size_t deliverTo(Entry& entry, Callback& callback) {
    auto self = std::this_thread::get_id();
    auto observer = entry.observer.lock();
    if (!observer) return 0;
    {
      platform::Mutex::Lock lock(_mutex);
      if (entry.removed) return 0;
      entry.running.push_back(self);
    }
    if constexpr (std::is_void_v<Observer>)
      callback(observer.get(), entry.info);
    else
      callback(*observer, entry.info);
    {
      platform::Mutex::Lock lock(_mutex);
      entry.running.erase(std::find(entry.running.begin(), entry.running.end(), self));
      _ended.notifyAll();
    }
    return 1;  // the observer may be destroyed here, with no lock held
  }

  platform::Mutex _mutex;
  platform::Condition _ended;
  std::vector<std::shared_ptr<Entry>> _entries GUARDED_BY(_mutex);
};

}  // namespace device
