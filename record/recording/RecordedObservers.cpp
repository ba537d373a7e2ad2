#include <type_traits>
#include <utility>

#include "record/recording/RecordingCrossing.h"

namespace record {

using platform::OBApplicationProxyRef;
using platform::OBApplicationWorkspaceObserverProtocol;
using platform::RVAppInstallObserverDelegate;
using CoordinatorRef = std::shared_ptr<platform::RVAppInstallCoordinator>;

namespace {

/// What a service holds weakly in place of an observer of the plug-in's. It lives until the observer is gone, as the
/// recorder finds out when the plug-in is left: the observer itself is held during a call alone, and goes, if it does,
/// inside one.
template <class Protocol>
class RecordedObserver : public Protocol {
 public:
  RecordedObserver(std::weak_ptr<Recorder> recorder, std::weak_ptr<Protocol> target, std::uint64_t number)
      : _recorder(std::move(recorder)), _target(std::move(target)), _number(number) {}

 protected:
  template <auto method, class... Arguments>
  void call(const Operation& operation, const Arguments&... arguments) {
    const auto recorder = _recorder.lock();
    if (!recorder) return;
    callPlugin(
        *recorder, operation,
        [&](ItemWriter& items) {
          items.object({ObjectKind::observer, _number, 0});
        },
        [&](const auto&... seen) {
          if (const auto target = _target.lock()) (target.get()->*method)(seen...);
        },
        arguments...);
  }

 private:
  const std::weak_ptr<Recorder> _recorder;
  const std::weak_ptr<Protocol> _target;
  const std::uint64_t _number;
};

class RecordedDelegate final : public RecordedObserver<RVAppInstallObserverDelegate> {
  using T = RVAppInstallObserverDelegate;

 public:
  using RecordedObserver::RecordedObserver;

  void promiseDidBeginFulfillmentWithIdentifier(std::uint64_t identifier) override {
    call<&T::promiseDidBeginFulfillmentWithIdentifier>(inbound::delegate::promiseDidBeginFulfillmentWithIdentifier,
                                                       identifier);
  }
  void coordinatorDidInstallPlaceholder(const CoordinatorRef& coordinator) override {
    call<&T::coordinatorDidInstallPlaceholder>(inbound::delegate::coordinatorDidInstallPlaceholder, coordinator);
  }
  void coordinatorDidCompleteSuccessfully(const CoordinatorRef& coordinator) override {
    call<&T::coordinatorDidCompleteSuccessfully>(inbound::delegate::coordinatorDidCompleteSuccessfully, coordinator);
  }
  void coordinatorShouldPrioritize(const CoordinatorRef& coordinator) override {
    call<&T::coordinatorShouldPrioritize>(inbound::delegate::coordinatorShouldPrioritize, coordinator);
  }
  void coordinatorCanceledWithReason(const CoordinatorRef& coordinator, const ErrorRef& reason,
                                     platform::RVClientIdentifier client) override {
    call<&T::coordinatorCanceledWithReason>(inbound::delegate::coordinatorCanceledWithReason, coordinator, reason,
                                            client);
  }
};

class RecordedWorkspaceObserver final : public RecordedObserver<OBApplicationWorkspaceObserverProtocol> {
  using T = OBApplicationWorkspaceObserverProtocol;

 public:
  using RecordedObserver::RecordedObserver;

  void applicationInstallsArePrioritized(const std::vector<OBApplicationProxyRef>& prioritized,
                                         const std::vector<OBApplicationProxyRef>& paused) override {
    call<&T::applicationInstallsArePrioritized>(inbound::workspace::applicationInstallsArePrioritized, prioritized,
                                                paused);
  }
  void applicationInstallsDidCancel(const std::vector<OBApplicationProxyRef>& applications) override {
    call<&T::applicationInstallsDidCancel>(inbound::workspace::applicationInstallsDidCancel, applications);
  }
};

class RecordedNotificationObserver {
 public:
  RecordedNotificationObserver(std::weak_ptr<Recorder> recorder, std::weak_ptr<void> target,
                               platform::KBNotificationCallback callback, std::uint64_t number)
      : _recorder(std::move(recorder)), _target(std::move(target)), _callback(callback), _number(number) {}

  static void deliver(platform::NotificationCenter&, void* observer, std::string_view name, const void* object,
                      const platform::Value& userInfo) {
    if (observer) static_cast<RecordedNotificationObserver*>(observer)->call(name, object, userInfo);
  }

 private:
  void call(std::string_view name, const void* object, const platform::Value& userInfo) {
    const auto recorder = _recorder.lock();
    if (!recorder) return;
    callPlugin(
        *recorder, inbound::notification,
        [&](ItemWriter& items) {
          items.object({ObjectKind::observer, _number, 0});
        },
        [&](std::string_view seenName, const platform::Value& seenInfo) {
          if (const auto target = _target.lock())
            _callback(recorder->notifications(), target.get(), seenName, object, seenInfo);
        },
        name, userInfo);
  }

  const std::weak_ptr<Recorder> _recorder;
  const std::weak_ptr<void> _target;
  const platform::KBNotificationCallback _callback;
  const std::uint64_t _number;
};

/// The wrapper of the observer, made when it is seen for the first time.
template <class Wrapper, class T>
std::weak_ptr<T> wrapped(Recorder& recorder, const std::weak_ptr<T>& observer) {
  const auto alive = observer.lock();
  if (!alive) return {};
  const std::weak_ptr<const void> owner = alive;
  // Two of the plug-in's bases may be one address; each is a kind of its own.
  if (auto known = recorder.observerWrapper(typeid(Wrapper), alive.get(), &owner))
    return std::static_pointer_cast<Wrapper>(known);
  auto wrapper = std::make_shared<Wrapper>(recorder.weak_from_this(), observer,
                                           recorder.find(ObjectKind::observer, alive.get()).value_or(0));
  recorder.setObserverWrapper(typeid(Wrapper), alive.get(), owner, wrapper);
  return wrapper;
}

/// A function of the plug-in's that a service calls later. Letting it go may be the end of what it holds, so that is a
/// call of its own.
class RecordedCompletion {
  auto receiver() {
    return [this](ItemWriter& items) { items.object({ObjectKind::callback, _number, 0}); };
  }

