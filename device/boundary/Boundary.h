#pragma once

#include <chrono>
#include <concepts>
#include <cstdint>
#include <functional>
#include <initializer_list>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include "device/boundary/Injection.h"
#include "device/boundary/InjectionPoint.h"
#include "device/boundary/JournalValue.h"
#include "device/boundary/ObjectKind.h"
#include "device/events/EventQueue.h"
#include "platform/Clock.h"
#include "platform/Error.h"
#include "platform/StringSet.h"
#include "platform/Value.h"

namespace device {

class Boundary;

/// One argument of a call, as the journal shows it; cheap to make, read only when somebody asks, before the call's body
/// runs. Objects stand as `kind#number`, bytes as their count.
class CallArgument {
 public:
  enum class Kind : std::uint8_t { absent, boolean, integer, real, text, bytes, value, object, error, shown };
  struct BytesCount {
    std::size_t count;
  };

  template <std::same_as<bool> Boolean>
  CallArgument(const char* name, Boolean value) : name(name), kind(Kind::boolean), integer(value) {}
  template <class Integer>
  requires(std::is_integral_v<Integer> && !std::is_same_v<Integer, bool>) CallArgument(const char* name, Integer value)
      : name(name),
        kind(Kind::integer),
        isUnsigned(std::is_unsigned_v<Integer>),
        integer(static_cast<std::int64_t>(value)) {}
  CallArgument(const char* name, double value) : name(name), kind(Kind::real), real(value) {}
  CallArgument(const char* name, std::string_view value) : name(name), kind(Kind::text), text(value) {}
  CallArgument(const char* name, const std::string& value) : name(name), kind(Kind::text), text(value) {}
  CallArgument(const char* name, const char* value) : name(name), kind(Kind::text), text(value) {}
  CallArgument(const char* name, const std::optional<std::string>& value)
      : name(name),
        kind(value ? Kind::text : Kind::absent),
        text(value ? std::string_view(*value) : std::string_view()) {}
  CallArgument(const char* name, BytesCount value)
      : name(name), kind(Kind::bytes), integer(static_cast<std::int64_t>(value.count)) {}
  CallArgument(const char* name, const platform::Value& value) : name(name), kind(Kind::value), pointer(&value) {}
  CallArgument(const char* name, const platform::ErrorRef& value) : name(name), kind(Kind::error), pointer(&value) {}
  /// A shared object of a class that has a kind (see ObjectKind.h). Keeps its number as long as it lives.
  template <HasObjectKind T>
  CallArgument(const char* name, const std::shared_ptr<T>& value)
      : name(name), kind(Kind::shown), pointer(&value), show(showAs<std::shared_ptr<T>>) {}
  /// A list of texts, or of such objects.
  template <class T>
  CallArgument(const char* name, const std::vector<T>& value)
      : name(name), kind(Kind::shown), pointer(&value), show(showAs<std::vector<T>>) {}
  CallArgument(const char* name, const platform::StringSet& value)
      : name(name), kind(Kind::shown), pointer(&value), show(showAs<platform::StringSet>) {}
  /// An object known by its address only, until `Boundary::forgetObject`. `objectKind` is "coordinator", "observer", …
  static CallArgument object(const char* name, const char* objectKind, const void* address) {
    CallArgument argument(name, objectKind);
    argument.kind = address ? Kind::object : Kind::absent;
    argument.pointer = address;
    return argument;
  }

  platform::Value journalValue(Boundary& boundary) const;

  const char* name;
  Kind kind;
  bool isUnsigned = false;
  std::int64_t integer = 0;
  double real = 0;
  std::string_view text{};
  const void* pointer = nullptr;
  platform::Value (*show)(Boundary& names, const void* value) = nullptr;

