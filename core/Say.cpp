#include "core/Say.h"

#include <exception>

namespace appsync {

void swallowException(const Platform& platform, std::string_view operation) noexcept {
  try {
    throw;
  } catch (const std::exception& exception) {
    sayError(platform, "%{public}@ was stopped by an exception: %{public}@", operation, exception.what());
  } catch (...) {
    sayError(platform, "%{public}@ was stopped by an exception of an unknown kind", operation);
  }
}

}  // namespace appsync
