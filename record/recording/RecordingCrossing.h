#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <tuple>
#include <type_traits>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/NotificationCenter.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/TSClient.h"
#include "platform/TSSupport.h"
#include "record/calls/Inbound.h"
#include "record/calls/Objects.h"
#include "record/recording/Recorder.h"
#include "record/stream/Codec.h"

/// What a service's operation does while it is recorded: it writes the arguments, calls the real object, and writes its
/// answer. What goes over in between is translated: the plug-in sees wrappers of the services' objects, the services
/// see wrappers of the plug-in's.
namespace record {

template <class T>
class RecordingCrossing;
template <class T>
using RecordedObject = ObjectOfKind<T, RecordingCrossing>;

/// Wrappers of the plug-in's observers (see RecordedObservers.cpp).
std::weak_ptr<platform::RVAppInstallObserverDelegate> recordedObserver(
    Recorder& recorder, const std::weak_ptr<platform::RVAppInstallObserverDelegate>& observer);
std::weak_ptr<platform::OBApplicationWorkspaceObserverProtocol> recordedObserver(
    Recorder& recorder, const std::weak_ptr<platform::OBApplicationWorkspaceObserverProtocol>& observer);
const platform::OBApplicationWorkspaceObserverProtocol* recordedObserver(
    Recorder& recorder, const platform::OBApplicationWorkspaceObserverProtocol* observer);
std::weak_ptr<void> recordedNotificationObserver(Recorder& recorder, const std::weak_ptr<void>& observer,
                                                 platform::KBNotificationCallback callback);
const void* recordedNotificationObserver(Recorder& recorder, const void* observer);
platform::KBNotificationCallback recordedNotificationCallback();
std::function<void(ErrorRef)> recordedFunction(Recorder& recorder, Callback<void(ErrorRef)>& callback);
std::function<void(const platform::OBBundleProxyRef&, bool&)> recordedFunction(
    Recorder& recorder, Callback<void(const platform::OBBundleProxyRef&, bool&)>& callback);

platform::LogHandle& recordedLog(Recorder& recorder, ItemWriter& items, platform::LogHandle& target);
template <class T>
void putArgument(Recorder& recorder, ItemWriter& items, const std::weak_ptr<T>& observer);

// ---- The crossing ----

template <class T>
class RecordingCrossing {
 public:
  RecordingCrossing(std::shared_ptr<Recorder> recorder, std::shared_ptr<T> target)
      : _recorder(std::move(recorder)), _target(std::move(target)) {}

  const std::shared_ptr<T>& target() const { return _target; }

  template <auto method, class... Arguments>
  auto call(const Operation& operation, const Numbered* receiver, Arguments&&... arguments) const {
    return callWith(
        operation, receiver,
        [](T& target, auto&&... passed) { return (target.*method)(std::forward<decltype(passed)>(passed)...); },
        std::forward<Arguments>(arguments)...);
  }

  template <class Body, class... Arguments>
  auto callWith(const Operation& operation, const Numbered* receiver, Body&& body, Arguments&&... arguments) const {
    Recorder& recorder = *_recorder;
    Recorder::Outward outward(recorder, operation, receiver);
    (putArgument(recorder, outward.items(), arguments), ...);
    std::tuple<T&, decltype(toWorld(recorder, arguments))...> passed{*_target, toWorld(recorder, arguments)...};
    outward.leave();
    using Result = decltype(std::apply(body, std::move(passed)));
    const auto putOuts = [&] { (putOutThrown(recorder, outward.items(), arguments), ...); };
    if constexpr (std::is_void_v<Result>) {
      guarded(
          outward, [&] { std::apply(body, std::move(passed)); }, putOuts);
      outward.enter();
      (putOut(recorder, outward.items(), arguments), ...);
      outward.answer();
    } else {
      Result result = guarded(
          outward, [&] { return std::apply(body, std::move(passed)); }, putOuts);
      outward.enter();
      auto seen = toPlugin(recorder, std::move(result));
      put(outward.items(), recorder, seen);
      (putOut(recorder, outward.items(), arguments), ...);
      outward.answer();
      return seen;
    }
  }

  /// The object goes, which may take its time.
  void release(const Operation& operation, const Numbered* receiver) {
    Recorder::Outward outward(*_recorder, operation, receiver);
    outward.leave();
    _target.reset();
    outward.enter();
    outward.answer();
  }

