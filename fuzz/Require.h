#pragma once

#include <cstdio>
#include <cstdlib>

#include "platform/Error.h"

namespace fuzz {

/// What must hold whatever the input. Ends the process otherwise, which is how a fuzzer learns of it.
inline void require(bool holds, const char* what, const platform::ErrorRef& error = nullptr) {
  if (holds) return;
  std::fprintf(stderr, "does not hold: %s%s%s\n", what, error ? ": " : "", error ? error->describe().c_str() : "");
  std::abort();
}

}  // namespace fuzz
