#pragma once

#include <concepts>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/TSClient.h"
#include "record/RecordingError.h"
#include "record/calls/Inbound.h"
#include "record/calls/Objects.h"
#include "record/replaying/Replayer.h"
#include "record/stream/Codec.h"

/// What a service's operation does while it is replayed: its arguments are compared, and its answer is read.
namespace record {

template <class T>
class ReplayCrossing;
template <class T>
using ReplayedObject = ObjectOfKind<T, ReplayCrossing>;

/// What the plug-in sees of a recorded value. `mutex` of the replayer is held throughout.
template <class T>
struct Read;
template <class T>
T get(Replayer& replayer, ItemReader& items) {
  return Read<T>::from(replayer, items);
}

/// What the plug-in hands over is written as when it was recorded; what services may call back is kept.
template <class T>
void putGiven(Replayer& replayer, ItemWriter& items, const T& argument) {
  put(items, replayer, argument);
}
inline void putGiven(Replayer&, ItemWriter& items, const std::string_view& text) { items.lendText(Tag::text, text); }
inline void putGiven(Replayer&, ItemWriter& items, const BytesArgument& argument) {
  items.lendText(Tag::data, argument.bytes);
}
inline void putGiven(Replayer&, ItemWriter& items, const platform::Value& value) { items.lendValue(value); }
void putGiven(Replayer& replayer, ItemWriter& items,
              const std::weak_ptr<platform::RVAppInstallObserverDelegate>& observer);
void putGiven(Replayer& replayer, ItemWriter& items,
              const std::weak_ptr<platform::OBApplicationWorkspaceObserverProtocol>& observer);
void putGiven(Replayer& replayer, ItemWriter& items, const platform::OBApplicationWorkspaceObserverProtocol* observer);
void putGiven(Replayer& replayer, ItemWriter& items, Callback<void(ErrorRef)>& callback);
void putGiven(Replayer& replayer, ItemWriter& items,
              Callback<void(const platform::OBBundleProxyRef&, bool&)>& callback);
void putGiven(Replayer& replayer, ItemWriter& items, const ReturnedBuffer& returned);
inline void putGiven(Replayer&, ItemWriter& items, const LentBuffer&) { items.boolean(true); }
template <class T>
void putGiven(Replayer&, ItemWriter& items, const Out<T>& argument) {
  items.boolean(argument.place != nullptr);
}
template <class T>
void putGiven(Replayer&, ItemWriter& items, const OutReference<T>&) {
  items.boolean(true);
}

/// What a service puts out.
template <class T>
void getOut(Replayer&, ItemReader&, const T&) {}
template <class T>
void getOut(Replayer& replayer, ItemReader& items, const Out<T>& argument) {
  if (argument.place) *argument.place = get<T>(replayer, items);
}
template <class T>
void getOut(Replayer& replayer, ItemReader& items, const OutReference<T>& argument) {
  argument.place = get<T>(replayer, items);
}
void getOut(Replayer& replayer, ItemReader& items, const LentBuffer& lent);

/// ... and what it puts out when there is no answer: it has failed.
template <class T>
void failOut(const T&) {}
inline void failOut(const Out<ErrorRef>& argument) {
  platform::setError(argument.place, platform::makeError("replay", 1, "the recording has no answer"));
}
inline void failOut(const LentBuffer& lent) { *lent.buffer = nullptr; }

/// As what an argument reaches the service.
template <class T>
struct Passed {
  using Type = T;
};
template <class T>
struct Passed<Out<T>> {
  using Type = T*;
};
template <class T>
struct Passed<OutReference<T>> {
  using Type = T&;
};
template <>
struct Passed<BytesArgument> {
  using Type = platform::BytesView;
};
template <class T>
using PassedAs = typename Passed<std::remove_cvref_t<T>>::Type;

template <class Method>
struct ResultOf;
template <class R, class T, class... A>
struct ResultOf<R (T::*)(A...)> {
  using Type = R;
};
template <class R, class T, class... A>
struct ResultOf<R (T::*)(A...) const> {
  using Type = R;
};

template <class T>
class ReplayCrossing {
 public:
  explicit ReplayCrossing(Replayer& replayer) : _replayer(replayer) {}

