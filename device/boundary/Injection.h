#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/boundary/InjectionPoint.h"
#include "platform/Error.h"

namespace device {

/// One rule of fault injection: `POINT[:APP][@N[+]]=ACTION`.
///
/// POINT is an operation's C++ name, with its class in front and a dot where one name serves several
/// ("RVPlaceholder.cancelForReason", "writeAtomically"), or "transfer" (each chunk of a package), or "step" (each
/// single change of a device in a folder, see DeviceSteps.h).
/// Without APP every app matches; without N every match, otherwise the N-th only (counted from 1), with a plus sign the
/// N-th and all after it.
struct InjectionRule {
  enum class Action : std::uint8_t {
    fail,        // does nothing, answers false or absent, with an error
    error,       // takes effect and reports an error besides; on the accessor `error`: a present one
    none,        // absent without error; a callback: not delivered
    value,       // answers `number`
    kill,        // the process dies as by SIGKILL before the effect
    killAfter,   // the same after the effect
    cancel,      // somebody cancels `target`'s coordinator at this moment
    prioritize,  // somebody asks for `target` first
    uninstall,   // the person removes `target`
    store,       // the store creates a coordinator for `target`
  };

  std::string place;
  std::string app;          // empty: every app
  std::uint64_t match = 0;  // 0: every match
  Action action = Action::fail;
  std::int64_t number = 0;  // of `value`
  std::string target{};     // of cancel, prioritize, uninstall, store
  bool onwards = false;     // every match from the N-th on
  std::string text{};       // as it was given

  /// Whether the rule is about this point for this app (empty: the call is about no app).
  bool matches(const InjectionPoint& point, std::string_view app) const;

  /// Whether the rule takes effect at its match of that number, counted from 1.
  bool isDue(std::uint64_t turn) const { return match == 0 || turn == match || (onwards && turn > match); }

  /// Nothing, with an error that names the place, when the text is not a rule or names an unknown point or action.
  static std::optional<InjectionRule> parse(std::string_view text, platform::ErrorRef* error = nullptr);
};

/// Every point, sorted, with its class where one name serves several.
std::vector<std::string> injectionPoints();
/// Every action; one that takes something ends with "=".
std::vector<std::string> injectionActions();
/// Whether a point of that name exists ("transfer", "writeAtomically", "RVPlaceholder.cancelForReason").
bool isInjectionPoint(std::string_view point);
/// Whether the rule is about the point "step".
bool isAboutSteps(const InjectionRule& rule);

}  // namespace device