  platform::LogHandle& logOf(const Operation& operation, int category) const {
    Recorder& recorder = *_recorder;
    Recorder::Outward outward(recorder, operation, nullptr);
    put(outward.items(), recorder, category);
    outward.leave();
    auto& target = guarded(outward, [&]() -> platform::LogHandle& { return _target->TSGetLogCategory(category); });
    outward.enter();
    auto& wrapper = recordedLog(recorder, outward.items(), target);
    outward.answer();
    return wrapper;
  }

  bool wait(const Operation& operation, platform::Mutex& mutex, platform::Condition& changed,
            platform::Clock::Instant deadline, const std::function<bool()>& satisfied) const APPSYNC_REQUIRES(mutex);

  void addObserver(const Operation& operation, std::weak_ptr<void> observer, platform::KBNotificationCallback callback,
                   std::string_view name, const void* object,
                   platform::KBNotificationSuspensionBehavior suspension) const {
    Recorder& recorder = *_recorder;
    Recorder::Outward outward(recorder, operation, nullptr);
    putArgument(recorder, outward.items(), observer);
    put(outward.items(), recorder, name);
    put(outward.items(), recorder, suspension);
    auto passed = recordedNotificationObserver(recorder, observer, callback);
    outward.leave();
    guarded(outward, [&] {
      _target->KBNotificationCenterAddObserver(passed, recordedNotificationCallback(), name, object, suspension);
    });
    outward.enter();
    outward.answer();
  }

  void removeObserver(const Operation& operation, const void* observer, std::string_view name) const {
    Recorder& recorder = *_recorder;
    Recorder::Outward outward(recorder, operation, nullptr);
    if (const auto number = recorder.find(ObjectKind::observer, observer))
      outward.items().object({ObjectKind::observer, *number, 0});
    else
      outward.items().absent();
    put(outward.items(), recorder, name);
    const void* passed = recordedNotificationObserver(recorder, observer);
    outward.leave();
    guarded(outward, [&] { _target->KBNotificationCenterRemoveObserver(passed, name); });
    outward.enter();
    outward.answer();
  }

 private:
  static void putNothing() {}
  /// A service that throws is recorded as one, with what it had put out; the plug-in gets what it threw.
  template <class Work, class PutOuts = void (*)()>
  static decltype(auto) guarded(Recorder::Outward& outward, Work&& work, const PutOuts& putOuts = putNothing) {
    try {
      return work();
    } catch (...) {
      outward.enterThrown();
      putOuts();
      outward.threw();
      throw;
    }
  }