 public:
  RecordedCompletion(std::shared_ptr<Recorder> recorder, std::function<void(ErrorRef)> function, std::uint64_t number)
      : _recorder(std::move(recorder)), _function(std::move(function)), _number(number) {}
  ~RecordedCompletion() {
    if (_recorder->holdsBaton()) return;
    try {
      callPlugin(*_recorder, inbound::releaseCompletion, receiver(), [this] { _function = nullptr; });
    } catch (...) {
      return;  // for want of memory: what the function holds goes all the same
    }
  }
  RecordedCompletion(const RecordedCompletion&) = delete;
  RecordedCompletion& operator=(const RecordedCompletion&) = delete;

  void call(const ErrorRef& error) {
    callPlugin(
        *_recorder, inbound::completion, receiver(), [this](const ErrorRef& seen) { _function(seen); }, error);
  }

 private:
  const std::shared_ptr<Recorder> _recorder;
  std::function<void(ErrorRef)> _function;
  const std::uint64_t _number;
};

}  // namespace

std::weak_ptr<RVAppInstallObserverDelegate> recordedObserver(
    Recorder& recorder, const std::weak_ptr<RVAppInstallObserverDelegate>& observer) {
  return wrapped<RecordedDelegate>(recorder, observer);
}

std::weak_ptr<OBApplicationWorkspaceObserverProtocol> recordedObserver(
    Recorder& recorder, const std::weak_ptr<OBApplicationWorkspaceObserverProtocol>& observer) {
  return wrapped<RecordedWorkspaceObserver>(recorder, observer);
}

const OBApplicationWorkspaceObserverProtocol* recordedObserver(Recorder& recorder,
                                                               const OBApplicationWorkspaceObserverProtocol* observer) {
  auto known = recorder.observerWrapper(typeid(RecordedWorkspaceObserver), observer);
  return known ? static_cast<RecordedWorkspaceObserver*>(known.get()) : observer;
}

std::weak_ptr<void> recordedNotificationObserver(Recorder& recorder, const std::weak_ptr<void>& observer,
                                                 platform::KBNotificationCallback callback) {
  const auto alive = observer.lock();
  if (!alive) return {};
  auto wrapper = std::make_shared<RecordedNotificationObserver>(
      recorder.weak_from_this(), observer, callback, recorder.find(ObjectKind::observer, alive.get()).value_or(0));
  recorder.setObserverWrapper(typeid(RecordedNotificationObserver), alive.get(), alive, wrapper);
  return wrapper;
}

const void* recordedNotificationObserver(Recorder& recorder, const void* observer) {
  auto known = recorder.observerWrapper(typeid(RecordedNotificationObserver), observer);
  return known ? known.get() : observer;
}

platform::KBNotificationCallback recordedNotificationCallback() { return RecordedNotificationObserver::deliver; }

/// The daemon keeps its handles, and they have no operation that would cost anything to let go.
platform::LogHandle& recordedLog(Recorder& recorder, ItemWriter& items, platform::LogHandle& target) {
  auto wrapper = toPlugin(recorder, std::shared_ptr<platform::LogHandle>(std::shared_ptr<void>(), &target));
  if (static_cast<const RecordedObject<platform::LogHandle>&>(*wrapper).isNew()) recorder.keep(wrapper);
  put(items, recorder, wrapper);
  return *wrapper;
}

std::function<void(ErrorRef)> recordedFunction(Recorder& recorder, Callback<void(ErrorRef)>& callback) {
  auto completion =
      std::make_shared<RecordedCompletion>(recorder.shared_from_this(), std::move(callback.function), callback.number);
  return [completion = std::move(completion)](const ErrorRef& error) { completion->call(error); };
}

std::function<void(const platform::OBBundleProxyRef&, bool&)> recordedFunction(
    Recorder& recorder, Callback<void(const platform::OBBundleProxyRef&, bool&)>& callback) {
  return [&recorder, &callback](const platform::OBBundleProxyRef& bundle, bool& stop) {
    callPlugin(
        recorder, inbound::block,
        [&](ItemWriter& items) {
          items.object({ObjectKind::callback, callback.number, 0});
        },
        [&](const platform::OBBundleProxyRef& seen, const Stop& wanted) { callback.function(seen, wanted.isWanted); },
        bundle, Stop{stop});
  };
}

Callback<void(double)> toPluginArgument(Recorder& recorder, const platform::TSProgressCallback& callback) {
  if (!callback) return {};
  const std::uint64_t number = recorder.newNumber(ObjectKind::callback);
  return {[self = recorder.shared_from_this(), number, callback](double fraction) {
            Recorder::Outward outward(*self, inbound::progress, nullptr);
            outward.items().object({ObjectKind::callback, number, 0});
            outward.items().real(fraction);
            outward.leave();
            try {
              callback(fraction);
            } catch (...) {
              outward.enterThrown();
              outward.threw();
              throw;
            }
            outward.enter();
            outward.answer();
          },
          number};
}

}  // namespace record