  template <auto method, class... Arguments>
  auto call(const Operation& operation, const Numbered* receiver, Arguments&&... arguments) const {
    return answer<typename ResultOf<decltype(method)>::Type>(operation, receiver, arguments...);
  }
  template <class Body, class... Arguments>
  auto callWith(const Operation& operation, const Numbered* receiver, Body&&, Arguments&&... arguments) const {
    return answer<std::invoke_result_t<Body&, T&, PassedAs<Arguments>...>>(operation, receiver, arguments...);
  }

  void release(const Operation& operation, const Numbered* receiver) const { answer<void>(operation, receiver); }

  platform::LogHandle& logOf(const Operation& operation, int category) const {
    auto log = answer<std::shared_ptr<platform::LogHandle>>(operation, nullptr, category);
    return log ? *log : _replayer.spareLog();
  }

  bool wait(const Operation& operation, platform::Mutex& mutex, platform::Condition& changed,
            platform::Clock::Instant deadline, const std::function<bool()>& satisfied) const APPSYNC_REQUIRES(mutex) {
    mutex.unlock();
    bool woken = false;
    try {
      woken = answer<bool>(operation, nullptr, Deadline{deadline.time_since_epoch().count()});
    } catch (...) {
      mutex.lock();
      throw;
    }
    mutex.lock();
    const bool isSatisfied = satisfied();
    if (isSatisfied) return true;
    if (woken) {
      platform::Mutex::Lock lock(_replayer.mutex);
      _replayer.stands(operation);
    }
    if (deadline == platform::Clock::noDeadline) changed.wait(mutex, satisfied);
    return satisfied();
  }

  void addObserver(const Operation& operation, const std::weak_ptr<void>& observer,
                   platform::KBNotificationCallback callback, std::string_view name, const void*,
                   platform::KBNotificationSuspensionBehavior suspension) const;
  void removeObserver(const Operation& operation, const void* observer, std::string_view name) const;

 private:
  template <class Result, class... Arguments>
  Result answer(const Operation& operation, const Numbered* receiver, Arguments&&... arguments) const {
    // An object that is not handed on after all goes as the plug-in's would: without the mutex.
    std::optional<std::conditional_t<std::is_void_v<Result>, bool, Result>> result;
    platform::Mutex::Lock lock(_replayer.mutex);
    ItemWriter items;
    std::optional<Replayer::Answer> answered;
    std::exception_ptr thrown;
    if (receiver) items.object(receiver->mention());
    (putGiven(_replayer, items, arguments), ...);
    answered = _replayer.exchange(operation, items);
    try {
      if (answered) {
        ItemReader reader(answered->event.payload, &answered->event.large);
        thrown = answered->thrown(reader);
        if constexpr (!std::is_void_v<Result>) {
          if (!thrown) result.emplace(get<Result>(_replayer, reader));
        }
        // Earlier versions have nothing behind what was thrown.
        if (!thrown || !reader.atEnd()) (getOut(_replayer, reader, arguments), ...);
        if constexpr (std::is_void_v<Result>) {
          if (!thrown) return;
        } else {
          if (!thrown) return std::move(*result);
        }
      }
    } catch (const RecordingError& error) {
      thrown = nullptr;
      _replayer.refuse(error.what());
    }
    if (thrown) std::rethrow_exception(thrown);
    (failOut(arguments), ...);
    if constexpr (!std::is_void_v<Result>) return Result();
  }

