#pragma once

#include <atomic>
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

#include "device/EventQueue.h"
#include "device/Injection.h"
#include "platform/Error.h"
#include "platform/StringSet.h"
#include "platform/Value.h"

namespace device {

/// One argument of a call, as the journal shows it; cheap to make, read only when somebody asks. Objects stand as
/// `kind#number`, bytes as their count.
class CallArgument {
 public:
  enum class Kind : std::uint8_t { absent, boolean, integer, real, text, bytes, value, object, error, texts };
  struct BytesCount {
    std::size_t count;
  };

  CallArgument(const char* name, bool value) : name(name), kind(Kind::boolean), integer(value) {}
  template <class Integer>
  requires(std::is_integral_v<Integer> && !std::is_same_v<Integer, bool>) CallArgument(const char* name, Integer value)
      : name(name), kind(Kind::integer), integer(static_cast<std::int64_t>(value)) {}
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
  CallArgument(const char* name, const std::vector<std::string>& value)
      : name(name), kind(Kind::texts), pointer(&value) {}
  /// `objectKind` is "coordinator", "promise", "placeholder", "attributes", "metadata", "options", "observer", "asset",
  /// …
  static CallArgument object(const char* name, const char* objectKind, const void* address) {
    CallArgument argument(name, objectKind);
    argument.kind = address ? Kind::object : Kind::absent;
    argument.pointer = address;
    return argument;
  }

  const char* name;
  Kind kind;
  std::int64_t integer = 0;
  double real = 0;
  std::string_view text{};
  const void* pointer = nullptr;
};
using CallArguments = std::initializer_list<CallArgument>;

/// Which call crosses the boundary. `service` is the receiver's class, "FileSystem" for file operations,
/// "AppsClient" for a call into the plug-in. `app` is empty where no app is meant.
struct Crossing {
  const char* service;
  const char* operation;
  std::string_view app{};
};

/// One finished record of the journal, before it is written out.
struct CallRecord {
  std::uint64_t number = 0;  // increases by one
  std::string thread;
  std::string service;
  std::string operation;
  std::string app;
  platform::Value arguments;  // a dictionary
  platform::Value result;     // absent for none
  platform::ErrorRef error;   // absent for none
  bool end = false;           // the return of a call into the plug-in
};

/// The one wrapper that every call runs through that crosses between the plug-in and the device, in either direction:
/// services' operations and queries, daemon calls, callbacks, log and transaction records, file operations; not the
/// facts of a proxy. It writes the call journal when asked, applies injection rules, and releases held-back events.
/// With nobody listening and no rules it costs a few nanoseconds. From any thread.
class Boundary {
 public:
  /// Gets every record in the order of its numbers; called under the journal's own lock, must not call back.
  using Journal = std::function<void(const CallRecord&)>;
  /// Carries out what somebody else does at this moment (cancel, prioritize, uninstall, store).
  using Bystander = std::function<void(InjectionRule::Action action, const std::string& target)>;

  explicit Boundary(EventQueue& events);
  ~Boundary();

  /// Set before the first call.
  void setJournal(Journal journal);
  void setRules(std::vector<InjectionRule> rules);
  void setBystander(Bystander bystander);

  /// A call from the plug-in to a service. `body` does the work and answers; `error` is the operation's error
  /// out-parameter (or null), read after the body for the journal. `failure` is what a failed call answers: by
  /// default false, absent or null.
  template <class Body, class Result = std::invoke_result_t<Body>>
  Result call(const Crossing& crossing, platform::ErrorRef* error, CallArguments arguments, Body&& body);
  template <class Body, class Result>
  Result call(const Crossing& crossing, platform::ErrorRef* error, CallArguments arguments, Body&& body,
              Result failure);

  /// A call into the plug-in: a daemon call or a callback. Two records, at its begin and at its end. A rule `none` or
  /// `fail` keeps a callback from being delivered.
  template <class Body, class Result = std::invoke_result_t<Body>>
  Result enter(const Crossing& crossing, CallArguments arguments, Body&& body);

  /// A chunk of a package on its way: the point "transfer". The action that a rule orders, if any.
  std::optional<InjectionRule> atTransfer(std::string_view app);

  /// `kind#number`, the same number for the same object as long as `keep` has not let it go.
  std::string nameOfObject(const char* kind, const void* address);

 private:
  struct State;
  std::unique_ptr<State> _state;
  EventQueue& _events;
  std::atomic<bool> _watched{false};  // somebody listens, or there are rules
};

}  // namespace device
