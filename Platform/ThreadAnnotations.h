#pragma once

// The lock discipline in the types: clang checks it with -Wthread-safety, other compilers see
// nothing. The names are those that clang documents.
#if defined(__clang__)
#define VEXA_THREAD_ATTRIBUTE(x) __attribute__((x))
#else
#define VEXA_THREAD_ATTRIBUTE(x)
#endif

#define CAPABILITY(name) VEXA_THREAD_ATTRIBUTE(capability(name))
#define SCOPED_CAPABILITY VEXA_THREAD_ATTRIBUTE(scoped_lockable)
#define GUARDED_BY(mutex) VEXA_THREAD_ATTRIBUTE(guarded_by(mutex))
#define PT_GUARDED_BY(mutex) VEXA_THREAD_ATTRIBUTE(pt_guarded_by(mutex))
#define REQUIRES(...) VEXA_THREAD_ATTRIBUTE(requires_capability(__VA_ARGS__))
#define EXCLUDES(...) VEXA_THREAD_ATTRIBUTE(locks_excluded(__VA_ARGS__))
#define ACQUIRE(...) VEXA_THREAD_ATTRIBUTE(acquire_capability(__VA_ARGS__))
#define TRY_ACQUIRE(...) VEXA_THREAD_ATTRIBUTE(try_acquire_capability(__VA_ARGS__))
#define RELEASE(...) VEXA_THREAD_ATTRIBUTE(release_capability(__VA_ARGS__))
#define ASSERT_CAPABILITY(...) VEXA_THREAD_ATTRIBUTE(assert_capability(__VA_ARGS__))
#define NO_THREAD_SAFETY_ANALYSIS VEXA_THREAD_ATTRIBUTE(no_thread_safety_analysis)
