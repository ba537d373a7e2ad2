#pragma once

#include <cstdint>
#include <string>

namespace appsync {

/// The registry's names for its numbers, for messages; every decision tests the numbers.
std::string nameOfInstallType(std::uint64_t type);
std::string nameOfInstallState(std::uint64_t state);
std::string nameOfInstallPhase(std::uint64_t phase);

}  // namespace appsync