 private:
  template <class T>
  static platform::Value showAs(Boundary& names, const void* value) {
    return device::journalValue(names, *static_cast<const T*>(value));
  }
};
using CallArguments = std::initializer_list<CallArgument>;

/// Which call crosses the boundary. `app` is empty where no app is meant.
struct Crossing {
  InjectionPoint point;
  std::string_view app{};
  /// A message or a transaction record. It makes nothing happen, so it releases no held event: what follows from
  /// the call before must not depend on whether somebody listens.
  bool isMessage = false;
  /// A text result stands for bytes; the journal shows their count.
  bool answersBytes = false;
};

/// One finished record of the journal, before it is written out.
struct CallRecord {
  std::uint64_t number = 0;           // increases by one
  std::chrono::microseconds began{};  // when the call began; of the second record of a call into the plug-in too
  std::chrono::microseconds
      time{};  // when the record was made; both count from the making of the boundary, and `time` never goes back
  std::string thread;
  std::string service;
  std::string operation;
  std::string app;
  platform::Value arguments;               // a dictionary, without the absent ones
  std::vector<const char*> argumentNames;  // of all of them, in order
  platform::Value result;                  // absent for none
  platform::ErrorRef error;                // absent for none
  bool end = false;                        // the return of a call into the plug-in
};

/// How much of arguments and results a listener of the journal needs. `brief`: long lists are shown as their length and
/// long texts are cut (see `sketchOf`), so that a record costs the same however much the call was about.
enum class JournalDetail : std::uint8_t { brief, whole };

/// Gets every record, in the order of the numbers; called under the journal's own lock, must not call back.
struct JournalListener {
  std::function<void(const CallRecord&)> hear;
  JournalDetail detail = JournalDetail::whole;  // at least
  /// Writes out what was gathered, before something is changed that outlives the process, or the process dies. From any
  /// thread; throws nothing. Null for a listener that gathers nothing.
  std::function<void()> handOver{};
};

/// The one wrapper around every call that crosses between the plug-in and the device, in either direction:
/// services' operations and queries, daemon calls, callbacks, log and transaction records, file operations; not the
/// facts of a proxy. It tells the call journal's listeners, if any, applies injection rules, and releases held-back
/// events. With nobody listening and no rules it costs a few nanoseconds. From any thread.
///
/// What a rule orders:
/// - `fail`: the body does not run; the answer is `failure`, with an error of the domain "Injection".
/// - `error`: the body runs, then there is such an error besides. Where an error is the result (the accessor `error`),
///   it becomes that.
/// - `none`: the body does not run; the answer is `failure`, without error.
/// - `value`: the body does not run; the answer is the number, on a boolean whether it is not 0. Where no number can be
///   the answer, as `none`.
/// - `kill`, `killAfter`: the process dies, before or after the body and its record.
/// - the others: the bystander acts, then the body runs.
///
/// An operation that reports its failure through a completion handler passes an error of its own here and lets the body
/// answer true: on false the body did not run, and the completion gets that error.
class Boundary {
 public:
  /// Carries out what somebody else does at this moment (cancel, prioritize, uninstall, store). Rules do not apply to
  /// what it does itself.
  using Bystander = std::function<void(InjectionRule::Action action, const std::string& target)>;

  /// Why the device's owner wants a call of the plug-in declined: it then fails as by the rule `fail`, with that error.
  /// Absent when it goes ahead. Not asked about messages. From any thread.
  using Decliner = std::function<platform::ErrorRef(std::string_view service, std::string_view operation)>;

  /// `clock`, which outlives the boundary, times the records; without one they carry no times.
  explicit Boundary(platform::Clock* clock = nullptr);
  ~Boundary();

  /// All set before the first call.
  void addJournal(JournalListener listener);
  void setRules(std::vector<InjectionRule> rules);
  /// The rules that had no effect because their match never came, except those about steps.
  std::vector<InjectionRule> idleRules() const;
  void setBystander(Bystander bystander);
  void setDecliner(Decliner decliner);
  bool hasJournal() const noexcept { return _journaled; }
  /// Whether the records show lists and texts whole.
  bool showsWhole() const noexcept { return _showsWhole; }

  /// A call from the plug-in to a service. `body` does the work and answers; `error` is the operation's error
  /// out-parameter (or null), read after the body for the journal. A failed call answers false, absent, null
  /// or 0 by default, otherwise `failure`, which is that answer or makes it. An answer by reference cannot fail.
  template <class Body>
  auto call(const Crossing& crossing, platform::ErrorRef* error, CallArguments arguments, Body&& body)
      -> std::invoke_result_t<Body> {
    return call(crossing, error, arguments, body, NoAnswer{});
  }
  template <class Body, class Failure>
  auto call(const Crossing& crossing, platform::ErrorRef* error, CallArguments arguments, Body&& body,
            Failure&& failure) -> std::invoke_result_t<Body> {
    if (!crossing.isMessage) EventQueue::releaseOutsideCall();
    EventQueue::InsideCall inside;
    if (!_watched) return body();
    return watched({Direction::out, crossing}, error, arguments, body, failure);
  }

  /// A call into the plug-in: a daemon call or a callback. Two records, one at its beginning and one at its end;
  /// `error` as above. A rule `none`, `fail` or `value` keeps it from being delivered, without a record.
  template <class Body>
  auto enter(const Crossing& crossing, CallArguments arguments, Body&& body) -> std::invoke_result_t<Body> {
    return enter(crossing, nullptr, arguments, body);
  }
  template <class Body>
  auto enter(const Crossing& crossing, platform::ErrorRef* error, CallArguments arguments, Body&& body)
      -> std::invoke_result_t<Body> {
    struct Releases {
      ~Releases() { EventQueue::releaseOutsideCall(); }
    } atEnd;
    if (!_watched) return body();
    return watched({Direction::in, crossing}, error, arguments, body, NoAnswer{});
  }

