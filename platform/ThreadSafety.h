#pragma once

/// Names for clang's thread-safety attributes; nothing for other compilers. A guarded field that is touched
/// without its guard fails the clang build.

#if defined(__clang__)
#define APPSYNC_ATTRIBUTE(x) __attribute__((x))
#else
#define APPSYNC_ATTRIBUTE(x)
#endif

#define CAPABILITY(name) APPSYNC_ATTRIBUTE(capability(name))
#define SCOPED_CAPABILITY APPSYNC_ATTRIBUTE(scoped_lockable)
#define GUARDED_BY(guard) APPSYNC_ATTRIBUTE(guarded_by(guard))
#define PT_GUARDED_BY(guard) APPSYNC_ATTRIBUTE(pt_guarded_by(guard))
#define REQUIRES(...) APPSYNC_ATTRIBUTE(requires_capability(__VA_ARGS__))
#define EXCLUDES(...) APPSYNC_ATTRIBUTE(locks_excluded(__VA_ARGS__))
#define ACQUIRE(...) APPSYNC_ATTRIBUTE(acquire_capability(__VA_ARGS__))
#define RELEASE(...) APPSYNC_ATTRIBUTE(release_capability(__VA_ARGS__))
#define NO_THREAD_SAFETY_ANALYSIS APPSYNC_ATTRIBUTE(no_thread_safety_analysis)