  std::shared_ptr<Recorder> _recorder;
  std::shared_ptr<T> _target;
};

/// The thread may be woken with the mutex in hand while another one is inside the plug-in and wants it: so it lets go
/// of the mutex until it has the baton. Somebody may have taken meanwhile what it was woken for; then it waits again.
template <class T>
bool RecordingCrossing<T>::wait(const Operation& operation, platform::Mutex& mutex, platform::Condition& changed,
                                platform::Clock::Instant deadline, const std::function<bool()>& satisfied) const {
  Recorder& recorder = *_recorder;
  Recorder::Outward outward(recorder, operation, nullptr);
  put(outward.items(), recorder, Deadline{deadline.time_since_epoch().count()});
  outward.leave();
  while (true) {
    bool woken = false;
    try {
      woken = _target->waitUntil(mutex, changed, deadline, satisfied);
    } catch (...) {
      mutex.unlock();
      outward.enterThrown();
      outward.threw();
      mutex.lock();
      throw;
    }
    mutex.unlock();
    outward.enter();
    mutex.lock();
    const bool answer = satisfied();
    if (answer || !woken) {
      put(outward.items(), recorder, answer);
      outward.answer();
      return answer;
    }
    outward.giveUp();
  }
}

template <class T>
concept IsWrapped = requires {
  RecordedObject<T>::kind;
};

// ---- How arguments of the plug-in are written; most are written by Codec.h ----

template <class T>
void putArgument(Recorder& recorder, ItemWriter& items, const T& argument) {
  put(items, recorder, argument);
}
template <class T>
void putArgument(Recorder& recorder, ItemWriter& items, const std::weak_ptr<T>& observer) {
  const auto alive = observer.lock();
  if (!alive) return items.absent();
  items.object(recorder.mention(ObjectKind::observer, alive.get(), alive));
}
inline void putArgument(Recorder& recorder, ItemWriter& items,
                        const platform::OBApplicationWorkspaceObserverProtocol* observer) {
  if (const auto number = recorder.find(ObjectKind::observer, observer))
    items.object({ObjectKind::observer, *number, 0});
  else
    items.absent();
}
template <class Signature>
void putArgument(Recorder& recorder, ItemWriter& items, Callback<Signature>& callback) {
  if (!callback.function) return items.absent();
  const bool isNew = callback.number == 0;
  if (isNew) callback.number = recorder.newNumber(ObjectKind::callback);
  items.object({ObjectKind::callback, callback.number, isNew ? ObjectMention::isNew : std::uint8_t{0}});
}
/// Of what a service puts out, whether the plug-in wants it.
template <class T>
void putArgument(Recorder&, ItemWriter& items, const Out<T>& argument) {
  items.boolean(argument.place != nullptr);
}
template <class T>
void putArgument(Recorder&, ItemWriter& items, const OutReference<T>&) {
  items.boolean(true);
}
inline void putArgument(Recorder&, ItemWriter& items, const LentBuffer&) { items.boolean(true); }
inline void putArgument(Recorder&, ItemWriter&, const Stop&) {}
inline void putArgument(Recorder& recorder, ItemWriter& items, const ReturnedBuffer& returned) {
  if (const std::uint64_t number = recorder.takeBuffer(returned.buffer))
    items.object({ObjectKind::buffer, number, 0});
  else
    items.absent();
  items.number(returned.length);
}

/// ... and what was put out.
template <class T>
void putOut(Recorder&, ItemWriter&, const T&) {}
template <class T>
void putOut(Recorder& recorder, ItemWriter& items, const Out<T>& argument) {
  if (argument.place) put(items, recorder, *argument.place);
}
template <class T>
void putOut(Recorder& recorder, ItemWriter& items, const OutReference<T>& argument) {
  put(items, recorder, argument.place);
}
inline void putOut(Recorder& recorder, ItemWriter& items, const LentBuffer& lent) {
  if (!*lent.buffer) return items.absent();
  items.object({ObjectKind::buffer, recorder.lendBuffer(*lent.buffer), ObjectMention::isNew | ObjectMention::hasFacts});
  items.data({static_cast<const char*>(*lent.buffer), *lent.length});
}
inline void putOut(Recorder&, ItemWriter& items, const Stop& stop) { items.boolean(stop.isWanted); }
/// ... by who has thrown, and may not have come so far.
template <class T>
void putOutThrown(Recorder& recorder, ItemWriter& items, const T& argument) {
  putOut(recorder, items, argument);
}
inline void putOutThrown(Recorder& recorder, ItemWriter& items, const LentBuffer& lent) {
  *lent.buffer == lent.before ? items.absent() : putOut(recorder, items, lent);
}

// ---- What the services get ----

template <class T>
T& toWorld(Recorder&, T& argument) {
  return argument;
}
inline std::string_view toWorld(Recorder&, BytesArgument& argument) { return argument.bytes; }
inline BytesArgument toWorld(Recorder&, BytesArgument&& argument) { return argument; }
template <class T>
T* toWorld(Recorder&, Out<T>& argument) {
  return argument.place;
}
template <class T>
T& toWorld(Recorder&, OutReference<T>& argument) {
  return argument.place;
}
template <class T>
requires std::is_polymorphic_v<T> std::shared_ptr<T> toWorld(Recorder&, const std::shared_ptr<T>& object) {
  if constexpr (std::is_same_v<T, platform::RVPromise>) {
    using ToPath = RecordedObject<platform::RVPromisedTransferToPath>;
    using OutOfBand = RecordedObject<platform::RVPromisedOutOfBandTransfer>;
    if (const auto* promise = dynamic_cast<const ToPath*>(object.get())) return promise->crossing().target();
    if (const auto* promise = dynamic_cast<const OutOfBand*>(object.get())) return promise->crossing().target();
  } else if constexpr (IsWrapped<T>) {
    if (const auto* wrapper = dynamic_cast<const RecordedObject<T>*>(object.get())) return wrapper->crossing().target();
  }
  return object;
}
template <class T>
requires std::is_polymorphic_v<T> std::vector<std::shared_ptr<T>> toWorld(
    Recorder& recorder, const std::vector<std::shared_ptr<T>>& objects) {
  std::vector<std::shared_ptr<T>> passed;
  passed.reserve(objects.size());
  for (const auto& object : objects) passed.push_back(toWorld(recorder, object));
  return passed;
}
template <class T>
requires(!std::is_void_v<T>) auto toWorld(Recorder& recorder, std::weak_ptr<T>& observer) {
  return recordedObserver(recorder, observer);
}
inline auto toWorld(Recorder& recorder, const platform::OBApplicationWorkspaceObserverProtocol*& observer) {
  return recordedObserver(recorder, observer);
}
template <class Signature>
std::function<Signature> toWorld(Recorder& recorder, Callback<Signature>& callback) {
  return callback.function ? recordedFunction(recorder, callback) : nullptr;
}

// ---- What the plug-in gets ----

template <class T>
T toPlugin(Recorder&, T answer) {
  return answer;
}
template <class T, class Pointer>
std::shared_ptr<RecordedObject<T>> makeWrapper(Recorder& recorder, Pointer target) {
  constexpr ObjectKind kind = RecordedObject<T>::kind;
  return std::make_shared<RecordedObject<T>>(kind, recorder.newNumber(kind), true,
                                             RecordingCrossing<T>(recorder.shared_from_this(), std::move(target)));
}
template <class T>
requires IsWrapped<T> std::shared_ptr<T> toPlugin(Recorder& recorder, std::shared_ptr<T> target) {
  if (!target) return nullptr;
  const void* address = dynamic_cast<const void*>(target.get());
  if (auto known = recorder.wrapperOf(address)) {
    // The same object: a wrapper keeps its target, so no other can have come to its place.
    return std::shared_ptr<T>(known, static_cast<RecordedObject<T>*>(known.get()));
  }
  auto wrapper = makeWrapper<T>(recorder, std::move(target));
  recorder.setWrapper(address, wrapper);
  return wrapper;
}
template <class T>
requires IsWrapped<T> std::unique_ptr<T> toPlugin(Recorder& recorder, std::unique_ptr<T> target) {
  if (!target) return nullptr;
  constexpr ObjectKind kind = RecordedObject<T>::kind;
  return std::make_unique<RecordedObject<T>>(
      kind, recorder.newNumber(kind), true,
      RecordingCrossing<T>(recorder.shared_from_this(), std::shared_ptr<T>(std::move(target))));
}

/// What the plug-in gets of an argument that somebody else hands it.
template <class T>
const T& toPluginArgument(Recorder&, const T& argument) {
  return argument;
}
template <class T>
requires IsWrapped<T> std::shared_ptr<T> toPluginArgument(Recorder& recorder, const std::shared_ptr<T>& object) {
  return toPlugin(recorder, object);
}
Callback<void(double)> toPluginArgument(Recorder& recorder, const platform::TSProgressCallback& callback);

/// Somebody calls the plug-in: `body` does, with the arguments as the plug-in gets them.
template <class PutReceiver, class Body, class... Arguments>
auto callPlugin(Recorder& recorder, const Operation& operation, const PutReceiver& putReceiver, Body&& body,
                const Arguments&... arguments) {
  Recorder::Inward inward(recorder);
  std::tuple<decltype(toPluginArgument(recorder, arguments))...> seen{toPluginArgument(recorder, arguments)...};
  putReceiver(inward.items());
  std::apply([&](auto&... each) { (putArgument(recorder, inward.items(), each), ...); }, seen);
  inward.begin(operation);
  const bool flushed = std::string_view(operation.service) == inbound::client::service;
  const auto putOuts = [&] { (putOut(recorder, inward.items(), arguments), ...); };
  const auto guarded = [&]() -> decltype(std::apply(body, seen)) {
    try {
      return std::apply(body, seen);
    } catch (...) {
      inward.beginThrown();
      putOuts();
      inward.endThrown(flushed);
      throw;
    }
  };
  if constexpr (std::is_void_v<decltype(std::apply(body, seen))>) {
    guarded();
    inward.items().clear();
    putOuts();
    inward.end(flushed);
  } else {
    auto result = guarded();
    inward.items().clear();
    put(inward.items(), recorder, result);
    putOuts();
    inward.end(flushed);
    return result;
  }
}

}  // namespace record
