#pragma once

#include <string_view>
#include <type_traits>

#include "platform/Message.h"
#include "platform/Platform.h"
#include "platform/SystemLog.h"
#include "platform/TSSupport.h"

namespace appsync {

using platform::Platform;

/// The daemon's log categories that the plug-in writes to.
enum class LogCategory : int { unexpectedMetadata = 0, plugin = 8, summary = 15 };

constexpr std::string_view messagePrefix = "com.vantor.tsd.appsync|";

/// How "%c" shows a boolean.
constexpr char yesOrNo(bool value) { return value ? 'y' : 'n'; }

/// Formats and writes one message; does neither when nobody listens. A message for which memory or the log fails is
/// lost, and nothing else: the work it tells of goes on.
template <class... Arguments>
void log(const Platform& platform, LogCategory category, platform::LogLevel level, std::string_view prefix,
         platform::MessageFormat<std::type_identity_t<Arguments>...> format, const Arguments&... arguments) noexcept {
  try {
    platform::LogHandle& handle = platform.support.TSGetLogCategory(static_cast<int>(category));
    if (!handle.isEnabled(level)) return;
    const platform::MessageArgument list[] = {platform::messageArgument(arguments)...,
                                              {platform::ConversionKind::object}};
    handle.write(level, platform::formatMessage(prefix, format.text(), list));
  } catch (...) {
    return;
  }
}

/// Logs in the plug-in's category, at the default level. The plug-in's identifier and the bar are put in front.
template <class... Arguments>
void say(const Platform& platform, platform::MessageFormat<std::type_identity_t<Arguments>...> format,
         const Arguments&... arguments) {
  log(platform, LogCategory::plugin, platform::LogLevel::standard, messagePrefix, format, arguments...);
}

/// The same in another category.
template <class... Arguments>
void say(const Platform& platform, LogCategory category,
         platform::MessageFormat<std::type_identity_t<Arguments>...> format, const Arguments&... arguments) {
  log(platform, category, platform::LogLevel::standard, messagePrefix, format, arguments...);
}

/// Logs in the plug-in's category, at the error level.
template <class... Arguments>
void sayError(const Platform& platform, platform::MessageFormat<std::type_identity_t<Arguments>...> format,
              const Arguments&... arguments) {
  log(platform, LogCategory::plugin, platform::LogLevel::error, messagePrefix, format, arguments...);
}

/// What an entry point does with an exception that must not leave it (mostly for want of memory): it is logged, not
/// passed on.
void swallowException(const Platform& platform, std::string_view operation) noexcept;

/// Runs work whose failure must not keep what follows from being done. False when the body answers so, and when an
/// exception ends it, which is logged as above.
template <class Body>
bool contained(const Platform& platform, std::string_view work, Body&& body) noexcept try {
  if constexpr (std::is_void_v<std::invoke_result_t<Body&>>) {
    body();
    return true;
  } else {
    return body();
  }
} catch (...) {
  swallowException(platform, work);
  return false;
}

}  // namespace appsync
