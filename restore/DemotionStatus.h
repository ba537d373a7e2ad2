#pragma once

#include <cstdint>

namespace appsync {

/// How an app had been demoted before the backup.
enum DemotionStatus : std::uint64_t { notDemoted = 0, demotedByHand = 1, demotedAutomatically = 2 };

}  // namespace appsync