  Replayer& _replayer;
};

// ---- Reading, by type ----

template <>
struct Read<bool> {
  static bool from(Replayer&, ItemReader& items) { return items.boolean(); }
};
template <std::integral Integer>
struct Read<Integer> {
  static Integer from(Replayer&, ItemReader& items) {
    if constexpr (std::is_signed_v<Integer>)
      return static_cast<Integer>(items.signedNumber());
    else
      return static_cast<Integer>(items.number());
  }
};
template <class Enumeration>
requires std::is_enum_v<Enumeration>
struct Read<Enumeration> {
  static Enumeration from(Replayer&, ItemReader& items) { return static_cast<Enumeration>(items.number()); }
};
template <>
struct Read<double> {
  static double from(Replayer&, ItemReader& items) { return items.real(); }
};
template <>
struct Read<std::string> {
  static std::string from(Replayer&, ItemReader& items) { return items.ownText(); }
};
template <>
struct Read<platform::Value> {
  static platform::Value from(Replayer&, ItemReader& items) { return items.value(); }
};
template <>
struct Read<ErrorRef> {
  static ErrorRef from(Replayer& replayer, ItemReader& items);
};
template <>
struct Read<platform::FileAttributes> {
  static platform::FileAttributes from(Replayer& replayer, ItemReader& items);
};
template <>
struct Read<platform::TSAssetRef> {
  static platform::TSAssetRef from(Replayer& replayer, ItemReader& items);
};
template <>
struct Read<platform::OBBundleProxyRef> {
  static platform::OBBundleProxyRef from(Replayer& replayer, ItemReader& items);
};
template <>
struct Read<platform::OBApplicationProxyRef> {
  static platform::OBApplicationProxyRef from(Replayer& replayer, ItemReader& items);
};
template <>
struct Read<platform::TSProgressCallback> {
  static platform::TSProgressCallback from(Replayer& replayer, ItemReader& items);
};
template <class T>
struct Read<std::optional<T>> {
  static std::optional<T> from(Replayer& replayer, ItemReader& items) {
    if (items.takeAbsent()) return std::nullopt;
    return get<T>(replayer, items);
  }
};
/// The proxies of a list that is told again and again with changes: what it keeps of them is made once.
using Proxies = std::vector<platform::OBApplicationProxyRef>;
std::shared_ptr<const Proxies> proxiesOf(Replayer& replayer, ItemReader& items);
template <class T>
struct Read<std::vector<T>> {
  static std::vector<T> from(Replayer& replayer, ItemReader& items) {
    ItemReader inside{{}};
    ItemReader& reader = items.unpacked(inside);
    std::vector<T> values;
    const std::size_t count = reader.list();
    values.reserve(count);
    for (std::size_t i = 0; i < count; ++i) values.push_back(get<T>(replayer, reader));
    return values;
  }
};

/// The object of that number and type, made when it is mentioned for the first time.
template <class Object, class... Arguments>
std::shared_ptr<Object> objectOf(Replayer& replayer, const ObjectMention& mention, Arguments&&... arguments) {
  auto& known = replayer.known(mention.number);
  if (!known.object) known = {typeid(Object), std::make_shared<Object>(std::forward<Arguments>(arguments)...)};
  if (known.type != typeid(Object)) throw RecordingError("an object changes what it is");
  return std::static_pointer_cast<Object>(known.object);
}

template <class T>
concept IsReplayed = requires {
  ReplayedObject<T>::kind;
};
template <IsReplayed T>
struct Read<std::shared_ptr<T>> {
  static std::shared_ptr<T> from(Replayer& replayer, ItemReader& items) {
    if (items.takeAbsent()) return nullptr;
    const auto mention = items.object();
    return objectOf<ReplayedObject<T>>(replayer, mention, ReplayedObject<T>::kind, mention.number, false,
                                       ReplayCrossing<T>(replayer));
  }
};
template <IsReplayed T>
struct Read<std::unique_ptr<T>> {
  static std::unique_ptr<T> from(Replayer& replayer, ItemReader& items) {
    if (items.takeAbsent()) return nullptr;
    const auto mention = items.object();
    return std::make_unique<ReplayedObject<T>>(ReplayedObject<T>::kind, mention.number, false,
                                               ReplayCrossing<T>(replayer));
  }
};
/// Objects that nobody has operations on.
template <class T>
requires requires(const T* object) { kindOf(object); }
struct Read<std::shared_ptr<const T>> {
  static std::shared_ptr<const T> from(Replayer& replayer, ItemReader& items) {
    if (items.takeAbsent()) return nullptr;
    const auto mention = items.object();
    auto object = objectOf<T>(replayer, mention);
    replayer.set(kindOf(object.get()), object.get(), object, mention.number);
    return object;
  }
};

}  // namespace record