  /// A chunk of a package on its way: the point "transfer". `kill` and the bystander's actions are carried out here;
  /// any other action that a rule orders is answered, for the caller to carry out.
  std::optional<InjectionRule> atTransfer(std::string_view app);

  /// The error of a call that is declined, and whether an error is one.
  static platform::ErrorRef declinedError(const std::string& reason);
  static bool isDeclined(const platform::ErrorRef& error);

  /// Ends the process as `kill` does.
  [[noreturn]] void die() const;
  /// The same, whatever the journals have gathered.
  [[noreturn]] static void kill();

  /// `kind#number`, the same number for the same object until `forgetObject`, or, given what owns the object, as long
  /// as it lives.
  std::string nameOfObject(const char* kind, const void* address);
  std::string nameOfObject(const char* kind, const void* address, const std::weak_ptr<const void>& ownership);
  /// For the destructor of an object whose address the journal may have seen.
  void forgetObject(const void* address);

 private:
  struct State;
  struct NoAnswer {};
  enum class Direction : std::uint8_t { out, in };
  enum class Order : std::uint8_t { run, fail, none, value };
  /// One call that is watched, from before its body until after it.
  struct Visit {
    Direction direction;
    const Crossing& crossing;
    Order order = Order::run;
    bool addsError = false;
    bool dies = false;
    std::int64_t number = 0;
    platform::ErrorRef declined{};
    std::chrono::microseconds began{};
    platform::Value arguments{};
    std::vector<const char*> argumentNames{};
  };

  /// Finds out what the rules order, lets the bystander act, and keeps the arguments as they are before the body.
  void begin(Visit& visit, CallArguments arguments);
  void settleError(const Visit& visit, platform::ErrorRef* error) const;
  /// Writes the record and does what is left to do after it.
  void finish(Visit& visit, platform::Value result, const platform::ErrorRef* error);
  static CallRecord makeRecord(const Visit& visit);
  static platform::ErrorRef injectedError(const Crossing& crossing);

  template <class Body, class Failure>
  auto watched(Visit visit, platform::ErrorRef* error, CallArguments arguments, Body& body, Failure&& failure)
      -> std::invoke_result_t<Body&>;
  template <class Result, class Failure>
  static Result answerInstead(const Visit& visit, Failure&& failure);

  std::unique_ptr<State> _state;
  bool _watched = false;  // somebody listens, or there are rules
  bool _journaled = false;
  bool _showsWhole = false;
};

template <class Body, class Failure>
auto Boundary::watched(Visit visit, platform::ErrorRef* error, CallArguments arguments, Body& body, Failure&& failure)
    -> std::invoke_result_t<Body&> {
  using Result = std::invoke_result_t<Body&>;
  begin(visit, arguments);
  if constexpr (std::is_void_v<Result>) {
    if (visit.order == Order::run) body();
    settleError(visit, error);
    finish(visit, {}, error);
  } else if constexpr (std::is_reference_v<Result>) {
    Result result = body();
    finish(visit, {}, error);
    return result;
  } else {
    Result result = visit.order == Order::run ? body() : answerInstead<Result>(visit, std::forward<Failure>(failure));
    settleError(visit, error);
    if constexpr (std::is_same_v<Result, platform::ErrorRef>) {
      if (visit.addsError) result = injectedError(visit.crossing);
    }
    finish(visit, _journaled ? journalValue(*this, result, visit.crossing.answersBytes) : platform::Value(), error);
    return result;
  }
}

template <class Result, class Failure>
Result Boundary::answerInstead(const Visit& visit, Failure&& failure) {
  if (visit.order == Order::value) {
    if constexpr (std::is_same_v<Result, bool>) {
      return visit.number != 0;
    } else if constexpr (std::is_arithmetic_v<Result>) {
      return static_cast<Result>(visit.number);
    } else if constexpr (std::is_same_v<Result, platform::Value>) {
      return platform::Value(visit.number);
    }
  }
  using Given = std::remove_cvref_t<Failure>;
  if constexpr (std::is_same_v<Given, NoAnswer>) {
    return Result();
  } else if constexpr (std::is_invocable_v<Failure>) {
    return failure();
  } else {
    return Result(std::forward<Failure>(failure));
  }
}

}  // namespace device
