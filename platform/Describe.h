#pragma once

#include <string>

#include "platform/Value.h"

namespace platform {

/// One line of text for a value, as it stands in the log: absent "(null)", a string as it is, numbers in decimal, a
/// boolean 1 or 0, a date in ISO 8601, an array `(a, b)`, a dictionary `{k = v; k = v}`, data `<N bytes>`.
std::string describe(const Value& value);

}  // namespace platform
