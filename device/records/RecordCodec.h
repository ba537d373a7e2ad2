#pragma once

#include <optional>

#include "device/records/AppRecords.h"
#include "device/records/CoordinatorRecord.h"
#include "platform/ThreadSafety.h"
#include "platform/Value.h"

namespace device {

/// The records as they lie in the store: one dictionary each. Missing entries read as the default; nothing when the
/// value is not a record of that sort at all.
platform::Value valueOfApp(const AppRecord& app);
std::optional<AppRecord> appOfValue(const std::string& id, const platform::Value& value);
platform::Value valueOfCoordinator(const CoordinatorRecord& coordinator) REQUIRES(recordsGuard);
std::optional<CoordinatorRecord> coordinatorOfValue(const std::string& app, const platform::Value& value)
    REQUIRES(recordsGuard);
platform::Value valueOfOutcome(const OutcomeRecord& outcome);
std::optional<OutcomeRecord> outcomeOfValue(const platform::Value& value);
/// A layout is an array of identifiers or of arrays of identifiers, here and in what the host sends. An identifier that
/// occurs again is left out.
platform::Value valueOfLayout(const HomeLayout& layout);
std::optional<HomeLayout> layoutOfValue(const platform::Value& value);

}  // namespace device
