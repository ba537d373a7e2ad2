#pragma once

#include "platform/ThreadAttributes.h"

/// Short names for clang's thread-safety attributes; nothing for other compilers. A guarded field that is touched
/// without its guard fails the clang build. Not installed: other code may have macros of these names.

#define CAPABILITY(name) APPSYNC_CAPABILITY(name)
#define SCOPED_CAPABILITY APPSYNC_SCOPED_CAPABILITY
#define GUARDED_BY(guard) APPSYNC_GUARDED_BY(guard)
#define PT_GUARDED_BY(guard) APPSYNC_ATTRIBUTE(pt_guarded_by(guard))
#define REQUIRES(...) APPSYNC_REQUIRES(__VA_ARGS__)
#define EXCLUDES(...) APPSYNC_ATTRIBUTE(locks_excluded(__VA_ARGS__))
#define ACQUIRE(...) APPSYNC_ACQUIRE(__VA_ARGS__)
#define RELEASE(...) APPSYNC_RELEASE(__VA_ARGS__)
#define NO_THREAD_SAFETY_ANALYSIS APPSYNC_ATTRIBUTE(no_thread_safety_analysis)
