#pragma once

#include <cstdint>

namespace platform {

/// Who talks to the install-coordination service. Other numbers exist.
using RVClientIdentifier = std::uint64_t;

constexpr RVClientIdentifier RVClientMercato = 1;  // the store
constexpr RVClientIdentifier RVClientSync = 3;     // this plug-in

}  // namespace platform
