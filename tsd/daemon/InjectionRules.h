#pragma once

#include <string>
#include <vector>

#include "device/boundary/Injection.h"

namespace tsd {

/// The rules of `--inject`, in their order. Throws a CommandError at the first text that is not a rule, with what was
/// most likely meant.
std::vector<device::InjectionRule> parseRules(const std::vector<std::string>& texts);

}  // namespace tsd
