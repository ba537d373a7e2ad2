#pragma once

#include "platform/ThreadSafety.h"

namespace device {

/// The name for clang's analysis of the one guard of all that a device's services remember (`AppRecords::Lock` holds
/// it). Records, coordinators and promises belong to several objects, none of which could name another one's mutex. The
/// analysis does not distinguish two devices; their objects never meet.
struct CAPABILITY("guard of the records") RecordsGuard {};
inline constexpr RecordsGuard recordsGuard;

}  // namespace device
