#pragma once

/// Clang's thread-safety attributes under names that no other header has; nothing for other compilers. For the
/// installed headers; all other code uses the short names of `ThreadSafety.h`.

#if defined(__clang__)
#define APPSYNC_ATTRIBUTE(x) __attribute__((x))
#else
#define APPSYNC_ATTRIBUTE(x)
#endif

#define APPSYNC_CAPABILITY(name) APPSYNC_ATTRIBUTE(capability(name))
#define APPSYNC_SCOPED_CAPABILITY APPSYNC_ATTRIBUTE(scoped_lockable)
#define APPSYNC_GUARDED_BY(guard) APPSYNC_ATTRIBUTE(guarded_by(guard))
#define APPSYNC_REQUIRES(...) APPSYNC_ATTRIBUTE(requires_capability(__VA_ARGS__))
#define APPSYNC_ACQUIRE(...) APPSYNC_ATTRIBUTE(acquire_capability(__VA_ARGS__))
#define APPSYNC_RELEASE(...) APPSYNC_ATTRIBUTE(release_capability(__VA_ARGS__))
