#pragma once

#include <string_view>
#include <type_traits>

#include "core/Say.h"
#include "platform/Error.h"

namespace appsync {

/// One call of a service that can fail, told either way: `failed` shows the error and the app, `done` what the call was
/// about, where something is given, and the app. What the call answered besides stands in `error`.
template <class Call, class... Shown>
bool callAndTell(const Platform& platform, std::string_view bundleIdentifier, platform::ErrorRef& error, Call&& call,
                 platform::MessageFormat<platform::ErrorRef, std::string_view> failed,
                 platform::MessageFormat<std::type_identity_t<Shown>..., std::string_view> done,
                 const Shown&... shown) {
  const bool succeeded = call(&error);
  if (succeeded) {
    say(platform, done, shown..., bundleIdentifier);
  } else {
    sayError(platform, failed, error, bundleIdentifier);
  }
  return succeeded;
}

}  // namespace appsync
